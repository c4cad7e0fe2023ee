// The packets of the KOVA download protocol. Multi-byte fields are big-endian here, unlike everywhere else.
#ifndef KRAL_DOWNLOAD_KOVA_KOVA_FORMAT_H
#define KRAL_DOWNLOAD_KOVA_KOVA_FORMAT_H

#include <cstddef>
#include <cstdint>

namespace kral::kova {

inline constexpr uint8_t kAcknowledge = 0x02;
inline constexpr uint8_t kGo = 0x05;  // address u32
inline constexpr uint8_t kNop = 0x06;
inline constexpr uint8_t kReset = 0x0A;
inline constexpr uint8_t kSoftwareVersion = 0x0C;
inline constexpr uint8_t kSoftwareVersionReply = 0x0D;  // version u8
inline constexpr uint8_t kWrite32 = 0x0F;               // address u32, length u16, data

inline constexpr uint32_t kMostWriteData = 4089;

// From this on, a caller's maximum packet holds twice the largest write; below, half of it is what a write carries.
inline constexpr uint32_t kAmplePacket = 8178;
static_assert(kAmplePacket == 2 * kMostWriteData);

}  // namespace kral::kova

#endif
