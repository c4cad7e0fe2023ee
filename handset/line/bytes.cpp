// Hex text and little-endian fields; knows nothing of any packet.
#include "handset/line/bytes.h"

#include <algorithm>
#include <stdexcept>

namespace kral::handset {
namespace {

constexpr std::string_view kDigits = "0123456789ABCDEF";

uint8_t DigitValue(char digit) {
  const char upper = digit >= 'a' && digit <= 'f' ? static_cast<char>(digit - 'a' + 'A') : digit;
  const size_t value = kDigits.find(upper);
  if (value == std::string_view::npos) throw std::invalid_argument(std::string("no hex digit: ") + digit);
  return static_cast<uint8_t>(value);
}

void AppendHex(std::string& text, uint8_t byte) {
  text += kDigits[byte >> 4];
  text += kDigits[byte & 15];
}

uint32_t GetField(ByteView bytes, size_t offset, size_t size) {
  if (offset > bytes.size() || bytes.size() - offset < size) return 0;
  uint32_t value = 0;
  for (size_t i = size; i-- > 0;) value = value << 8 | bytes[offset + i];
  return value;
}

}  // namespace

Bytes FromHex(std::string_view text) {
  std::string digits;
  std::ranges::copy_if(text, std::back_inserter(digits), [](char c) { return c != ' ' && c != '\n'; });
  if (digits.size() % 2 != 0) throw std::invalid_argument("odd number of hex digits");
  Bytes bytes;
  bytes.reserve(digits.size() / 2);
  for (size_t i = 0; i < digits.size(); i += 2) {
    bytes.push_back(static_cast<uint8_t>(DigitValue(digits[i]) << 4 | DigitValue(digits[i + 1])));
  }
  return bytes;
}

std::string HexText(ByteView bytes) {
  std::string text;
  for (const uint8_t byte : bytes) {
    if (!text.empty()) text += ' ';
    AppendHex(text, byte);
  }
  return text;
}

std::string HexDump(ByteView bytes) {
  constexpr size_t kPerLine = 16;
  std::string text;
  for (size_t offset = 0; offset < bytes.size(); offset += kPerLine) {
    text += "  ";
    AppendHex(text, static_cast<uint8_t>(offset >> 8));
    AppendHex(text, static_cast<uint8_t>(offset));
    text += ": " + HexText(bytes.subspan(offset, std::min(kPerLine, bytes.size() - offset))) + '\n';
  }
  return text.empty() ? "  (nothing)\n" : text;
}

ByteWriter& ByteWriter::Raw(ByteView bytes) {
  bytes_.insert(bytes_.end(), bytes.begin(), bytes.end());
  return *this;
}

ByteWriter& ByteWriter::Characters(std::string_view text, size_t size) {
  for (size_t i = 0; i < size; ++i) U8(static_cast<uint8_t>(i < text.size() ? text[i] : ' '));
  return *this;
}

ByteWriter& ByteWriter::Terminated(std::string_view text) {
  return Characters(text, text.size()).U8(0);
}

ByteWriter& ByteWriter::Put(uint32_t value, size_t size) {
  for (size_t i = 0; i < size; ++i) bytes_.push_back(static_cast<uint8_t>(value >> (8 * i)));
  return *this;
}

uint8_t GetU8(ByteView bytes, size_t offset) {
  return static_cast<uint8_t>(GetField(bytes, offset, 1));
}

uint16_t GetU16(ByteView bytes, size_t offset) {
  return static_cast<uint16_t>(GetField(bytes, offset, 2));
}

uint32_t GetU32(ByteView bytes, size_t offset) {
  return GetField(bytes, offset, 4);
}

}  // namespace kral::handset
