// Exports of the queues, the counters, the collection callbacks, the capture file and its playback.
#include "kral/log.h"

#include <algorithm>
#include <chrono>
#include <cstring>

#include "base/outputs.h"
#include "frame/export_call.h"
#include "frame/request_failure.h"
#include "transport/collection/capture_writer.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::kNoFileName;
using kral::Put;
using std::chrono::milliseconds;

static_assert(KRAL_LONGEST_PACKET == kral::kMaximumPacket);

bool SetCollection(Diag_FTM& phone, bool on) {
  phone.sorter().SetCollection(on);
  return true;
}

bool TakeLog(Diag_FTM& phone, uint16_t* size, uint8_t* buffer, uint32_t time_out_ms) {
  if (size == nullptr || buffer == nullptr)
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer for the packet"));
  const auto packet = phone.asynchronous().PopWithin(milliseconds(time_out_ms));
  if (!packet || packet->size() > kral::kMaximumPacket) {
    if (phone.device_gone()) return Fail(kral::PortFailure(phone));
    return Fail(Failure(KRAL_ERROR_NO_ANSWER, "no packet is waiting, and none came within %u ms", time_out_ms));
  }
  std::copy(packet->begin(), packet->end(), buffer);
  *size = static_cast<uint16_t>(packet->size());
  return true;
}

bool TakeEvent(Diag_FTM& phone, const char* function, KRAL_EVENT* event, uint32_t time_out_ms) {
  if (event == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no room for the event"));
  const auto record = phone.events().PopWithin(milliseconds(time_out_ms));
  if (!record && phone.device_gone()) return Fail(kral::PortFailure(phone));
  if (!record)
    return Fail(Failure(KRAL_ERROR_NO_ANSWER, "no event is waiting, and none came within %u ms", time_out_ms));
  std::memcpy(event, record->bytes.data(), sizeof(*event));
  phone.log().WriteLine(kral::kLogRet, "%s() : event %d removed from queue", function,
                        event->event_id[0] | event->event_id[1] << 8);
  return true;
}

bool CountLogs(Diag_FTM& phone, uint32_t* count) {
  const auto waiting = static_cast<uint32_t>(phone.asynchronous().size());
  Put(count, waiting);  // 0 is told as well as given back
  return waiting != 0 || Fail(Failure(KRAL_ERROR_NO_ANSWER, "no packet is waiting"));
}

template <class Queue>
bool Empty(Queue& queue) {
  queue.Clear();
  return true;
}

bool ReadCounters(Diag_FTM& phone, KRAL_TRAFFIC_COUNTERS* counters) {
  if (counters == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no room for the counters"));
  const kral::TrafficCounters c = phone.counters();
  *counters = {c.bytes_received,
               c.packets_received,
               c.collected,
               c.events,
               c.dropped_asynchronous,
               c.dropped_events,
               c.dropped_responses,
               c.dropped_not_collecting,
               c.bad_fcs,
               c.oversized,
               phone.capture().written(),
               phone.capture().lost(),
               phone.capture().pending(),
               c.waiting,
               c.most_waiting};
  return true;
}

bool SetCollectionCallbacks(Diag_FTM& phone, const kral::CollectionCallbacks& callbacks) {
  phone.sorter().SetCollectionCallbacks(callbacks);
  return true;
}

bool StartCapture(Diag_FTM& phone, const char* file_name, const kral::CaptureLayout& layout, uint32_t keep) {
  constexpr uint64_t kSmallestFile = uint64_t{64} << 10;
  if (layout.file_bytes != 0 && layout.file_bytes < kSmallestFile) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "files of a capture have 65536 bytes at least"));
  }
  if (keep != 0 && layout.file_bytes == 0 && layout.file_seconds == 0) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "a capture in one file has none to remove"));
  }
  return phone.StartCapture(file_name, layout, keep);
}

bool StartPlayback(Diag_FTM& phone, const char* file_name, uint32_t pace, const kral::CaptureStretch& stretch) {
  if (pace >= kral::kPlayPaceCount) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the pace %u is not a listed one", pace));
  return phone.StartPlayback(file_name, static_cast<kral::PlayPace>(pace), stretch);
}

bool SetPlaybackCallback(Diag_FTM& phone, KRAL_PLAYBACK_CALLBACK callback, uintptr_t value) {
  phone.player().SetCallback(callback, value);
  return true;
}

