// Keeps values, and takes them from callers: one by one, or as a text.
#include "commands/defined/values.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <map>
#include <utility>

namespace kral::defined {
namespace {

constexpr uint32_t kKept = 64 << 10;  // elements for the next reply

}  // namespace

const Bits* Values::Number(uint32_t slot, uint32_t element) const {
  return IsSet(slot, element) ? &slots_[slot].numbers[element] : nullptr;
}

const std::string* Values::Bytes(uint32_t slot, uint32_t element) const {
  return IsSet(slot, element) ? &slots_[slot].bytes[element] : nullptr;
}

uint32_t Values::Reach(uint32_t slot, uint32_t from, uint32_t to) const {
  const std::vector<bool>& is_set = slots_[slot].is_set;
  for (auto end = std::min<uint32_t>(to, static_cast<uint32_t>(is_set.size())); end > from; --end) {
    if (is_set[end - 1]) return end - from;
  }
  return 0;
}

// A few bytes of a reply make elements of thousands of fields, as far behind as its arrays are long.
void Values::Reserve(uint32_t slot, uint32_t element) {
  auto& is_set = slots_[slot].is_set;
  if (element < is_set.size()) return;
  const auto more = static_cast<uint32_t>(element + 1 - is_set.size());
  if (more > kMostInAll - room_) {
    throw BadCall(message_->slots[slot]->path + " (element " + std::to_string(element) +
                  ") makes more than 1,048,576 elements of all fields");
  }
  is_set.resize(element + 1);
  room_ += more;
}

void Values::Mark(uint32_t slot, uint32_t element) {
  auto& is_set = slots_[slot].is_set;
  if (!is_set[element]) ++set_count_;
  is_set[element] = true;
}

void Values::SetNumber(uint32_t slot, uint32_t element, Bits value) {
  Reserve(slot, element);
  auto& numbers = slots_[slot].numbers;
  if (element >= numbers.size()) numbers.resize(element + 1);
  numbers[element] = value;
  Mark(slot, element);
}

void Values::SetBytes(uint32_t slot, uint32_t element, std::string value) {
  Reserve(slot, element);
  auto& bytes = slots_[slot].bytes;
  if (element >= bytes.size()) bytes.resize(element + 1);
  bytes[element] = std::move(value);
  Mark(slot, element);
}

void Values::Clear(uint32_t slot) {
  auto& is_set = slots_[slot].is_set;
  set_count_ -= static_cast<uint32_t>(std::ranges::count(is_set, true));
  is_set.assign(is_set.size(), false);
  slots_[slot].bytes.clear();
}

void Values::Clear(uint32_t slot, uint32_t from, uint32_t to) {
  for (uint32_t element = from; element < to; ++element) {
    if (!IsSet(slot, element)) continue;
    slots_[slot].is_set[element] = false;
    --set_count_;
  }
}

void Values::Clear() {
  if (room_ > kKept) *this = Values(*message_);
  for (uint32_t slot = 0; slot < slots_.size(); ++slot) Clear(slot);
}

uint32_t Reach(const Values& values, const Field& field, uint32_t first, uint32_t elements) {
  if (!field.is_group()) return values.Reach(field.slot, first, first + elements);
  uint32_t most = 0;
  for (const Field& member : field.members) {
    const uint32_t each = member.count.most;
    most = std::max(most, (Reach(values, member, first * each, elements * each) + each - 1) / each);
  }
  return most;
}

void CheckRange(const Field& field, Bits value) {
  if (!IsInRange(field, value)) {
    throw BadCall(field.path + "=" + NumberText(field, value) + " is out of range: " + RangeText(field));
  }
}

void SetChecked(Values& values, const Field& field, uint32_t element, Bits value) {
  value = Rounded(field, value);  // limits are rounded as well
  CheckRange(field, value);
  values.SetNumber(field.slot, element, value);
}

void SetChecked(Values& values, const Field& field, uint32_t element, std::string bytes) {
  const bool fixed = field.size.rule == Extent::Rule::kFixed;
  const bool wrong =
      field.kind == Kind::kBytes && fixed ? bytes.size() != field.size.most : bytes.size() > field.size.most;
  if (wrong) {
    throw BadCall(field.path + " has " + std::to_string(bytes.size()) + " bytes: it takes " +
                  (field.kind == Kind::kBytes && fixed ? "" : "at most ") + std::to_string(field.size.most));
  }
  if (field.size.rule == Extent::Rule::kTerminated && bytes.find('\0') != std::string::npos) {
    throw BadCall(field.path + " has a zero byte, which would end it");
  }
  values.SetBytes(field.slot, element, std::move(bytes));
}

namespace {

const Field* FindIn(const std::vector<Field>& fields, std::string_view name) {
  const auto found = std::ranges::find(fields, name, [](const Field& field) { return std::string_view(field.name); });
  return found == fields.end() ? nullptr : &*found;
}

// What a path with element numbers leads to. A last array without a number is meant as a whole.
struct Place {
  const Field* field;
  uint32_t element;
  bool whole;
};

Place FindPlace(const Message& message, std::string_view path) {
  const std::vector<Field>* fields = &message.fields;
  uint32_t element = 0;
  for (std::string_view rest = path;;) {
    const size_t end = std::min(rest.find_first_of(".["), rest.size());
    const Field* const field = FindIn(*fields, rest.substr(0, end));
    if (field == nullptr) throw BadCall("there is no field " + std::string(path));
    rest.remove_prefix(end);
    uint32_t index = 0;
    const bool numbered = rest.starts_with('[');
    if (numbered) {
      const auto result = std::from_chars(rest.data() + 1, rest.data() + rest.size(), index);
      const bool closed = result.ec == std::errc() && result.ptr != rest.data() + rest.size() && *result.ptr == ']';
      if (!closed || !field->is_array || index >= field->count.most) {
        throw BadCall(
            "there is no element " + std::string(path) +
            (field->is_array ? ": 0 to " + std::to_string(field->count.most - 1) : ": the field is no array"));
      }
      rest.remove_prefix(static_cast<size_t>(result.ptr + 1 - rest.data()));
    }
    element = element * field->count.most + index;
    if (rest.empty()) {
      if (field->is_group()) throw BadCall(std::string(path) + " is a group: its fields have values");
      return {field, element, field->is_array && !numbered};
    }
    if (field->is_array && !numbered)
      throw BadCall(std::string(path) + ": " + field->path + " is an array, and which element is not said");
    if (rest[0] != '.' || !field->is_group()) throw BadCall("there is no field " + std::string(path));
    rest.remove_prefix(1);
    fields = &field->members;
  }
}

int DigitOf(char character) {
  if (character >= '0' && character <= '9') return character - '0';
  if (character >= 'A' && character <= 'F') return character - 'A' + 10;
  if (character >= 'a' && character <= 'f') return character - 'a' + 10;
  return -1;
}

std::string BytesOfHex(const Field& field, std::string_view text) {
  std::string digits;
  for (const char c : text) {
    if (c != ' ') digits += c;
  }
  std::string bytes;
  for (size_t i = 0; i < digits.size(); i += 2) {
    const int high = DigitOf(digits[i]);
    const int low = i + 1 < digits.size() ? DigitOf(digits[i + 1]) : -1;
    if (high < 0 || low < 0) throw BadCall(field.path + " is not written as pairs of hexadecimal digits");
    bytes += static_cast<char>(high << 4 | low);
  }
  return bytes;
}

void SetElement(Values& values, const Field& field, uint32_t element, std::string_view text) {
  if (!field.is_number()) {
    return SetChecked(values, field, element, field.kind == Kind::kBytes ? BytesOfHex(field, text) : std::string(text));
  }
  const auto value = ParseNumber(field, text);
  if (!value)
    throw BadCall(field.path + "=" + std::string(text.substr(0, 40)) + " is out of range: " + RangeText(field));
  SetChecked(values, field, element, *value);
}

void SetPlace(Values& values, const Place& place, std::string_view text) {
  if (!place.whole) return SetElement(values, *place.field, place.element, text);
  values.Clear(place.field->slot, place.element, place.element + place.field->count.most);
  uint32_t index = 0;
  for (std::string_view rest = text; !rest.empty(); ++index) {
    if (index >= place.field->count.most) {
      throw BadCall(place.field->path + " has at most " + std::to_string(place.field->count.most) + " elements");
    }
    const size_t end = std::min(rest.find(','), rest.size());
    SetElement(values, *place.field, place.element + index, rest.substr(0, end));
    if (end + 1 == rest.size()) throw BadCall(place.field->path + " ends with a comma");
    rest.remove_prefix(std::min(end + 1, rest.size()));
  }
}

// The elements that a text has set, to see those that it sets twice.
class Given {
 public:
  // False where some of them are given already.
  bool Add(const Place& place) {
    const std::pair begin(place.field->slot, place.element);
    const uint32_t end = place.element + (place.whole ? place.field->count.most : 1);
    const auto next = ends_.lower_bound(begin);
    if (next != ends_.end() && next->first < std::pair(begin.first, end)) return false;
    if (next != ends_.begin()) {
      const auto before = std::prev(next);
      if (before->first.first == begin.first && before->second > place.element) return false;
    }
    ends_.emplace_hint(next, begin, end);
    return true;
  }

