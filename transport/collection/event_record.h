// One event of the handset as callers take it: 268 bytes, packed.
#ifndef KRAL_TRANSPORT_COLLECTION_EVENT_RECORD_H
#define KRAL_TRANSPORT_COLLECTION_EVENT_RECORD_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral {

struct EventRecord {
  static constexpr size_t kSize = 268;
  static constexpr size_t kTimeStampLength = 0;  // u8: 8 or 2
  static constexpr size_t kTimeStamp = 1;        // 8 bytes, of which the first 2 count when truncated
  static constexpr size_t kEventId = 9;          // u16, 12 bits used
  static constexpr size_t kPayloadLength = 11;   // u8; 0 for the one- and two-byte forms although their bytes are there
  static constexpr size_t kPayload = 12;
  static constexpr size_t kPayloadCapacity = 256;

  std::array<uint8_t, kSize> bytes{};
};
static_assert(sizeof(EventRecord) == EventRecord::kSize);
static_assert(EventRecord::kPayload + EventRecord::kPayloadCapacity == EventRecord::kSize);

}  // namespace kral

#endif
