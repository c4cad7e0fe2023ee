// Keeps the masks. What is sent under them is log_generator.cpp's.
#include "handset/services/log_service.h"

#include <algorithm>

namespace kral::handset {
namespace {

constexpr uint8_t kLogConfig = 115;
constexpr uint8_t kMessageConfig = 125;
constexpr uint8_t kGetEventMask = 129;
constexpr uint8_t kSetEventMask = 130;

constexpr uint32_t kRetrieveRanges = 1;
constexpr uint32_t kSetMask = 3;
constexpr uint32_t kGetMask = 4;
constexpr uint8_t kSetLevels = 4;

constexpr size_t kLogConfigHeader = 8;
constexpr size_t kLogMaskData = kLogConfigHeader + 8;
constexpr size_t kEventMaskHeader = 6;
constexpr size_t kLevelsHeader = 8;
constexpr uint8_t kEventError = 1;

Bytes PackMask(const std::vector<bool>& mask) {
  Bytes bytes((mask.size() + 7) / 8);
  for (size_t i = 0; i < mask.size(); ++i) {
    if (mask[i]) bytes[i / 8] = static_cast<uint8_t>(bytes[i / 8] | 1 << i % 8);
  }
  return bytes;
}

// Takes `bits` of the packed mask; those behind them are off.
void UnpackMask(ByteView bytes, size_t bits, std::vector<bool>& mask) {
  for (size_t i = 0; i < mask.size(); ++i) mask[i] = i < bits && (bytes[i / 8] >> i % 8 & 1) != 0;
}

std::vector<uint16_t> IdsOf(const std::vector<bool>& mask, size_t first) {
  std::vector<uint16_t> ids;
  for (size_t i = 0; i < mask.size(); ++i) {
    if (mask[i]) ids.push_back(static_cast<uint16_t>(first + i));
  }
  return ids;
}

}  // namespace

LogService::LogService() {
  constexpr std::pair<size_t, size_t> kItems[] = {{0, 80}, {1, 1001}, {4, 1104}, {5, 653}, {7, 824}, {11, 508}};
  for (const auto& [equipment_id, items] : kItems) logs_[equipment_id].resize(items);
  events_.resize(3001);
}

void LogService::Register(RequestTable& table) {
  table.On(kLogConfig, Length::AtLeast(kLogConfigHeader),
           [this](ByteView request, Wire& wire) { OnLogConfig(request, wire); });
  table.On(kGetEventMask, Length::Exactly(4), [this](ByteView, Wire& wire) { OnGetEventMask(wire); });
  table.On(kSetEventMask, Length::AtLeast(kEventMaskHeader),
           [this](ByteView request, Wire& wire) { OnSetEventMask(request, wire); });
  table.On(kMessageConfig, Length::AtLeast(kLevelsHeader),
           [this](ByteView request, Wire& wire) { OnMessageLevels(request, wire); });
}

void LogService::OnReset() {
  const std::lock_guard lock(mutex_);
  for (Mask& mask : logs_) mask.assign(mask.size(), false);
  events_.assign(events_.size(), false);
  levels_.clear();
  ++changes_;
}

void LogService::SetItems(uint8_t equipment_id, uint32_t items) {
  const std::lock_guard lock(mutex_);
  logs_.at(equipment_id).assign(items, false);
  ++changes_;
}

void LogService::SetEvents(uint16_t events) {
  const std::lock_guard lock(mutex_);
  events_.assign(events, false);
  ++changes_;
}

std::vector<uint16_t> LogService::logs() const {
  const std::lock_guard lock(mutex_);
  std::vector<uint16_t> codes;
  for (size_t i = 0; i < kEquipmentIds; ++i) {
    const auto some = IdsOf(logs_[i], i * 4096);
    codes.insert(codes.end(), some.begin(), some.end());
  }
  return codes;
}

std::vector<uint16_t> LogService::events() const {
  const std::lock_guard lock(mutex_);
  return IdsOf(events_, 0);
}

std::vector<uint16_t> LogService::categories() const {
  const std::lock_guard lock(mutex_);
  std::vector<uint16_t> categories;
  for (const auto& [category, levels] : levels_) {
    if (levels != 0) categories.push_back(category);
  }
  return categories;
}

void LogService::OnLogConfig(ByteView request, Wire& wire) {
  const std::lock_guard lock(mutex_);
  const uint32_t operation = GetU32(request, 4);
  ByteWriter reply;
  reply.U32(kLogConfig).U32(operation).U32(0);  // status: done
  if (operation == kRetrieveRanges) {
    for (const Mask& mask : logs_) reply.U32(static_cast<uint32_t>(mask.size()));
  } else if (operation == kSetMask) {
    return SetLogMask(request, wire);
  } else if (operation == kGetMask && GetU32(request, kLogConfigHeader) < kEquipmentIds) {
    const uint32_t equipment_id = GetU32(request, kLogConfigHeader);
    const Mask& mask = logs_[equipment_id];
    reply.U32(equipment_id).U32(static_cast<uint32_t>(mask.size())).Raw(PackMask(mask));
  } else {
    return Refuse(Refusal::kBadParameter, request, wire);
  }
  wire.Send(reply.Take());
}

void LogService::SetLogMask(ByteView request, Wire& wire) {
  const uint32_t equipment_id = GetU32(request, kLogConfigHeader);
  const size_t bits = GetU32(request, kLogConfigHeader + 4);
  if (request.size() < kLogMaskData) return Refuse(Refusal::kBadLength, request, wire);
  if (equipment_id >= kEquipmentIds || bits > logs_[equipment_id].size()) {
    return Refuse(Refusal::kBadParameter, request, wire);
  }
  if (request.size() != kLogMaskData + (bits + 7) / 8) return Refuse(Refusal::kBadLength, request, wire);
  UnpackMask(request.subspan(kLogMaskData), bits, logs_[equipment_id]);
  ++changes_;
  wire.Send(ByteWriter().U32(kLogConfig).U32(kSetMask).U32(0).Raw(request.subspan(kLogConfigHeader)).Take());
}

void LogService::OnGetEventMask(Wire& wire) {
  const std::lock_guard lock(mutex_);
  wire.Send(ByteWriter().U32(kGetEventMask).U16(static_cast<uint32_t>(events_.size())).Raw(PackMask(events_)).Take());
}

void LogService::OnSetEventMask(ByteView request, Wire& wire) {
  const std::lock_guard lock(mutex_);
  const size_t bits = GetU16(request, 4);
  const bool fits = bits <= events_.size() && request.size() == kEventMaskHeader + (bits + 7) / 8;
  if (fits) {
    UnpackMask(request.subspan(kEventMaskHeader), bits, events_);
    ++changes_;
  }
  wire.Send(ByteWriter().U8(kSetEventMask).U8(fits ? 0 : kEventError).Raw(request.subspan(2)).Take());
}

void LogService::OnMessageLevels(ByteView request, Wire& wire) {
  const std::lock_guard lock(mutex_);
  const uint32_t first = GetU16(request, 2);
  const uint32_t last = GetU16(request, 4);
  if (request[1] != kSetLevels || last < first) return Refuse(Refusal::kBadParameter, request, wire);
  if (request.size() != kLevelsHeader + size_t{4} * (last - first + 1))
    return Refuse(Refusal::kBadLength, request, wire);
  for (uint32_t i = first; i <= last; ++i) {
    levels_[static_cast<uint16_t>(i)] = GetU32(request, kLevelsHeader + size_t{4} * (i - first));
  }
  ++changes_;
  wire.Send(request);
}

}  // namespace kral::handset
