// The capture file: packets one behind the other, each with the time it came. Multi-byte fields are little-endian.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_FORMAT_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_FORMAT_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral {

namespace capture_head {
// The last character ends a listing of the file on a terminal.
inline constexpr std::array<uint8_t, 8> kMagic = {'K', 'R', 'A', 'L', 'C', 'A', 'P', 0x1A};
inline constexpr size_t kVersion = 8;    // u16
inline constexpr size_t kHeadSize = 10;  // u16: where the first record begins; later versions may have longer heads
// u32: by how many milliseconds a time is at most behind one in front of it, rounded up, and 1. Written when the file
// has ended as it should; 0 and kStepsUnknown: nobody knows.
inline constexpr size_t kStepsBack = 12;
inline constexpr uint32_t kStepsUnknown = UINT32_MAX;
inline constexpr size_t kSize = 16;
inline constexpr uint16_t kRecords = 1;  // versions: behind the head are records,
inline constexpr uint16_t kBlocks = 2;   // or blocks of them, each a zlib stream
}  // namespace capture_head

// A record: this head, then the packet as it was de-framed, FCS bytes included.
namespace capture_record {
inline constexpr size_t kMicroseconds = 0;       // u64, since 1970 UTC
inline constexpr size_t kLength = 8;             // u16
inline constexpr size_t kLengthComplement = 10;  // u16: tells a record from what a crash left behind the last one
inline constexpr size_t kSize = 12;
inline constexpr size_t kShortestPacket = 2;
}  // namespace capture_record

// A block: this head, then a zlib stream of whole records. Each can be read without those in front of it.
namespace capture_block {
inline constexpr std::array<uint8_t, 4> kMark = {'K', 'B', 'L', 'K'};
inline constexpr size_t kStreamSize = 4;            // u32
inline constexpr size_t kStreamSizeComplement = 8;  // u32
inline constexpr size_t kRecordsSize = 12;          // u32: what the stream holds
inline constexpr size_t kMicroseconds = 16;         // u64: of the first record
inline constexpr size_t kSize = 24;
inline constexpr size_t kMostRecords = size_t{128} << 10;
inline constexpr size_t kLongestStream = kMostRecords + 1024;  // what does not shrink grows a little
}  // namespace capture_block

}  // namespace kral

#endif
