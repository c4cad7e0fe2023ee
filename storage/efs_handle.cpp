// Opens and closes files and directories of the handset, also where answers get lost or come late.
#include "storage/efs_handle.h"

#include <algorithm>
#include <chrono>
#include <vector>

#include "storage/efs_request.h"

namespace kral::efs {
namespace {

// How long the answer to a try that was given up is waited for once another try has been answered: the handset answers
// in order, so it comes at once or never.
constexpr std::chrono::milliseconds kLateAnswer{80};

struct Opened {
  u32 value;
  u32 error;
};

std::optional<Opened> ReadOpened(std::span<const u8> reply) {
  const auto value = LoadLe<u32>(reply, kHandleAt);
  const auto error = LoadLe<u32>(reply, kErrorBehindHandle);
  if (!value || !error) return std::nullopt;
  return Opened{*value, *error};
}

}  // namespace

bool RemoteHandle::OpenWithRequest() {
  if (!IsWithinLimit(phone_)) return false;
  int unanswered = 0;
  for (int attempt = 0; attempt < kTries && !open_; ++attempt) {
    std::optional<Opened> opened;
    if (Exchange(phone_, time_out_ms_)) opened = ReadOpened(phone_.packet().response());
    if (!opened && LastRefusal(phone_) == 0) ++unanswered;
    if (opened && opened->error == kDone) {
      value_ = opened->value;
      open_ = true;
    } else if (opened) {
      phone_.log().WriteLine(kLogErr, "EFS Open error code %d", static_cast<int>(opened->error));
    }
  }
  if (unanswered > 0) CloseStrays(unanswered);
  return open_;
}

// A try without an answer may have opened another handle all the same. Where its answer still comes, that one is
// closed; where it is lost, nothing tells which one it was.
void RemoteHandle::CloseStrays(int unanswered) {
  const auto request = phone_.packet().request();
  const std::vector<u8> header(request.begin(), request.begin() + kHeaderSize);
  std::vector<u32> strays;
  while (unanswered > 0) {
    const auto record = phone_.responses().PopWithin(kLateAnswer);
    if (!record) break;
    if (record->size() < kHeaderSize || !std::equal(header.begin(), header.end(), record->begin())) continue;
    --unanswered;
    const auto opened = ReadOpened(*record);
    if (opened && opened->error == kDone && !(open_ && opened->value == value_)) strays.push_back(opened->value);
  }
  for (const u32 stray : strays) CloseValue(stray);
  if (unanswered == 0) return;
  phone_.log().WriteLine(kLogErr, "EFS2 answer to an opening request is lost: the handset may keep a handle open");
}

bool RemoteHandle::Close() {
  if (!open_) return true;
  open_ = false;
  return CloseValue(value_);
}

bool RemoteHandle::CloseValue(u32 value) {
  Compose(phone_, close_, value);
  bool unanswered = false;
  for (int attempt = 0; attempt < kTries; ++attempt) {
    u32 error = 0;
    if (!Exchange(phone_, time_out_ms_) || !phone_.packet().ResponseAt32(kErrorBehindHeader, error)) {
      unanswered = true;
      continue;
    }
    // A handset that does not know the handle any more has closed it on a try whose answer was lost.
    if (error == kDone || (unanswered && error == kBadDescriptor)) return true;
  }
  phone_.log().WriteLine(kLogErr, "EFS2 handle %d could not be closed", static_cast<int>(value));
  return false;
}

RemoteFile::RemoteFile(Diag_FTM& phone) : RemoteHandle(phone, kClose, DefaultTimeOut(phone)) {}

bool RemoteFile::Open(const char* path, u32 flags, u32 mode) {
  Compose(phone_, kOpen, flags, mode, PathField(path));
  if (OpenWithRequest()) return true;
  phone_.log().WriteLine(kLogErr, "EFS2FileOpen() failed to open file %s", path == nullptr ? "" : path);
  return false;
}

RemoteDirectory::RemoteDirectory(Diag_FTM& phone) : RemoteHandle(phone, kCloseDirectory, PacketTimeOut(phone)) {}

bool RemoteDirectory::Open(const char* path) {
  Compose(phone_, kOpenDirectory, PathField(path));
  return OpenWithRequest();
}

}  // namespace kral::efs
