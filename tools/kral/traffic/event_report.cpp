// Takes event reports apart, as include/kral/log.h and docs/logs.md describe the packets.
#include "tools/kral/traffic/event_report.h"

#include <algorithm>

namespace kral::tool {
namespace {

constexpr std::size_t kHeader = 3;  // the code, and the length of the events (u16)
constexpr std::size_t kFcs = 2;

unsigned Word(std::span<const std::uint8_t> bytes) {
  return bytes[0] | static_cast<unsigned>(bytes[1]) << 8;
}

}  // namespace

EventReport::EventReport(std::span<const std::uint8_t> packet) {
  if (packet.size() < kHeader + kFcs || packet.front() != kEventReport) return;
  const auto events = packet.subspan(kHeader, packet.size() - kHeader - kFcs);
  rest_ = events.first(std::min<std::size_t>(events.size(), Word(packet.subspan(1))));
}

std::optional<std::span<const std::uint8_t>> EventReport::Take(std::size_t count) {
  if (rest_.size() < count) {
    rest_ = {};
    return std::nullopt;
  }
  const auto taken = rest_.first(count);
  rest_ = rest_.subspan(count);
  return taken;
}

// The header word: bits 0..11 id, 13..14 payload of 0, 1 or 2 bytes or with a length byte, 15 truncated time stamp.
std::optional<ReportedEvent> EventReport::Next() {
  const auto head = Take(2);
  if (!head) return std::nullopt;
  const unsigned header = Word(*head);
  const auto stamp = Take((header & 0x8000) != 0 ? 2 : 8);
  if (!stamp) return std::nullopt;
  std::size_t size = header >> 13 & 3;
  if (size == 3) {
    const auto length = Take(1);
    if (!length) return std::nullopt;
    size = length->front();
  }
  const auto payload = Take(size);
  if (!payload) return std::nullopt;
  return ReportedEvent{static_cast<std::uint16_t>(header & 0x0FFF), *stamp, *payload};
}

}  // namespace kral::tool
