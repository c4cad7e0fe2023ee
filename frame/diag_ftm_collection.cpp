// What a phone object keeps of the traffic that nobody asked for: counters, the capture file, playback.
#include "frame/base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/diag_ftm_parts.h"

namespace kral {

TrafficCounters Diag_FTM::counters() {
  if (server_mode()) return sorter().counters();
  TrafficCounters counters = transport().counters();
  counters.packets_received += player().played_in_all();
  counters.waiting = dispatcher().backlog();
  counters.most_waiting = dispatcher().greatest_backlog();
  return counters;
}

bool Diag_FTM::StartCapture(const char* file_name) {
  if (capture().Start([file_name] { return OpenCaptureFile(file_name); }, parts_)) return true;
  log().WriteLine(kLogErr, "Capture file: %s cannot be written or is in use, or a capture runs already", file_name);
  return Fail(FileFailure(file_name, "cannot be written or is in use, or a capture runs already"));
}

// What has been read from the port by now belongs to the capture, also where it still waits for the dispatcher; while a
// callback holds that up, the capture ends with what has been collected. That is no loss of the capture's, so the
// result does not tell it: the counters do, and the text log.
bool Diag_FTM::StopCapture() {
  constexpr uint32_t kSettleMs = 200;
  const bool running = capture().state() == CaptureState::kRunning;
  if (running && !server_mode() && !dispatcher().WaitUntilDispatched(kSettleMs)) {
    log().WriteLine(kLogErr, "Capture file: it ends in front of %u packets that still wait for callbacks",
                    static_cast<unsigned>(dispatcher().backlog()));
  }
  return capture().Stop();
}

bool Diag_FTM::StartPlayback(const char* file_name, PlayPace pace) {
  // Through a phone server there is no dispatcher to play into.
  if (!server_mode() && player().Start(OpenCaptureSource(file_name), pace, dispatcher(), sorter(), parts_)) return true;
  log().WriteLine(kLogErr, "Capture file: %s cannot be read or is being written, or a file is played already",
                  file_name);
  return Fail(FileFailure(file_name, "cannot be read or is being written, or a file is played already"));
}

// Nobody may wait for packets of a handset that is gone.
void Diag_FTM::EndCollection() {
  player().Stop();
  asynchronous().Close();
  events().Close();
  StopCapture();
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

}  // namespace kral
