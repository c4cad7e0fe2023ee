// Names and records of PKV files, to and from their values.
#include "storage/pkv/pkv_format.h"

#include <algorithm>
#include <cstdio>

#include "base/little_endian.h"

namespace kral::pkv {
namespace {

constexpr size_t kDigits = 8;
constexpr std::string_view kSubscriptionMark = "_SIM_";

template <class... Values>
std::string Format(const char* format, Values... values) {
  std::array<char, 64> text;
  const int size = std::snprintf(text.data(), text.size(), format, values...);
  return {text.data(), static_cast<size_t>(std::clamp<int>(size, 0, text.size() - 1))};
}

// Digits of a base and nothing else, upper-case.
std::optional<uint32_t> ParseDigits(std::string_view digits, uint32_t base, uint32_t limit) {
  if (digits.empty()) return std::nullopt;
  uint64_t value = 0;
  for (const char c : digits) {
    const auto digit = static_cast<uint32_t>(c >= '0' && c <= '9' ? c - '0' : c >= 'A' && c <= 'F' ? c - 'A' + 10 : 99);
    if (digit >= base) return std::nullopt;
    value = value * base + digit;
    if (value > limit) return std::nullopt;
  }
  return static_cast<uint32_t>(value);
}

template <size_t kSize>
void StoreData(std::array<uint8_t, kSize>& record, size_t offset, const PkvNvItem& item) {
  std::ranges::copy(item.data, record.begin() + static_cast<ptrdiff_t>(offset));
}

void LoadData(std::span<const uint8_t> bytes, size_t offset, PkvNvItem& item) {
  const auto data = bytes.subspan(offset, kItemDataSize);
  std::ranges::copy(data, item.data.begin());
}

}  // namespace

std::string NameOfSubscription(std::string_view name, uint16_t subscription) {
  if (subscription == 0) return std::string(name);
  return std::string(name) + Format("_SIM_%u", static_cast<unsigned>(subscription));
}

std::optional<uint16_t> SubscriptionOfName(std::string_view text, std::string_view name) {
  if (!text.starts_with(name)) return std::nullopt;
  text.remove_prefix(name.size());
  if (text.empty()) return uint16_t{0};
  if (!text.starts_with(kSubscriptionMark)) return std::nullopt;
  text.remove_prefix(kSubscriptionMark.size());
  const auto number = ParseDigits(text, 10, UINT16_MAX);
  // One name per subscription: no leading zeros, and 0 has none.
  if (!number || text.front() == '0') return std::nullopt;
  return static_cast<uint16_t>(*number);
}

std::string NumberedName(uint32_t number) {
  return Format("%08u", static_cast<unsigned>(number));
}

std::string EntryName(uint32_t number) {
  return Format("%08X", static_cast<unsigned>(number));
}

std::optional<uint32_t> NumberOfName(std::string_view name) {
  if (name.size() != kDigits) return std::nullopt;
  return ParseDigits(name, 10, UINT32_MAX);
}

std::optional<uint32_t> EntryOfName(std::string_view name) {
  if (name.size() != kDigits) return std::nullopt;
  return ParseDigits(name, 16, UINT32_MAX);
}

std::string RfNvPath(uint32_t item) {
  return Format("/nv/item_files/rfnv/%08d", static_cast<int>(item));
}

std::string PathKey(std::string_view path) {
  std::string key;
  key.reserve(path.size() + 1);
  while (!path.empty()) {
    const std::string_view name = path.substr(0, path.find('/'));
    path.remove_prefix(std::min(name.size() + 1, path.size()));
    if (!name.empty()) key.append(1, '/').append(name);
  }
  return key.empty() ? "/" : key;
}

std::array<uint8_t, kArrayRecordSize> ArrayRecord(const PkvNvItem& item) {
  std::array<uint8_t, kArrayRecordSize> record{};
  StoreLe<uint16_t>(record, 0, kArrayRecordSize);
  StoreLe<uint16_t>(record, kArrayFlags, kRecordInUse);
  StoreLe<uint16_t>(record, kArrayId, item.id);
  StoreLe<uint16_t>(record, kArrayIndex, item.index);
  StoreData(record, kArrayData, item);
  return record;
}

std::array<uint8_t, kNumberedRecordSize> NumberedRecord(const PkvNvItem& item) {
  std::array<uint8_t, kNumberedRecordSize> record{};
  StoreLe<uint16_t>(record, 0, item.id);
  StoreLe<uint16_t>(record, kNumberedIndex, item.index);
  StoreLe<uint16_t>(record, kNumberedLength, kNumberedRecordSize);
  StoreData(record, kNumberedData, item);
  return record;
}

bool ParseArrayRecord(std::span<const uint8_t> bytes, PkvNvItem& item, uint16_t& flags) {
  if (bytes.size() < kArrayRecordSize) return false;
  flags = *LoadLe<uint16_t>(bytes, kArrayFlags);
  item.id = *LoadLe<uint16_t>(bytes, kArrayId);
  item.index = *LoadLe<uint16_t>(bytes, kArrayIndex);
  LoadData(bytes, kArrayData, item);
  return true;
}

bool ParseNumberedRecord(std::span<const uint8_t> bytes, PkvNvItem& item) {
  if (bytes.size() < kNumberedRecordSize) return false;
  item.id = *LoadLe<uint16_t>(bytes, 0);
  item.index = *LoadLe<uint16_t>(bytes, kNumberedIndex);
  LoadData(bytes, kNumberedData, item);
  return true;
}

}  // namespace kral::pkv