 private:
  std::map<std::pair<uint32_t, uint32_t>, uint32_t> ends_;  // by slot and first element
};

// Takes a value from the text: up to a blank, or between quotation marks, where a backslash stands in front of those
// and of itself.
std::string TakeValue(std::string_view& text, std::string_view path) {
  std::string value;
  if (!text.starts_with('"')) {
    const size_t end = std::min(text.find_first_of(" \t\r\n"), text.size());
    value = text.substr(0, end);
    text.remove_prefix(end);
    return value;
  }
  for (size_t i = 1; i < text.size(); ++i) {
    if (text[i] == '"') {
      text.remove_prefix(i + 1);
      return value;
    }
    if (text[i] == '\\' && i + 1 < text.size()) ++i;
    value += text[i];
  }
  throw BadCall(std::string(path) + ": a quotation mark is missing at the end");
}

}  // namespace

const Field* FindSlot(const Message& message, std::string_view path) {
  const auto found =
      std::ranges::find(message.slots, path, [](const Field* field) { return std::string_view(field->path); });
  return found == message.slots.end() ? nullptr : *found;
}

void Assign(std::string_view text, Values& values) {
  Given given;
  for (;;) {
    text.remove_prefix(std::min(text.find_first_not_of(" \t\r\n"), text.size()));
    if (text.empty()) return;
    const size_t equals = text.find_first_of("= \t\r\n");
    if (equals == std::string_view::npos || equals == 0 || text[equals] != '=') {
      throw BadCall("\"" + std::string(text.substr(0, std::min<size_t>(equals, 40))) +
                    "\" is not of the form field=value");
    }
    const std::string_view path = text.substr(0, equals);
    const Place place = FindPlace(values.message(), path);
    if (!given.Add(place)) throw BadCall(std::string(path) + " is given twice");
    text.remove_prefix(equals + 1);
    SetPlace(values, place, TakeValue(text, path));
    if (!text.empty() && text.find_first_of(" \t\r\n") != 0)
      throw BadCall(std::string(path) + ": a blank is missing behind the value");
  }
}

bool IsThere(const Condition& condition, const Values& values, const Elements& elements) {
  const Bits* const value = values.Number(condition.on.slot, elements[condition.on.depth]);
  const bool listed = value != nullptr && std::ranges::find(condition.values, *value) != condition.values.end();
  return value != nullptr && listed != condition.is_not;
}

}  // namespace kral::defined
