// Exports of the queues, the counters, the collection callbacks, the capture file and its playback.
#include "kral/log.h"

#include <algorithm>
#include <chrono>
#include <cstring>

#include "commands/outputs.h"
#include "frame/export_call.h"
#include "transport/capture_writer.h"

namespace {

using kral::Diag_FTM;
using kral::LogFormatted;
using kral::LogName;
using kral::OnPhoneAtOnce;
using kral::Put;
using std::chrono::milliseconds;

static_assert(sizeof(KRAL_EVENT) == kral::EventRecord::kSize);
static_assert(KRAL_LONGEST_PACKET == kral::kMaximumPacket);

bool SetCollection(Diag_FTM& phone, bool on) {
  phone.sorter().SetCollection(on);
  return true;
}

bool TakeLog(Diag_FTM& phone, uint16_t* size, uint8_t* buffer, uint32_t time_out_ms) {
  if (size == nullptr || buffer == nullptr) return false;
  const auto packet = phone.asynchronous().PopWithin(milliseconds(time_out_ms));
  if (!packet || packet->size() > kral::kMaximumPacket) return false;
  std::copy(packet->begin(), packet->end(), buffer);
  *size = static_cast<uint16_t>(packet->size());
  return true;
}

bool TakeEvent(Diag_FTM& phone, const char* function, KRAL_EVENT* event, uint32_t time_out_ms) {
  if (event == nullptr) return false;
  const auto record = phone.events().PopWithin(milliseconds(time_out_ms));
  if (!record) return false;
  std::memcpy(event, record->bytes.data(), sizeof(*event));
  phone.log().WriteLine(kral::kLogRet, "%s() : event %d removed from queue", function,
                        event->event_id[0] | event->event_id[1] << 8);
  return true;
}

bool CountLogs(Diag_FTM& phone, uint32_t* count) {
  const auto waiting = static_cast<uint32_t>(phone.asynchronous().size());
  Put(count, waiting);  // 0 is told as well as given back
  return waiting != 0;
}

template <class Queue>
bool Empty(Queue& queue) {
  queue.Clear();
  return true;
}

bool ReadCounters(Diag_FTM& phone, KRAL_TRAFFIC_COUNTERS* counters) {
  if (counters == nullptr) return false;
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

bool StartCapture(Diag_FTM& phone, const char* file_name) {
  return phone.StartCapture(file_name);
}

bool StartPlayback(Diag_FTM& phone, const char* file_name, uint32_t pace) {
  return pace < kral::kPlayPaceCount && phone.StartPlayback(file_name, static_cast<kral::PlayPace>(pace));
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
  LogFormatted(handle, "KRAL_DIAG_SetPhoneLoggingState(bEnableLogging=%d)", enable);
  return OnPhoneAtOnce(handle, SetCollection, enable == 1);
}

uint8_t KRAL_CALL KRAL_DIAG_GetNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer) {
  LogName(handle, "KRAL_DIAG_GetNextPhoneLog");
  return OnPhoneAtOnce(handle, TakeLog, size, buffer, 0U);
}

uint8_t KRAL_CALL KRAL_DIAG_WaitNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer,
                                             uint32_t time_out_ms) {
  LogFormatted(handle, "KRAL_DIAG_WaitNextPhoneLog( iTimeOut_ms = %u )", time_out_ms);
  return OnPhoneAtOnce(handle, TakeLog, size, buffer, time_out_ms);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearPhoneLogQueue(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_DIAG_ClearPhoneLogQueue");
  return OnPhoneAtOnce(handle, [](Diag_FTM& phone) { return Empty(phone.asynchronous()); });
}

uint8_t KRAL_CALL KRAL_DIAG_GetPhoneLogQueueSize(KRAL_HANDLE handle, uint32_t* count) {
  LogName(handle, "KRAL_DIAG_GetPhoneLogQueueSize");
  return OnPhoneAtOnce(handle, CountLogs, count);
}

uint8_t KRAL_CALL KRAL_DIAG_GetNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event) {
  LogName(handle, "KRAL_DIAG_GetNextEvent");
  return OnPhoneAtOnce(handle, TakeEvent, "KRAL_DIAG_GetNextEvent", event, 0U);
}

uint8_t KRAL_CALL KRAL_DIAG_WaitNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event, uint32_t time_out_ms) {
  LogFormatted(handle, "KRAL_DIAG_WaitNextEvent( iTimeOut_ms = %u )", time_out_ms);
  return OnPhoneAtOnce(handle, TakeEvent, "KRAL_DIAG_WaitNextEvent", event, time_out_ms);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearEventQueue(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_DIAG_ClearEventQueue");
  return OnPhoneAtOnce(handle, [](Diag_FTM& phone) { return Empty(phone.events()); });
}

uint8_t KRAL_CALL KRAL_DIAG_ClearCommandResponseQueue(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_DIAG_ClearCommandResponseQueue");
  return OnPhoneAtOnce(handle, [](Diag_FTM& phone) { return Empty(phone.responses()); });
}

uint8_t KRAL_CALL KRAL_ConfigureCollectionCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK packet,
                                                    KRAL_EVENT_CALLBACK event, uintptr_t value) {
  LogName(handle, "KRAL_ConfigureCollectionCallBacks");
  return OnPhoneAtOnce(handle, SetCollectionCallbacks, kral::CollectionCallbacks{packet, event, value});
}

uint8_t KRAL_CALL KRAL_GetTrafficCounters(KRAL_HANDLE handle, KRAL_TRAFFIC_COUNTERS* counters) {
  LogName(handle, "KRAL_GetTrafficCounters");
  return OnPhoneAtOnce(handle, ReadCounters, counters);
}

uint8_t KRAL_CALL KRAL_StartCapture(KRAL_HANDLE handle, const char* file_name) {
  LogName(handle, "KRAL_StartCapture");
  return file_name == nullptr ? 0 : OnPhoneAtOnce(handle, StartCapture, file_name);
}

uint8_t KRAL_CALL KRAL_StopCapture(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_StopCapture");
  return OnPhoneAtOnce(handle, [](Diag_FTM& phone) { return phone.StopCapture(); });
}

uint8_t KRAL_CALL KRAL_StartPlayback(KRAL_HANDLE handle, const char* file_name, uint32_t pace) {
  LogFormatted(handle, "KRAL_StartPlayback( iPace = %u )", pace);
  return file_name == nullptr ? 0 : OnPhoneAtOnce(handle, StartPlayback, file_name, pace);
}

uint8_t KRAL_CALL KRAL_ConfigurePlaybackCallBack(KRAL_HANDLE handle, KRAL_PLAYBACK_CALLBACK callback,
                                                 uintptr_t value) {
  LogName(handle, "KRAL_ConfigurePlaybackCallBack");
  return OnPhoneAtOnce(handle, SetPlaybackCallback, callback, value);
}

uint8_t KRAL_CALL KRAL_StopPlayback(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_StopPlayback");
  return OnPhoneAtOnce(handle, [](Diag_FTM& phone) { return phone.player().Stop(); });
}

uint8_t KRAL_CALL KRAL_GetPlaybackState(KRAL_HANDLE handle, int32_t* state, uint64_t* packets, uint64_t* skipped) {
  LogName(handle, "KRAL_GetPlaybackState");
  return OnPhoneAtOnce(handle, ReadPlaybackState, state, packets, skipped);
}

}  // extern "C"
