// Keeps definitions and finds them by name; numbers of fields and what they may be.
#include "commands/defined/definition.h"

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cmath>
#include <limits>

namespace kral::defined {
namespace {

Bits Highest(unsigned bits) {
  return bits >= 64 ? UINT64_MAX : (Bits{1} << bits) - 1;
}

template <class T, class... Form>
std::optional<T> ParseWhole(std::string_view text, Form... form) {
  T value{};
  const auto result = std::from_chars(text.data(), text.data() + text.size(), value, form...);
  if (text.empty() || result.ec != std::errc() || result.ptr != text.data() + text.size()) return std::nullopt;
  return value;
}

std::optional<Bits> ParseReal(const Field& field, std::string_view text) {
  const auto value = ParseWhole<double>(text);
  if (!value || !std::isfinite(*value)) return std::nullopt;
  const auto bits = std::bit_cast<Bits>(*value);
  return FitsType(field, bits) ? std::optional(Rounded(field, bits)) : std::nullopt;
}

std::optional<Bits> ParseInteger(const Field& field, std::string_view text) {
  const bool negative = text.starts_with('-');
  if (negative) text.remove_prefix(1);
  const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
  const auto magnitude = hexadecimal ? ParseWhole<Bits>(text.substr(2), 16) : ParseWhole<Bits>(text);
  if (!magnitude || (negative && *magnitude > Bits{1} << 63)) return std::nullopt;
  const Bits value = negative ? Bits{0} - *magnitude : *magnitude;
  const bool wrong_sign = field.kind == Kind::kSigned ? !negative && *magnitude > INT64_MAX : negative && value != 0;
  if (wrong_sign || !FitsType(field, value)) return std::nullopt;
  return value;
}

bool IsLess(Kind kind, Bits left, Bits right) {
  switch (kind) {
    case Kind::kSigned:
      return static_cast<int64_t>(left) < static_cast<int64_t>(right);
    case Kind::kReal:
      return std::bit_cast<double>(left) < std::bit_cast<double>(right);
    default:
      return left < right;
  }
}

}  // namespace

const Bits* Enumeration::Find(std::string_view name) const {
  const auto found = std::ranges::find(values, name, [](const auto& value) { return std::string_view(value.first); });
  return found == values.end() ? nullptr : &found->second;
}

const std::string* Enumeration::NameOf(Bits value) const {
  const auto found = std::ranges::find(values, value, [](const auto& entry) { return entry.second; });
  return found == values.end() ? nullptr : &found->first;
}

unsigned BitCount(const Field& field) {
  return field.bit_count != 0 ? field.bit_count : 8U * field.width;
}

Bits SignExtended(Bits value, unsigned bits) {
  if (bits >= 64) return value;
  const Bits sign = Bits{1} << (bits - 1);
  return ((value & Highest(bits)) ^ sign) - sign;
}

bool FitsType(const Field& field, Bits value) {
  switch (field.kind) {
    case Kind::kUnsigned:
      return value <= Highest(BitCount(field));
    case Kind::kSigned:
      return SignExtended(value, BitCount(field)) == value;
    default:
      return field.width == 8 || !(std::abs(std::bit_cast<double>(value)) > std::numeric_limits<float>::max());
  }
}

Bits Rounded(const Field& field, Bits value) {
  if (field.kind != Kind::kReal || field.width != 4 || !FitsType(field, value)) return value;
  return std::bit_cast<Bits>(static_cast<double>(static_cast<float>(std::bit_cast<double>(value))));
}

bool IsInRange(const Field& field, Bits value) {
  if (field.kind == Kind::kReal && !std::isfinite(std::bit_cast<double>(value))) return false;
  return FitsType(field, value) && !(field.least && IsLess(field.kind, value, *field.least)) &&
         !(field.most && IsLess(field.kind, *field.most, value));
}

std::pair<Bits, Bits> RangeOf(const Field& field) {
  const unsigned bits = BitCount(field);
  Bits least = 0;
  Bits most = Highest(bits);
  if (field.kind == Kind::kSigned) {
    least = SignExtended(Bits{1} << (bits - 1), bits);
    most = Highest(bits - 1);
  } else if (field.kind == Kind::kReal) {
    least = std::bit_cast<Bits>(-std::numeric_limits<double>::infinity());
    most = std::bit_cast<Bits>(std::numeric_limits<double>::infinity());
  }
  return {field.least.value_or(least), field.most.value_or(most)};
}

std::optional<Bits> ParseNumber(const Field& field, std::string_view text) {
  if (field.enumeration) {
    if (const Bits* const value = field.enumeration->Find(text)) return *value;
  }
  return field.kind == Kind::kReal ? ParseReal(field, text) : ParseInteger(field, text);
}

std::string NumberText(const Field& field, Bits value) {
  if (field.kind == Kind::kUnsigned) return std::to_string(value);
  if (field.kind == Kind::kSigned) return std::to_string(static_cast<int64_t>(value));
  std::array<char, 32> text;
  const auto real = std::bit_cast<double>(value);
  const auto result = field.width == 4 ? std::to_chars(text.data(), text.data() + text.size(), static_cast<float>(real))
                                       : std::to_chars(text.data(), text.data() + text.size(), real);
  return {text.data(), result.ptr};
}

std::string RangeText(const Field& field) {
  std::string text;
  if (field.enumeration && !field.least && !field.most) {
    for (const auto& [name, value] : field.enumeration->values) text += (text.empty() ? "" : ", ") + name;
    return text;
  }
  if (field.kind == Kind::kReal && !field.least && !field.most) {
    text = "a number";
  } else {
    const auto [least, most] = RangeOf(field);
    const bool real = field.kind == Kind::kReal;
    text = (real && !field.least ? "any" : NumberText(field, least)) + " to " +
           (real && !field.most ? "any" : NumberText(field, most));
  }
  return field.unit.empty() ? text : text + " " + field.unit;
}

std::string TypeText(const Field& field) {
  const std::string bits = std::to_string(BitCount(field));
  switch (field.kind) {
    case Kind::kUnsigned:
      return "u" + bits;
    case Kind::kSigned:
      return "s" + bits;
    case Kind::kReal:
      return "f" + bits;
    case Kind::kText:
      return "text";
    case Kind::kBytes:
      return "bytes";
    case Kind::kRecord:
      return "record";
    case Kind::kBits:
      return "bits";
    default:
      return "zlib";
  }
}

CommandPtr Definitions::Find(std::string_view name) const {
  const auto found = by_name_.find(name);
  return found == by_name_.end() ? nullptr : commands_[found->second];
}

void Definitions::Add(std::vector<CommandPtr> commands) {
  for (CommandPtr& command : commands) {
    by_name_.emplace(command->name, commands_.size());
    commands_.push_back(std::move(command));
  }
}

void Definitions::Clear() {
  *this = {};
}

}  // namespace kral::defined
