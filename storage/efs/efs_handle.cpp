// Opens and closes files and directories of the handset, also where answers get lost or come late.
#include "storage/efs/efs_handle.h"

#include "base/text_argument.h"
#include "platform/forced_unwind.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_strays.h"

namespace kral::efs {

// The closing is logged, and so may come to a function in which the host ends the thread.
RemoteHandle::~RemoteHandle() noexcept(false) {
  try {
    const KeepFailure keep;
    Close();
  } catch (...) {
    PassForcedUnwind();
    // Out of memory on the way out: the handset keeps it open.
  }
}

bool RemoteHandle::OpenWithRequest(const char* path) {
  if (!IsWithinLimit(phone_)) return false;
  // For good: what answers a try that is given up here may come in front of any later request.
  if (!phone_.server_mode()) {
    phone_.transport().SetUnclaimed([&phone = phone_](std::span<const u8> reply) { NoteLateReply(phone, reply); });
  }
  CloseStrays(phone_);  // first: the handset may give out their numbers anew
  u32 unanswered = 0;
  for (int attempt = 0; attempt < kTries && !open_; ++attempt) {
    if (attempt > 0 && IsAborted(phone_, "request")) break;
    std::optional<Opened> opened;
    const Reply reply = Checked(ExchangeOnce(phone_, time_out_ms_), [&] {
      opened = ReadOpened(phone_.packet().response());
      return opened || Fail(BadReply(phone_, "is too short"));
    });
    if (opened && IsDone(opened->error, path)) {
      value_ = opened->value;
      handles_.in_use = value_;
      open_ = true;
    } else if (opened) {
      phone_.log().WriteLine(kLogErr, "EFS Open error code %u", opened->error);
    } else if (reply.refusal() == 0 && !reply.not_sent()) {
      // It may have opened a handle all the same, also where the port was slow to take the request.
      ++unanswered;
      ++handles_.unanswered;
    }
  }
  if (unanswered > 0) {
    AwaitLateAnswers(phone_, handles_, unanswered);
    CloseStrays(phone_);
  }
  return open_;
}

bool RemoteHandle::Close() {
  if (!open_) return true;
  open_ = false;
  handles_.in_use.reset();
  const bool closed = CloseHandle(phone_, close_, value_, time_out_ms_);
  CloseStrays(phone_);
  // As with strays.
  if (!closed && phone_.state<Settings>().gave_up) handles_.strays.push_back(value_);
  return closed;
}

RemoteFile::RemoteFile(Diag_FTM& phone, const char* path)
    : RemoteHandle(phone, kClose, phone.state<Settings>().files, DefaultTimeOut(phone)), path_(TextOrEmpty(path)) {}

bool RemoteFile::CanOpen(Diag_FTM& phone, const char* path) {
  Compose(phone, kOpen, kOpenToRead, kModeOfReading, PathField(path));
  if (IsWithinLimit(phone)) return true;
  phone.log().WriteLine(kLogErr, "EFS2FileOpen() failed to open file %s", TextOrEmpty(path));
  return false;
}

bool RemoteFile::Open(u32 flags, u32 mode) {
  Compose(phone_, kOpen, flags, mode, PathField(path_));
  if (OpenWithRequest(path_)) return true;
  phone_.log().WriteLine(kLogErr, "EFS2FileOpen() failed to open file %s", path_);
  return false;
}

RemoteDirectory::RemoteDirectory(Diag_FTM& phone)
    : RemoteHandle(phone, kCloseDirectory, phone.state<Settings>().directories, PacketTimeOut(phone)) {}

bool RemoteDirectory::Open(const char* path) {
  Compose(phone_, kOpenDirectory, PathField(path));
  return OpenWithRequest(path);
}

}  // namespace kral::efs
