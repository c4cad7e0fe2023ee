// What a phone object keeps of the traffic that nobody asked for: counters, the capture file, playback.
#include "base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/diag_ftm_parts.h"
#include "platform/file_util.h"
#include "transport/collection/capture_seek.h"
#include "transport/collection/capture_series.h"

namespace kral {

TrafficCounters Diag_FTM::counters() {
  TrafficCounters counters = sorter().counters();
  if (server_mode()) return counters;
  const TrafficCounters line = transport().counters();
  counters.bytes_received = line.bytes_received;
  counters.packets_received = line.packets_received + player().played_in_all();
  counters.bad_fcs = line.bad_fcs;
  counters.oversized += line.oversized;
  counters.collected += line.collected;
  counters.dropped_responses += line.dropped_responses;
  counters.dropped_asynchronous += line.dropped_asynchronous;
  counters.waiting = dispatcher().backlog();
  counters.most_waiting = dispatcher().greatest_backlog();
  return counters;
}

bool Diag_FTM::StartCapture(const char* file_name, const CaptureLayout& layout, uint32_t keep) {
  const bool running = capture().state() != CaptureState::kNone;
  const std::string path = file_name;
  std::function<CaptureSink()> open = [path] { return OpenCaptureFile(path); };
  if (layout.file_bytes != 0 || layout.file_seconds != 0) open = CaptureSeries(path, keep);
  if (capture().Start(open, parts_, layout)) return true;
  log().WriteLine(kLogErr, "Capture file: %s cannot be written or is in use, or a capture runs already", file_name);
  // One that was running and has ended meanwhile was none in the way.
  return Fail(running && capture().state() != CaptureState::kNone
                  ? Failure(KRAL_ERROR_ARGUMENT, "a capture runs already, or waits for its disk")
                  : FileFailure(file_name, "cannot be written or is in use"));
}

// What has been read from the port by now belongs to the capture, also where it still waits for the dispatcher; while a
// callback holds that up, the capture ends with what has been collected. That is no loss of the capture's, so the
// result does not tell it: the counters do, and the text log.
bool Diag_FTM::StopCapture() {
  constexpr uint32_t kSettleMs = 200;
  const CaptureState before = capture().state();
  const bool running = before != CaptureState::kNone;
  if (before == CaptureState::kRunning && !server_mode() && !dispatcher().WaitUntilDispatched(kSettleMs)) {
    log().WriteLine(kLogErr, "Capture file: it ends in front of %u packets that still wait for callbacks",
                    static_cast<unsigned>(dispatcher().backlog()));
  }
  if (capture().Stop()) return true;
  if (capture().state() != CaptureState::kNone) {
    return Fail(Failure(KRAL_ERROR_NO_ANSWER, "packets of the capture still wait for the disk"));
  }
  return Fail(running ? Failure(KRAL_ERROR_BAD_FILE, "the capture file does not hold all packets")
                      : Failure(KRAL_ERROR_ARGUMENT, "no capture is running"));
}

bool Diag_FTM::StartPlayback(const char* file_name, PlayPace pace, const CaptureStretch& stretch) {
  // Through a phone server there is no dispatcher to play into.
  bool is_sought = true;
  if (!server_mode() && player().Start(OpenCaptureSourceAt(file_name, stretch.from, &is_sought), pace, dispatcher(),
                                       sorter(), parts_, stretch)) {
    if (stretch.from != 0 && !is_sought) {
      log().WriteLine(kLogErr, "Capture file: %s was not ended, or its times step back: it is read from its beginning",
                      file_name);
    }
    return true;
  }
  log().WriteLine(kLogErr, "Capture file: %s cannot be read or is being written, or a file is played already",
                  file_name);
  if (server_mode()) return Fail(Failure(KRAL_ERROR_ARGUMENT, "nothing can be played through a phone server"));
  if (player().state() == PlayState::kPlaying) return Fail(Failure(KRAL_ERROR_ARGUMENT, "a file is played already"));
  FileReader reader;
  const auto error = reader.Open(file_name);
  return Fail(FileFailure(file_name, error ? "cannot be read" : "is being written").System(error));
}

// Nobody may wait for packets of a handset that is gone.
void Diag_FTM::EndCollection() {
  player().Stop();
  asynchronous().Close();
  events().Close();
  const KeepFailure keep;
  StopCapture();
  trace().Stop();
}

NameTables& Diag_FTM::names() {
  return parts_->names;
}
CaptureWriter& Diag_FTM::capture() {
  return parts_->capture;
}
CapturePlayer& Diag_FTM::player() {
  return parts_->player;
}
TraceWriter& Diag_FTM::trace() {
  return parts_->trace;
}

}  // namespace kral
