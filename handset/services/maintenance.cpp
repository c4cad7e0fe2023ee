// Answers the service requests and remembers what was asked of the handset.
#include "handset/services/maintenance.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr uint8_t kKeyPress = 32;
constexpr uint8_t kErrorLogRead = 42;
constexpr uint8_t kErrorLogClear = 43;
constexpr uint8_t kGetSwitches = 47;
constexpr uint8_t kSetSwitches = 48;
constexpr uint8_t kServiceCode = 65;
constexpr uint8_t kIs2000Status = 112;
constexpr uint8_t kBackup = 128;
constexpr uint8_t kBackupSubsystem = 55;
constexpr uint8_t kSecurityFreeze = 255;
constexpr uint8_t kStatusSubsystem = 4;
constexpr uint16_t kStatus = 14;

constexpr size_t kServiceCodeSize = 6;
constexpr size_t kMostRecords = 255;
constexpr size_t kLongestRecord = 255;
constexpr size_t kLongestLog = 4000;  // what a reply can hold

}  // namespace

void Maintenance::Register(RequestTable& table) {
  table.On(kKeyPress, Length::Exactly(3), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    keys_.push_back({request[1], request[2]});
    wire.Send(request);
  });
  table.On(kGetSwitches, Length::Exactly(1),
           [this](ByteView, Wire& wire) { wire.Send(ByteWriter().U8(kGetSwitches).U16(switches()).Take()); });
  table.On(kSetSwitches, Length::Exactly(3), [this](ByteView request, Wire& wire) {
    SetSwitches(GetU16(request, 1));
    wire.Send(request);
  });
  RegisterRecords(table);
  RegisterSecurity(table);
}

void Maintenance::RegisterRecords(RequestTable& table) {
  table.On(kErrorLogRead, Length::Exactly(1), [this](ByteView, Wire& wire) { wire.Send(ErrorLogReply()); });
  table.On(kErrorLogClear, Length::Exactly(2), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    if (request[1] >= error_records_.size()) return Refuse(Refusal::kBadParameter, request, wire);
    error_records_.erase(error_records_.begin() + request[1]);
    wire.Send(request);
  });
  table.OnSubsystem(kStatusSubsystem, kStatus, Length::Exactly(4), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    wire.Send(ByteWriter().Raw(request).Raw(status_record_).Take());
  });
  table.On(kIs2000Status, Length::Exactly(1), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    wire.Send(ByteWriter().Raw(request).Raw(is2000_status_record_).Take());
  });
}

void Maintenance::RegisterSecurity(RequestTable& table) {
  table.On(kServiceCode, Length::Exactly(1 + kServiceCodeSize), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    const ByteView given = request.subspan(1);
    const bool accepted = std::equal(given.begin(), given.end(), service_code_.begin(), service_code_.end());
    unlocked_ = unlocked_ || accepted;
    wire.Send(ByteWriter().U8(kServiceCode).U8(accepted ? 1 : 0).Take());
  });
  table.On(kBackup, Length::Exactly(4), [this](ByteView request, Wire& wire) {
    if (request[1] != kBackupSubsystem || GetU16(request, 2) != 0) {
      return Refuse(Refusal::kBadCommand, request, wire);
    }
    const std::lock_guard lock(mutex_);
    ++backups_;
    wire.Send(request);
  });
  table.On(kSecurityFreeze, Length::Exactly(1), [this](ByteView request, Wire& wire) {
    const std::lock_guard lock(mutex_);
    frozen_ = true;
    wire.Send(request);
  });
}

void Maintenance::OnReset() {
  const std::lock_guard lock(mutex_);
  unlocked_ = false;
}

std::vector<KeyPress> Maintenance::keys() const {
  const std::lock_guard lock(mutex_);
  return keys_;
}

uint16_t Maintenance::switches() const {
  const std::lock_guard lock(mutex_);
  return switches_;
}

void Maintenance::SetSwitches(uint16_t switches) {
  const std::lock_guard lock(mutex_);
  switches_ = switches;
}

bool Maintenance::unlocked() const {
  const std::lock_guard lock(mutex_);
  return unlocked_;
}

bool Maintenance::frozen() const {
  const std::lock_guard lock(mutex_);
  return frozen_;
}

uint32_t Maintenance::backups() const {
  const std::lock_guard lock(mutex_);
  return backups_;
}

void Maintenance::AddErrorRecord(ByteView record) {
  const std::lock_guard lock(mutex_);
  if (error_records_.size() == kMostRecords) return;
  const ByteView kept = record.first(std::min(record.size(), kLongestRecord));
  error_records_.emplace_back(kept.begin(), kept.end());
}

void Maintenance::SetStatusRecord(Bytes record) {
  const std::lock_guard lock(mutex_);
  status_record_ = std::move(record);
}

void Maintenance::SetIs2000StatusRecord(Bytes record) {
  const std::lock_guard lock(mutex_);
  is2000_status_record_ = std::move(record);
}

// Code, number of records told, then each as index, length and bytes; those that do not fit are left for a later read.
Bytes Maintenance::ErrorLogReply() const {
  const std::lock_guard lock(mutex_);
  ByteWriter records;
  size_t told = 0;
  size_t size = 0;
  for (const Bytes& record : error_records_) {
    size += 2 + record.size();
    if (size > kLongestLog) break;
    records.U8(static_cast<uint32_t>(told++)).U8(static_cast<uint32_t>(record.size())).Raw(record);
  }
  return ByteWriter().U8(kErrorLogRead).U8(static_cast<uint32_t>(told)).Raw(records.Take()).Take();
}

}  // namespace kral::handset
