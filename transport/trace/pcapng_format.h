// pcapng, as far as it is written and read here: blocks of 32-bit words with their length at both ends. Little-endian,
// as the byte-order magic of the section says.
#ifndef KRAL_TRANSPORT_TRACE_PCAPNG_FORMAT_H
#define KRAL_TRANSPORT_TRACE_PCAPNG_FORMAT_H

#include <cstddef>
#include <cstdint>

namespace kral::pcapng {

// A block: type, length of the whole block, body, the length again.
namespace block {
inline constexpr size_t kType = 0;    // u32
inline constexpr size_t kLength = 4;  // u32, a multiple of 4
inline constexpr size_t kBody = 8;
inline constexpr size_t kFrame = 12;  // bytes of a block without a body
inline constexpr uint32_t kSection = 0x0A0D0D0A;
inline constexpr uint32_t kInterface = 1;
inline constexpr uint32_t kStatistics = 5;
inline constexpr uint32_t kPacket = 6;
}  // namespace block

// Offsets in the bodies.
namespace section {
inline constexpr size_t kMagic = 0;  // u32
inline constexpr size_t kMajor = 4;  // u16
inline constexpr size_t kMinor = 6;
inline constexpr size_t kSectionLength = 8;  // i64
inline constexpr size_t kOptions = 16;
inline constexpr uint32_t kByteOrder = 0x1A2B3C4D;
inline constexpr uint16_t kThisMajor = 1;
inline constexpr uint64_t kUnknownLength = UINT64_MAX;
}  // namespace section

namespace interface {
inline constexpr size_t kLinkType = 0;  // u16, and 16 bits of zero
inline constexpr size_t kLongest = 4;   // u32: of a packet; 0 is no bound
inline constexpr size_t kOptions = 8;
// Link types for private use.
inline constexpr uint16_t kFrames = 147;  // one packet of the handset, unescaped, its two FCS bytes at the end
inline constexpr uint16_t kBytes = 148;   // bytes as they passed
}  // namespace interface

namespace packet {
inline constexpr size_t kInterface = 0;  // u32
inline constexpr size_t kTimeHigh = 4;   // u32: upper and lower half of the time
inline constexpr size_t kTimeLow = 8;
inline constexpr size_t kCaptured = 12;  // u32: bytes in the block
inline constexpr size_t kOriginal = 16;  // u32: bytes that there were
inline constexpr size_t kData = 20;
static_assert(kTimeLow == kTimeHigh + 4 && kData == kOriginal + 4);
}  // namespace packet

namespace statistics {
inline constexpr size_t kInterface = 0;
inline constexpr size_t kTimeHigh = 4;
inline constexpr size_t kTimeLow = 8;
inline constexpr size_t kOptions = 12;
}  // namespace statistics

// An option: code, bytes of its value, the value, zeros up to a whole word.
namespace option {
inline constexpr size_t kHead = 4;
inline constexpr uint16_t kEnd = 0;
inline constexpr uint16_t kComment = 1;  // of every block
inline constexpr uint16_t kName = 2;     // of an interface
inline constexpr uint16_t kDescription = 3;
inline constexpr uint16_t kTimeResolution = 9;
inline constexpr uint16_t kFcsLength = 13;
inline constexpr uint16_t kApplication = 4;    // of a section
inline constexpr uint16_t kPacketFlags = 2;    // of a packet
inline constexpr uint16_t kReceivedCount = 4;  // of statistics
inline constexpr uint16_t kDroppedCount = 5;
inline constexpr uint8_t kMicroseconds = 6;  // kTimeResolution: a power of ten
}  // namespace option

// kPacketFlags
namespace flags {
inline constexpr uint32_t kInbound = 1;
inline constexpr uint32_t kOutbound = 2;
inline constexpr uint32_t kDirection = 3;
inline constexpr uint32_t kFcsLengthShift = 5;
inline constexpr uint32_t kBadFcs = 1U << 24;
}  // namespace flags

constexpr size_t PaddedTo4(size_t size) {
  return (size + 3) & ~size_t{3};
}
static_assert(PaddedTo4(0) == 0 && PaddedTo4(1) == 4 && PaddedTo4(4) == 4);

}  // namespace kral::pcapng

#endif
