// Event reports, taken apart with every length checked against what was received.
#include "transport/collection/event_report.h"

#include <algorithm>

#include "base/little_endian.h"

namespace kral {
namespace {

constexpr size_t kReportHeader = 3;
constexpr size_t kReportLength = 1;

constexpr uint16_t kIdMask = 0x0FFF;
constexpr unsigned kFormShift = 13;
constexpr unsigned kFormMask = 3;
constexpr unsigned kFormWithLength = 3;
constexpr uint16_t kTruncatedTimeStamp = 0x8000;

}  // namespace

EventReportReader::EventReportReader(std::span<const uint8_t> packet) {
  if (packet.size() < kReportHeader + kFcsSize || packet[0] != kEventReportCode) return;
  const auto events = packet.subspan(kReportHeader, packet.size() - kReportHeader - kFcsSize);
  const size_t told = LoadLe<uint16_t>(packet, kReportLength).value_or(0);
  rest_ = events.first(std::min(events.size(), told));
}

std::optional<std::span<const uint8_t>> EventReportReader::Take(size_t count) {
  if (rest_.size() < count) {
    rest_ = {};
    return std::nullopt;
  }
  const auto taken = rest_.first(count);
  rest_ = rest_.subspan(count);
  return taken;
}

// Forms 0, 1 and 2 are their own size.
std::optional<size_t> EventReportReader::PayloadSize(unsigned form) {
  if (form != kFormWithLength) return form;
  const auto length = Take(1);
  return length ? std::optional<size_t>((*length)[0]) : std::nullopt;
}

std::optional<Event> EventReportReader::Next() {
  const auto head = Take(sizeof(uint16_t));
  if (!head) return std::nullopt;
  const uint16_t header = *LoadLe<uint16_t>(*head);
  const unsigned form = (header >> kFormShift) & kFormMask;
  const auto stamp = Take((header & kTruncatedTimeStamp) != 0 ? 2 : 8);
  if (!stamp) return std::nullopt;
  const auto size = PayloadSize(form);
  const auto payload = size ? Take(*size) : std::nullopt;
  if (!payload) return std::nullopt;

  Event event;
  event.id = header & kIdMask;
  event.payload = *payload;
  auto& bytes = event.record.bytes;
  bytes[EventRecord::kTimeStampLength] = static_cast<uint8_t>(stamp->size());
  std::copy(stamp->begin(), stamp->end(), bytes.begin() + EventRecord::kTimeStamp);
  StoreLe(std::span<uint8_t>(bytes), EventRecord::kEventId, event.id);
  // The one- and two-byte forms leave the length 0 although their bytes follow. Kept: readers know the forms.
  if (form == kFormWithLength) bytes[EventRecord::kPayloadLength] = static_cast<uint8_t>(payload->size());
  std::copy(payload->begin(), payload->end(), bytes.begin() + EventRecord::kPayload);
  return event;
}

}  // namespace kral
