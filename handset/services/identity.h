// Who the handset says it is, and the requests that ask whether it is there at all.
#ifndef KRAL_HANDSET_SERVICES_IDENTITY_H
#define KRAL_HANDSET_SERVICES_IDENTITY_H

#include <mutex>

#include "handset/line/request_table.h"

namespace kral::handset {

struct Identity {
  // Texts are cut or filled up with blanks to 11 (dates) and 8 (the others) characters.
  std::string compile_date = "Mar 14 2024";
  std::string compile_time = "09:26:53";
  std::string release_date = "Apr 02 2024";
  std::string release_time = "18:00:00";
  std::string version_directory = "VHS1.000";
  uint8_t station_class_mark = 0x2A;
  uint8_t air_interface_revision = 6;
  uint8_t mobile_model = 0x91;
  uint16_t firmware_revision = 0x0105;
  uint8_t slot_cycle_index = 2;
  uint8_t vocoder_major = 3;
  uint8_t vocoder_minor = 1;

  uint32_t hardware_version = 0x10A40E1;
  uint32_t extended_model = 0x0291;
  std::string software_revision = "VHS-1.0.105-R2";
  std::string model = "VH-1";

  // Taken over when the handset is made: NV item 0, and what request 65 compares with.
  uint32_t serial_number = 0x80C0FFEE;
  std::string service_code = "000000";  // six digits
};

// Loopback (123), version (0), extended build identity (124), diagnostic-service check (75, 50, 3).
class IdentityService final : public Service {
 public:
  explicit IdentityService(Identity identity) : identity_(std::move(identity)) {}

  void Register(RequestTable& table) override;

  Identity identity() const;
  void Set(Identity identity);
  // A version reply cut to so many bytes, as early handsets send it; 0 sends all of it.
  void SetVersionReplySize(size_t size);

 private:
  Bytes VersionReply() const;
  Bytes BuildIdReply() const;

  mutable std::mutex mutex_;
  Identity identity_;
  size_t version_reply_size_ = 0;
};

}  // namespace kral::handset

#endif
