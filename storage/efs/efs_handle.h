// An open file or directory of the handset. The handset has few of them, so each is closed on every way out.
#ifndef KRAL_STORAGE_EFS_EFS_HANDLE_H
#define KRAL_STORAGE_EFS_EFS_HANDLE_H

#include "storage/efs/efs_format.h"
#include "storage/efs/efs_settings.h"

namespace kral::efs {

class RemoteHandle {
 public:
  ~RemoteHandle() noexcept(false);
  RemoteHandle(const RemoteHandle&) = delete;
  RemoteHandle& operator=(const RemoteHandle&) = delete;

  bool Close();  // true when the handset confirmed it, and when nothing is open; else it has been noted
  u32 value() const { return value_; }

 protected:
  RemoteHandle(Diag_FTM& phone, const EfsRequest<u32>& close, OpenHandles& handles, u32 time_out_ms)
      : phone_(phone), close_(close), handles_(handles), time_out_ms_(time_out_ms) {}

  // Sends the opening request of a path that the phone's packet buffer holds.
  bool OpenWithRequest(const char* path);

  Diag_FTM& phone_;

 private:
  const EfsRequest<u32> close_;
  OpenHandles& handles_;  // of this kind
  const u32 time_out_ms_;
  u32 value_ = 0;
  bool open_ = false;
};

class RemoteFile final : public RemoteHandle {
 public:
  RemoteFile(Diag_FTM& phone, const char* path);
  // Whether its path leaves the opening request short enough. A failure is logged; nothing is sent.
  static bool CanOpen(Diag_FTM& phone, const char* path);
  bool Open(u32 flags, u32 mode);  // a failure is logged
  const char* path() const { return path_; }

 private:
  const char* const path_;
};

class RemoteDirectory final : public RemoteHandle {
 public:
  explicit RemoteDirectory(Diag_FTM& phone);
  bool Open(const char* path);
};

}  // namespace kral::efs

#endif
