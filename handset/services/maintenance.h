// What a service bench finds on a handset: keys, switches, error log, status records, service code, freeze, backup.
#ifndef KRAL_HANDSET_SERVICES_MAINTENANCE_H
#define KRAL_HANDSET_SERVICES_MAINTENANCE_H

#include <mutex>

#include "handset/line/request_table.h"

namespace kral::handset {

struct KeyPress {
  uint8_t hold;
  uint8_t key;
  bool operator==(const KeyPress&) const = default;
};

// Keys (32), error log (42, 43), switches (47, 48), service code (65), status records (75, 4, 14 and 112), NV backup
// (128, 55), security freeze (255).
class Maintenance final : public Service {
 public:
  explicit Maintenance(std::string service_code) : service_code_(std::move(service_code)) {}

  void Register(RequestTable& table) override;
  void OnReset() override;  // the service code must be given again

  std::vector<KeyPress> keys() const;
  uint16_t switches() const;
  void SetSwitches(uint16_t switches);
  bool unlocked() const;  // the service code was given
  bool frozen() const;
  uint32_t backups() const;

  void AddErrorRecord(ByteView record);  // at most 255 of at most 255 bytes
  void SetStatusRecord(Bytes record);
  void SetIs2000StatusRecord(Bytes record);

 private:
  void RegisterRecords(RequestTable& table);
  void RegisterSecurity(RequestTable& table);
  Bytes ErrorLogReply() const;

  mutable std::mutex mutex_;
  const std::string service_code_;
  std::vector<KeyPress> keys_;
  std::vector<Bytes> error_records_;
  Bytes status_record_ = FromHex("01 00 05 00 00 00 2A 06");
  Bytes is2000_status_record_ = FromHex("02 00 10 27 00 00 07 0D");
  uint16_t switches_ = 0x1234;
  bool unlocked_ = false;
  bool frozen_ = false;
  uint32_t backups_ = 0;
};

}  // namespace kral::handset

#endif
