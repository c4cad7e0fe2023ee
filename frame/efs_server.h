// The file-system part of the phone service tool's server: the jobs on the handset's files that it takes over whole.
// Like the server itself it is supplied by a station's integration; every method may throw OrbtServerException.
#ifndef KRAL_FRAME_EFS_SERVER_H
#define KRAL_FRAME_EFS_SERVER_H

#include <cstdint>
#include <memory>
#include <string>

namespace kral {

enum class EfsImageJob : uint8_t {
  kBackupLegacy,
  kBackupAlternate,
  kUploadFile,
  kUploadFile2,
  kUploadImageAlternate,
  kDownloadFile,
};

// The server's EFS module for one phone.
class EfsModule {
 public:
  virtual ~EfsModule() = default;
  virtual bool RemoveTree(const std::string& folder) = 0;
  virtual bool EFS2CreatePhoneImage(EfsImageJob job, const std::string& image_file) = 0;
};

// The server's object for the phone on a port.
class EfsServerPhone {
 public:
  virtual ~EfsServerPhone() = default;
  virtual std::unique_ptr<EfsModule> MakeEfsModule() = 0;  // null on failure
  virtual bool LockPhone() = 0;
  virtual void UnlockPhone() = 0;
};

class EfsServer {
 public:
  virtual ~EfsServer() = default;
  virtual bool ConnectToPort(uint16_t port) = 0;
  virtual std::unique_ptr<EfsServerPhone> GetPhone(uint16_t port) = 0;  // null on failure
};

}  // namespace kral

#endif
