// One event of the handset as callers take it: 268 bytes, packed, asserted in <kral/collection.h> too.
#ifndef KRAL_TRANSPORT_EVENT_RECORD_H
#define KRAL_TRANSPORT_EVENT_RECORD_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral {

struct EventRecord {
  static constexpr size_t kSize = 268;
  // 0: time-stamp length (8 or 2), 1: time stamp, 9: event id, 11: payload length, 12: payload
  std::array<uint8_t, kSize> bytes{};
};
static_assert(sizeof(EventRecord) == EventRecord::kSize);

}  // namespace kral

#endif
