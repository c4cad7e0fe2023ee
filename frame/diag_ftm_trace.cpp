// The trace of a phone object's port: started, stopped, kept and saved, and why not.
#include "base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/diag_ftm_parts.h"
#include "frame/version.h"
#include "platform/port_list.h"

namespace kral {
namespace {

TraceOrigin OriginOf(const CSerialPort& port, uint16_t number) {
  TraceOrigin origin{LibraryVersion(), "COM" + std::to_string(number), {}};
  origin.description = port.user_defined() ? "the caller's transport" : ComPortDevice(number);
  if (number == kNullPort) origin.port = "null port";
  if (origin.description.empty()) origin.description = origin.port;
  return origin;
}

// The bytes of a phone server's port pass in the server.
bool FailThroughServer() {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "nothing can be traced through a phone server"));
}

}  // namespace

bool Diag_FTM::StartTrace(const char* file_name) {
  if (server_mode()) return FailThroughServer();
  const bool was_in_the_way = trace().keeps() || trace().state() != CaptureState::kNone;
  const auto open = [file_name] { return OpenCaptureFile(file_name); };
  if (trace().Start(OriginOf(transport().port(), port_), open, parts_)) return true;
  log().WriteLine(kLogErr, "Trace file: %s cannot be written or is in use, or a trace runs already", file_name);
  // One that was running and has ended meanwhile was none in the way.
  const bool in_the_way = trace().keeps() || trace().state() != CaptureState::kNone;
  return Fail(was_in_the_way && in_the_way ? Failure(KRAL_ERROR_ARGUMENT, "a trace runs already, or waits for its disk")
                                           : FileFailure(file_name, "cannot be written or is in use"));
}

bool Diag_FTM::StopTrace() {
  const bool running = trace().keeps() || trace().state() != CaptureState::kNone;
  if (trace().Stop()) return true;
  if (trace().state() != CaptureState::kNone) {
    return Fail(Failure(KRAL_ERROR_NO_ANSWER, "frames of the trace still wait for the disk"));
  }
  return Fail(running ? Failure(KRAL_ERROR_BAD_FILE, "the trace file does not hold all frames")
                      : Failure(KRAL_ERROR_ARGUMENT, "no trace is running"));
}

bool Diag_FTM::KeepTrace(uint32_t bytes) {
  if (server_mode()) return FailThroughServer();
  return trace().KeepLatest(bytes) ||
         Fail(Failure(KRAL_ERROR_ARGUMENT, "a trace is being written, or waits for its disk"));
}

bool Diag_FTM::SaveTrace(const char* file_name) {
  if (server_mode()) return FailThroughServer();
  if (!trace().keeps()) return Fail(Failure(KRAL_ERROR_ARGUMENT, "no traffic is kept"));
  const auto open = [file_name] { return OpenCaptureFile(file_name); };
  return trace().Save(OriginOf(transport().port(), port_), open) ||
         Fail(FileFailure(file_name, "cannot be written or is in use"));
}

}  // namespace kral
