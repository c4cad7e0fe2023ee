// The layout of compound documents, as reading and writing them share it ([MS-CFB] 2.2 to 2.6). Numbers are
// little-endian.
#ifndef KRAL_PLATFORM_COMPOUND_FORMAT_H
#define KRAL_PLATFORM_COMPOUND_FORMAT_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral::compound {

// The header, and where in it things are.
inline constexpr std::array<uint8_t, 8> kMagic = {0xD0, 0xCF, 0x11, 0xE0, 0xA1, 0xB1, 0x1A, 0xE1};
inline constexpr size_t kHeaderSize = 512;
inline constexpr size_t kSectorShift = 30;
inline constexpr size_t kFirstDirectorySector = 48;
inline constexpr size_t kFirstShortTableSector = 60;
inline constexpr size_t kFirstListSector = 68;
inline constexpr size_t kListInHeader = 76;  // the first sectors of the allocation table, up to the header's end
inline constexpr size_t kTablesInHeader = (kHeaderSize - kListInHeader) / sizeof(uint32_t);
static_assert(kTablesInHeader == 109);

// Sectors of 2^9 bytes, or of 2^12 where sizes have 64 bits; short streams share sectors of their own.
inline constexpr unsigned kSmallSectors = 9;
inline constexpr unsigned kLargeSectors = 12;
inline constexpr size_t kShortSectorSize = 64;
inline constexpr uint32_t kShortStreamBelow = 4096;

// What an allocation table says of a sector instead of the next one's number.
inline constexpr uint32_t kLastSector = 0xFFFFFFFA;
inline constexpr uint32_t kListSector = 0xFFFFFFFC;
inline constexpr uint32_t kTableSector = 0xFFFFFFFD;
inline constexpr uint32_t kEndOfChain = 0xFFFFFFFE;
inline constexpr uint32_t kFree = 0xFFFFFFFF;

// An entry of the directory: a name of UTF-16 units, then the rest.
inline constexpr size_t kEntrySize = 128;
inline constexpr size_t kEntryNameSize = 64;  // in bytes, with the terminating zero
inline constexpr size_t kEntryType = 66;
inline constexpr size_t kEntryColour = 67;
inline constexpr size_t kEntryLeft = 68;
inline constexpr size_t kEntryRight = 72;
inline constexpr size_t kEntryChild = 76;
inline constexpr size_t kEntryStart = 116;
inline constexpr size_t kEntryStreamSize = 120;
inline constexpr uint32_t kNoEntry = 0xFFFFFFFF;

enum EntryType : uint8_t { kStorage = 1, kStream = 2, kRoot = 5 };

}  // namespace kral::compound

#endif
