// Keeps the items and answers reads and writes: plain, of array elements, of subscriptions, in batches.
#include "handset/services/nv_store.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr uint8_t kRead = 38;
constexpr uint8_t kWrite = 39;
constexpr size_t kDataOffset = 3;
constexpr size_t kElementRequest = 4;  // no data: how a read of an element is told from a plain one

constexpr uint8_t kNvSubsystem = 48;
constexpr uint16_t kBatchWrite = 0;
constexpr uint16_t kReadOfSubscription = 1;
constexpr uint16_t kWriteOfSubscription = 2;
constexpr size_t kHeaderOfSubscription = 8;  // code, subsystem, command, item, subscription
constexpr size_t kBatchHeader = 10;          // code, subsystem, command, count, size, zero
constexpr size_t kBatchItemHeader = 4;       // length, item, zero
constexpr size_t kLongestBatch = 1320;

// All replies but that of the batch: the head of the request, all data bytes, the status.
void Reply(ByteView head, ByteView data, NvStatus status, Wire& wire) {
  wire.Send(ByteWriter().Raw(head).Raw(data).U16(static_cast<uint32_t>(status)).Take());
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
    request.size() == kElementRequest ? ReadElement(request, wire) : ReadPlain(request, wire);
  });
  table.On(kWrite, Length::AtLeast(kDataOffset + kItemSize), [this](ByteView request, Wire& wire) {
    const auto data = request.subspan(kDataOffset, kItemSize);
    Reply(request.first(kDataOffset), data, Write(GetU16(request, 1), data), wire);
  });
  table.OnSubsystem(kNvSubsystem, kBatchWrite, Length::AtLeast(kBatchHeader),
                    [this](ByteView request, Wire& wire) { WriteBatch(request, wire); });
  table.OnSubsystem(kNvSubsystem, kReadOfSubscription, Length::AtLeast(kHeaderOfSubscription),
                    [this](ByteView request, Wire& wire) {
                      Data data = Filled(request.subspan(kHeaderOfSubscription));
                      const NvStatus status = Read(GetU16(request, 4), data, GetU16(request, 6));
                      Reply(request.first(kHeaderOfSubscription), data, status, wire);
                    });
  table.OnSubsystem(kNvSubsystem, kWriteOfSubscription, Length::AtLeast(kHeaderOfSubscription + kItemSize),
                    [this](ByteView request, Wire& wire) {
                      const auto data = request.subspan(kHeaderOfSubscription, kItemSize);
                      const NvStatus status = Write(GetU16(request, 4), data, GetU16(request, 6));
                      Reply(request.first(kHeaderOfSubscription), data, status, wire);
                    });
}

// Of an array, a plain request names the element in its first data byte, as a write does.
void NvStore::ReadPlain(ByteView request, Wire& wire) const {
  const uint16_t item = GetU16(request, 1);
  Data data = Filled(request.subspan(kDataOffset));
  NvStatus status = NvStatus::kBadItem;
  {
    const std::lock_guard lock(mutex_);
    if (const auto array = arrays_.find(item); array == arrays_.end()) {
      status = ReadLocked({item, uint16_t{0}, uint8_t{0}}, data);
    } else if (Data element{}; data[0] < array->second) {
      status = ReadLocked({item, uint16_t{0}, data[0]}, element);
      if (status == NvStatus::kDone) std::copy_n(element.begin(), kElementSize, data.begin() + 1);
    }
  }
  Reply(request.first(kDataOffset), data, status, wire);
}

void NvStore::ReadElement(ByteView request, Wire& wire) const {
  const uint16_t item = GetU16(request, 1);
  const uint8_t index = GetU8(request, kDataOffset);
  Data data{};
  NvStatus status = NvStatus::kBadItem;
  {
    const std::lock_guard lock(mutex_);
    const auto array = arrays_.find(item);
    if (array != arrays_.end() && index < array->second) {
      status = ReadLocked({item, uint16_t{0}, index}, data);
    } else if (array == arrays_.end() && !values_.contains({item, uint16_t{0}, uint8_t{0}})) {
      status = NvStatus::kInactive;
    }
  }
  Reply(request.first(kElementRequest), ByteView(data).first(kElementSize), status, wire);
}

