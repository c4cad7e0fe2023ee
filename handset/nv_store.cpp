// Keeps the items and answers the plain read and write.
#include "handset/nv_store.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr uint8_t kRead = 38;
constexpr uint8_t kWrite = 39;
constexpr size_t kDataOffset = 3;

// Both replies: code, item, all data bytes, status.
void Reply(ByteView request, const NvStore::Data& data, NvStatus status, Wire& wire) {
  wire.Send(ByteWriter().Raw(request.first(kDataOffset)).Raw(data).U16(static_cast<uint32_t>(status)).Take());
}

NvStore::Data Filled(ByteView bytes) {
  NvStore::Data data{};
  std::copy_n(bytes.begin(), std::min(bytes.size(), data.size()), data.begin());
  return data;
}

}  // namespace

NvStore::NvStore(uint32_t serial_number) {
  Set(kSerialNumberItem, ByteWriter().U32(serial_number).Take());
  SetReadOnly(kSerialNumberItem);
  Set(kFtmBootItem, Bytes{0});
}

void NvStore::Register(RequestTable& table) {
  // Hosts read with fewer data bytes than an item has, and write without the status behind the data.
  table.On(kRead, Length::AtLeast(kDataOffset), [this](ByteView request, Wire& wire) {
    Data data = Filled(request.subspan(kDataOffset));
    const NvStatus status = Read(GetU16(request, 1), data);
    Reply(request, data, status, wire);
  });
  table.On(kWrite, Length::AtLeast(kDataOffset + kItemSize), [this](ByteView request, Wire& wire) {
    const auto data = request.subspan(kDataOffset, kItemSize);
    Reply(request, Filled(data), Write(GetU16(request, 1), data), wire);
  });
}

NvStatus NvStore::Read(uint16_t item, Data& data, uint16_t subscription) const {
  const std::lock_guard lock(mutex_);
  if (const auto status = statuses_.find(item); status != statuses_.end()) return status->second;
  const auto value = values_.find({item, subscription});
  if (value == values_.end()) return NvStatus::kInactive;
  data = value->second;
  return NvStatus::kDone;
}

NvStatus NvStore::Write(uint16_t item, ByteView data, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  if (const auto status = statuses_.find(item); status != statuses_.end()) return status->second;
  if (read_only_.contains(item)) return NvStatus::kReadOnly;
  values_[{item, subscription}] = Filled(data);
  return NvStatus::kDone;
}

void NvStore::Set(uint16_t item, ByteView data, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  values_[{item, subscription}] = Filled(data);
}

std::optional<Bytes> NvStore::Value(uint16_t item, uint16_t subscription) const {
  const std::lock_guard lock(mutex_);
  const auto value = values_.find({item, subscription});
  if (value == values_.end()) return std::nullopt;
  return Bytes(value->second.begin(), value->second.end());
}

void NvStore::Erase(uint16_t item, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  values_.erase({item, subscription});
}

void NvStore::SetReadOnly(uint16_t item, bool read_only) {
  const std::lock_guard lock(mutex_);
  if (read_only) {
    read_only_.insert(item);
  } else {
    read_only_.erase(item);
  }
}

void NvStore::SetStatus(uint16_t item, NvStatus status) {
  const std::lock_guard lock(mutex_);
  if (status == NvStatus::kDone) {
    statuses_.erase(item);
  } else {
    statuses_[item] = status;
  }
}

}  // namespace kral::handset
