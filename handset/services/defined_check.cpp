// Follows a path through the fields of a reply, and holds a value to the field's type: the ranges of a definition tell
// what may be sent, not what may be answered.
#include "handset/services/defined_check.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>
#include <stdexcept>

namespace kral::handset {
namespace {

constexpr size_t kMostElements = 65536;

template <class Number>
std::optional<Number> WholeNumber(std::string_view text, int base = 10) {
  Number number{};
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  return error == std::errc() && end == text.data() + text.size() ? std::optional(number) : std::nullopt;
}

// "[2]"; nothing for a field that is no array.
void CheckElement(const DefinedField& field, std::string_view element) {
  if (field.count.empty() && element.empty()) return;
  if (field.count.empty()) throw std::invalid_argument(field.name + " is no array");
  if (element.size() < 3 || element.back() != ']') {
    throw std::invalid_argument(field.name + " is an array: " + field.name + "[0] is its first element");
  }
  const auto digits = element.substr(1, element.size() - 2);
  const auto index = WholeNumber<size_t>(digits);
  const size_t count = WholeNumber<size_t>(field.count).value_or(field.most_elements.value_or(kMostElements));
  if (!index || *index >= count || std::to_string(*index) != digits) {
    throw std::invalid_argument(field.name + " has no element " + std::string(digits));
  }
}

[[noreturn]] void RejectValue(const DefinedField& field, const std::string& value) {
  throw std::invalid_argument(field.name + " cannot be '" + value + "'");
}

std::string CheckedReal(const DefinedField& field, const std::string& value) {
  double number = 0;
  const auto [end, error] = std::from_chars(value.data(), value.data() + value.size(), number);
  if (error != std::errc() || end != value.data() + value.size()) RejectValue(field, value);
  const bool is_too_large = std::isfinite(number) && std::abs(number) > std::numeric_limits<float>::max();
  if (field.width == 4 && is_too_large) RejectValue(field, value);
  return value;
}

std::string CheckedWhole(const DefinedField& field, const std::string& value) {
  std::string_view text = value;
  const bool negative = text.starts_with('-');
  if (negative) text.remove_prefix(1);
  const bool hexadecimal = text.starts_with("0x");
  if (hexadecimal) text.remove_prefix(2);
  const auto magnitude = WholeNumber<uint64_t>(text, hexadecimal ? 16 : 10);
  const bool has_sign = field.type[0] == 's';
  const uint64_t all_bits = UINT64_MAX >> (64 - field.bits);
  const uint64_t most = !has_sign ? (negative ? 0 : all_bits) : (all_bits >> 1) + (negative ? 1 : 0);
  if (!magnitude || *magnitude > most) RejectValue(field, value);
  return (negative && *magnitude != 0 ? "-" : "") + std::to_string(*magnitude);
}

std::string CheckedBlock(const DefinedField& field, const std::string& value) {
  const auto fixed = WholeNumber<size_t>(field.size);
  if (value.size() > fixed.value_or(field.most_bytes.value_or(SIZE_MAX))) RejectValue(field, value);
  return value;
}

}  // namespace

std::optional<std::string> CheckedValue(const std::vector<DefinedField>& fields, std::string_view path,
                                        const std::string& value) {
  const size_t dot = path.find('.');
  const std::string_view step = path.substr(0, dot);
  const std::string_view name = step.substr(0, step.find('['));
  const auto field = std::ranges::find(fields, name, &DefinedField::name);
  if (name.empty() || field == fields.end()) return std::nullopt;
  CheckElement(*field, step.substr(name.size()));
  if (dot != std::string_view::npos) return CheckedValue(field->fields, path.substr(dot + 1), value);
  if (!field->fields.empty()) throw std::invalid_argument(field->name + " is made of fields, which are set one by one");
  if (field->bits == 0) return CheckedBlock(*field, value);
  const auto word = field->words.find(value);
  const std::string& number = word != field->words.end() ? word->second : value;
  return field->type[0] == 'f' ? CheckedReal(*field, number) : CheckedWhole(*field, number);
}

}  // namespace kral::handset
