// Brings values into the form in which handsets keep them, and back.
#include "storage/nv/nv_value.h"

#include <algorithm>
#include <utility>

#include "base/deflate.h"
#include "commands/nv/nv_item.h"

namespace kral::nv {
namespace {

size_t RoomOf(const NvItem& item) {
  if (item.is_file()) return kLongestValue;
  return item.is_array() ? kDataSize - 1 : kDataSize;
}

int DigitOf(char character) {
  if (character >= '0' && character <= '9') return character - '0';
  if (character >= 'A' && character <= 'F') return character - 'A' + 10;
  if (character >= 'a' && character <= 'f') return character - 'a' + 10;
  return -1;
}

}  // namespace

std::optional<NvBytes> ToStored(const NvItem& item, std::span<const uint8_t> value) {
  NvBytes stored = item.compressed ? Compress(value) : NvBytes(value.begin(), value.end());
  const size_t room = RoomOf(item);
  if (stored.size() > room) return std::nullopt;
  if (!item.is_file()) stored.resize(room);
  return stored;
}

std::optional<NvBytes> FromStored(NvItem& item, std::span<const uint8_t> stored) {
  if (item.compressed) {
    auto plain = Decompress(stored, item.type->longest());
    if (!plain || !item.type->Holds(*plain)) return std::nullopt;
    return plain;
  }
  if (item.generic && item.is_file()) {
    if (stored.size() > kLongestValue) return std::nullopt;
    item.type = std::make_shared<NvDataType>(NvDataType::Generic(stored.size()));
  }
  // A file has its own length; the data field of a numbered item is longer than most values.
  if (item.is_file() && !item.type->Holds(stored)) return std::nullopt;
  return item.type->Cut(stored);
}

std::string ToHex(std::span<const uint8_t> bytes) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  std::string text;
  text.reserve(bytes.size() * 3);
  for (const uint8_t byte : bytes) {
    if (!text.empty()) text += ' ';
    text += kDigits[byte >> 4];
    text += kDigits[byte & 15];
  }
  return text;
}

std::optional<NvBytes> FromHex(std::string_view text) {
  NvBytes bytes;
  for (size_t i = 0; i < text.size(); ++i) {
    if (std::string_view(" ,\t\r\n").find(text[i]) != std::string_view::npos) continue;
    const int high = DigitOf(text[i]);
    const int low = i + 1 < text.size() ? DigitOf(text[i + 1]) : -1;
    if (high < 0 || low < 0) return std::nullopt;
    bytes.push_back(static_cast<uint8_t>(high << 4 | low));
    ++i;
  }
  return bytes;
}

NvItem GenericItem(uint16_t id, uint16_t highest_element) {
  NvItem item;
  item.id = id;
  item.max_index = highest_element;
  item.type = std::make_shared<NvDataType>(NvDataType::Generic(RoomOf(item)));
  item.generic = true;
  return item;
}

NvItem GenericFile(std::string path, size_t size) {
  NvItem item;
  item.id = RfIdOfPath(path);
  item.path = std::move(path);
  item.type = std::make_shared<NvDataType>(NvDataType::Generic(size));
  item.generic = true;
  return item;
}

}  // namespace kral::nv
