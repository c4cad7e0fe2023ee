// Intel HEX: where the fields of a line are and how its digits are read.
//
//   :LLOOOOTT<data>CC   length, 16-bit offset, record type, data, checksum: the bytes of a line sum to 0 modulo 256
#ifndef KRAL_DOWNLOAD_IMAGES_HEX_FORMAT_H
#define KRAL_DOWNLOAD_IMAGES_HEX_FORMAT_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral::images::hex {

// Longer lines are cut, and then fail their checksum.
inline constexpr size_t kMostCharacters = 258;

inline constexpr size_t kLengthAt = 1;
inline constexpr size_t kOffsetAt = 3;
inline constexpr size_t kFirstTypeAt = 7;
inline constexpr size_t kSecondTypeAt = 8;
inline constexpr size_t kDataAt = 9;

// Bytes of a record around its data: length, offset (2) and type before it, the checksum behind it.
inline constexpr size_t kHeaderBytes = 4;
inline constexpr size_t kFrameBytes = kHeaderBytes + 1;

// Data behind an extended address record with this base goes to the second region.
inline constexpr uint32_t kSecondRegionBase = 0x08000000;

// Reading is lenient: every character has a value, letters of both cases the usual one.
inline constexpr auto kDigitValues = [] {
  std::array<uint16_t, 256> values{};
  for (unsigned c = 0; c < values.size(); ++c) {
    const unsigned value = c >= '0' && c <= '9' ? c - '0' : (c & ~0x20u) - 55;
    values[c] = static_cast<uint16_t>(value);
  }
  return values;
}();

}  // namespace kral::images::hex

#endif