bool ReadPlaybackState(Diag_FTM& phone, int32_t* state, uint64_t* packets, uint64_t* skipped) {
  // The state first: one that has ended has its last figures.
  Put(state, static_cast<int32_t>(phone.player().state()));
  Put(packets, phone.player().played());
  Put(skipped, phone.player().skipped());
  return true;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_DIAG_SetPhoneLoggingState(KRAL_HANDLE handle, uint8_t enable) {
  return ExportCall(handle, __func__).Logged("(bEnableLogging=%d)", enable).RunAtOnce(SetCollection, enable == 1);
}

uint8_t KRAL_CALL KRAL_DIAG_GetNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer) {
  return ExportCall(handle, __func__).RunAtOnce(TakeLog, size, buffer, 0U);
}

uint8_t KRAL_CALL KRAL_DIAG_WaitNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer,
                                             uint32_t time_out_ms) {
  return ExportCall(handle, __func__)
      .Logged("( iTimeOut_ms = %u )", time_out_ms)
      .RunAtOnce(TakeLog, size, buffer, time_out_ms);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearPhoneLogQueue(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) { return Empty(phone.asynchronous()); });
}

uint8_t KRAL_CALL KRAL_DIAG_GetPhoneLogQueueSize(KRAL_HANDLE handle, uint32_t* count) {
  return ExportCall(handle, __func__).RunAtOnce(CountLogs, count);
}

uint8_t KRAL_CALL KRAL_DIAG_GetNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event) {
  return ExportCall(handle, __func__).RunAtOnce(TakeEvent, __func__, event, 0U);
}

uint8_t KRAL_CALL KRAL_DIAG_WaitNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event, uint32_t time_out_ms) {
  return ExportCall(handle, __func__)
      .Logged("( iTimeOut_ms = %u )", time_out_ms)
      .RunAtOnce(TakeEvent, __func__, event, time_out_ms);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearEventQueue(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) { return Empty(phone.events()); });
}

uint8_t KRAL_CALL KRAL_DIAG_ClearCommandResponseQueue(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) { return Empty(phone.responses()); });
}

uint8_t KRAL_CALL KRAL_ConfigureCollectionCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK packet,
                                                    KRAL_EVENT_CALLBACK event, uintptr_t value) {
  return ExportCall(handle, __func__)
      .RunAtOnce(SetCollectionCallbacks, kral::CollectionCallbacks{packet, event, value});
}

uint8_t KRAL_CALL KRAL_GetTrafficCounters(KRAL_HANDLE handle, KRAL_TRAFFIC_COUNTERS* counters) {
  return ExportCall(handle, __func__).RunAtOnce(ReadCounters, counters);
}

uint8_t KRAL_CALL KRAL_StartCapture(KRAL_HANDLE handle, const char* file_name) {
  return ExportCall(handle, __func__)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(StartCapture, file_name, kral::CaptureLayout(), 0U);
}

uint8_t KRAL_CALL KRAL_StartCaptureWith(KRAL_HANDLE handle, const char* file_name, uint64_t file_bytes,
                                        uint32_t file_seconds, uint32_t keep, uint32_t compress) {
  return ExportCall(handle, __func__)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(
          StartCapture, file_name,
          kral::CaptureLayout{.compressed = compress != 0, .file_bytes = file_bytes, .file_seconds = file_seconds},
          keep);
}

uint8_t KRAL_CALL KRAL_StopCapture(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) { return phone.StopCapture(); });
}

uint8_t KRAL_CALL KRAL_StartPlayback(KRAL_HANDLE handle, const char* file_name, uint32_t pace) {
  return ExportCall(handle, __func__)
      .Logged("( iPace = %u )", pace)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(StartPlayback, file_name, pace, kral::CaptureStretch());
}

uint8_t KRAL_CALL KRAL_StartPlaybackBetween(KRAL_HANDLE handle, const char* file_name, uint32_t pace, uint64_t from,
                                            uint64_t to) {
  return ExportCall(handle, __func__)
      .Logged("( iPace = %u )", pace)
      .Require(file_name != nullptr, kNoFileName)
      .RunAtOnce(StartPlayback, file_name, pace, kral::CaptureStretch{from, to});
}

uint8_t KRAL_CALL KRAL_ConfigurePlaybackCallBack(KRAL_HANDLE handle, KRAL_PLAYBACK_CALLBACK callback, uintptr_t value) {
  return ExportCall(handle, __func__).RunAtOnce(SetPlaybackCallback, callback, value);
}

uint8_t KRAL_CALL KRAL_StopPlayback(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).RunAtOnce([](Diag_FTM& phone) { return phone.player().Stop(); });
}

uint8_t KRAL_CALL KRAL_GetPlaybackState(KRAL_HANDLE handle, int32_t* state, uint64_t* packets, uint64_t* skipped) {
  return ExportCall(handle, __func__).RunAtOnce(ReadPlaybackState, state, packets, skipped);
}

}  // extern "C"