// All items are tried; the total status is that of the first one that failed.
void NvStore::WriteBatch(ByteView request, Wire& wire) {
  const uint16_t count = GetU16(request, 4);
  auto rest = request.subspan(kBatchHeader);
  if (rest.size() != GetU16(request, 6) || rest.size() >= kLongestBatch) {
    return Refuse(Refusal::kBadLength, request, wire);
  }
  ByteWriter results;
  NvStatus total = NvStatus::kDone;
  for (uint16_t i = 0; i < count; ++i) {
    const size_t length = GetU8(rest, 0);
    if (rest.size() < kBatchItemHeader + length || length > kItemSize) {
      return Refuse(Refusal::kBadParameter, request, wire);
    }
    const auto data = rest.subspan(kBatchItemHeader, length);
    const NvStatus status = Write(GetU16(rest, 1), data);
    if (total == NvStatus::kDone) total = status;
    results.U8(static_cast<uint32_t>(length)).U16(GetU16(rest, 1)).U8(static_cast<uint32_t>(status)).Raw(data);
    rest = rest.subspan(kBatchItemHeader + length);
  }
  wire.Send(ByteWriter().Raw(request.first(8)).U16(static_cast<uint32_t>(total)).Raw(results.Take()).Take());
}

NvStatus NvStore::ReadLocked(const Key& key, Data& data) const {
  if (const auto status = statuses_.find(std::get<0>(key)); status != statuses_.end()) return status->second;
  const auto value = values_.find(key);
  if (value == values_.end()) return NvStatus::kInactive;
  data = value->second;
  return NvStatus::kDone;
}

NvStatus NvStore::Read(uint16_t item, Data& data, uint16_t subscription) const {
  const std::lock_guard lock(mutex_);
  return ReadLocked({item, subscription, uint8_t{0}}, data);
}

NvStatus NvStore::Write(uint16_t item, ByteView data, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  if (const auto status = statuses_.find(item); status != statuses_.end()) return status->second;
  if (read_only_.contains(item)) return NvStatus::kReadOnly;
  uint8_t index = 0;
  if (const auto array = arrays_.find(item); array != arrays_.end()) {
    index = GetU8(data, 0);
    if (data.empty() || index >= array->second) return NvStatus::kBadItem;
    data = data.subspan(1);
  }
  values_[{item, subscription, index}] = Filled(data);
  return NvStatus::kDone;
}

void NvStore::Set(uint16_t item, ByteView data, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  values_[{item, subscription, uint8_t{0}}] = Filled(data);
}

std::optional<Bytes> NvStore::ValueOf(const Key& key) const {
  const std::lock_guard lock(mutex_);
  const auto value = values_.find(key);
  if (value == values_.end()) return std::nullopt;
  return Bytes(value->second.begin(), value->second.end());
}

std::optional<Bytes> NvStore::Value(uint16_t item, uint16_t subscription) const {
  return ValueOf({item, subscription, uint8_t{0}});
}

void NvStore::Erase(uint16_t item, uint16_t subscription) {
  const std::lock_guard lock(mutex_);
  values_.erase({item, subscription, uint8_t{0}});
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

void NvStore::MakeArray(uint16_t item, uint8_t count) {
  const std::lock_guard lock(mutex_);
  arrays_[item] = count;
}

void NvStore::SetElement(uint16_t item, uint8_t index, ByteView data) {
  const std::lock_guard lock(mutex_);
  values_[{item, uint16_t{0}, index}] = Filled(data);
}

std::optional<Bytes> NvStore::Element(uint16_t item, uint8_t index) const {
  return ValueOf({item, uint16_t{0}, index});
}

}  // namespace kral::handset
