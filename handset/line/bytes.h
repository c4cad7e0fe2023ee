// Byte strings as the wire and its scripts have them: hex text, little-endian fields.
#ifndef KRAL_HANDSET_LINE_BYTES_H
#define KRAL_HANDSET_LINE_BYTES_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace kral::handset {

using Bytes = std::vector<uint8_t>;
using ByteView = std::span<const uint8_t>;

// "2F 34 12", blanks optional. Throws std::invalid_argument on anything else: a mistyped script must not pass.
Bytes FromHex(std::string_view text);

std::string HexText(ByteView bytes);  // 2F 34 12
std::string HexDump(ByteView bytes);  // 16 bytes a line behind their offset

// Builds a packet field by field, little-endian.
class ByteWriter {
 public:
  ByteWriter& U8(uint32_t value) { return Put(value, 1); }
  ByteWriter& U16(uint32_t value) { return Put(value, 2); }
  ByteWriter& U32(uint32_t value) { return Put(value, 4); }
  ByteWriter& Raw(ByteView bytes);
  ByteWriter& Characters(std::string_view text, size_t size);  // cut, or filled up with blanks
  ByteWriter& Terminated(std::string_view text);               // with a NUL behind it

  Bytes Take() { return std::move(bytes_); }

 private:
  ByteWriter& Put(uint32_t value, size_t size);

  Bytes bytes_;
};

// Fields of what the host sent; a field that is not wholly there reads as 0.
uint8_t GetU8(ByteView bytes, size_t offset);
uint16_t GetU16(ByteView bytes, size_t offset);
uint32_t GetU32(ByteView bytes, size_t offset);

}  // namespace kral::handset

#endif
