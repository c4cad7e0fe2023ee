// Reads fields and refuses what contradicts itself; families and commands are definition_xml.cpp's.
#include "commands/defined/field_xml.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <utility>

namespace kral::defined {
namespace {

constexpr size_t kMostFields = size_t{1} << 18;  // of a file
constexpr uint32_t kDeepest = 16;
constexpr uint32_t kMostGroups = 8192;  // in the rest of a message, where nothing else is said: they may hold arrays
constexpr size_t kLongestName = 63;
constexpr size_t kLongestUnit = 15;

struct NumberType {
  std::string_view name;
  Kind kind;
  uint8_t width;
};
constexpr NumberType kNumberTypes[] = {
    {"u8", Kind::kUnsigned, 1},  {"u16", Kind::kUnsigned, 2}, {"u24", Kind::kUnsigned, 3}, {"u32", Kind::kUnsigned, 4},
    {"u40", Kind::kUnsigned, 5}, {"u48", Kind::kUnsigned, 6}, {"u56", Kind::kUnsigned, 7}, {"u64", Kind::kUnsigned, 8},
    {"s8", Kind::kSigned, 1},    {"s16", Kind::kSigned, 2},   {"s24", Kind::kSigned, 3},   {"s32", Kind::kSigned, 4},
    {"s40", Kind::kSigned, 5},   {"s48", Kind::kSigned, 6},   {"s56", Kind::kSigned, 7},   {"s64", Kind::kSigned, 8},
    {"f32", Kind::kReal, 4},     {"f64", Kind::kReal, 8},
};

[[noreturn]] void Reject(const Field& field, const std::string& why) {
  throw BadXml(field.path + ": " + why);
}

std::vector<std::string_view> Split(std::string_view text, char by) {
  std::vector<std::string_view> parts;
  for (;;) {
    const size_t end = std::min(text.find(by), text.size());
    parts.push_back(text.substr(0, end));
    if (end == text.size()) return parts;
    text.remove_prefix(end + 1);
  }
}

std::optional<Bits> NumberOf(const XmlElement& element, const char* attribute, const Field& field) {
  const std::string* const text = element.Attribute(attribute);
  if (text == nullptr) return std::nullopt;
  const auto value = ParseNumber(field, *text);
  if (!value) Reject(field, std::string(attribute) + "=\"" + *text + "\" is no value of " + TypeText(field));
  return value;
}

bool IsOpen(const Field& field) {
  const bool open_size = !field.is_number() && field.kind != Kind::kRecord && field.kind != Kind::kBits &&
                         field.size.rule == Extent::Rule::kToEnd;
  return open_size || field.count.rule == Extent::Rule::kToEnd ||
         (field.kind == Kind::kRecord && std::ranges::any_of(field.members, IsOpen));
}

// Whether two fields may be there at a time. Conditions that look at different fields are trusted to exclude each
// other.
bool MayMeet(const Field& left, const Field& right) {
  if (!left.condition || !right.condition) return true;
  const Condition& one = *left.condition;
  const Condition& other = *right.condition;
  if (one.on.slot != other.on.slot) return false;
  if (one.is_not && other.is_not) return true;
  const auto holds = [&](Bits value) {
    const auto listed = [&](const Condition& condition) {
      return (std::ranges::find(condition.values, value) != condition.values.end()) != condition.is_not;
    };
    return listed(one) && listed(other);
  };
  return std::ranges::any_of(one.is_not ? other.values : one.values, holds);
}

}  // namespace

void RefuseOthers(const XmlElement& element, std::initializer_list<std::string_view> known) {
  for (const auto& attribute : element.attributes) {
    if (std::ranges::find(known, attribute.first) == known.end()) {
      throw BadXml("<" + element.name + "> has no attribute " + attribute.first);
    }
  }
  const size_t text = element.text.find_first_not_of(" \t\r\n");
  if (text != std::string::npos) {
    throw BadXml("<" + element.name + "> has text: \"" + element.text.substr(text, 20) + "\"");
  }
}

void RefuseInside(const XmlElement& element) {
  if (!element.children.empty()) {
    throw BadXml("<" + element.children[0].name + "> is not expected in <" + element.name + ">");
  }
}

bool IsType(std::string_view name) {
  constexpr std::string_view kOthers[] = {"text", "bytes", "record", "zlib"};
  return std::ranges::find(kNumberTypes, name, &NumberType::name) != std::end(kNumberTypes) ||
         std::ranges::find(kOthers, name) != std::end(kOthers);
}

void RequireName(const XmlElement& element, const std::string& name, bool may_begin_with_digit) {
  const auto is_letter = [](char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || c == '_'; };
  const auto is_digit = [](char c) { return c >= '0' && c <= '9'; };
  if (name.empty()) throw BadXml("<" + element.name + "> without name");
  if (name.size() > kLongestName || (!may_begin_with_digit && is_digit(name[0])) ||
      !std::ranges::all_of(name, [&](char c) { return is_letter(c) || is_digit(c); })) {
    throw BadXml("<" + element.name + ">: name=\"" + name.substr(0, kLongestName) +
                 "\" is not made of letters, digits and underscores");
  }
}

size_t ShortestOf(const Field& field) {
  if (field.condition) return 0;
  size_t one = 0;
  switch (field.kind) {
    case Kind::kRecord:
      for (const Field& member : field.members) one += ShortestOf(member);
      break;
    case Kind::kText:
    case Kind::kBytes:
    case Kind::kPacked:
      if (field.size.rule == Extent::Rule::kFixed) one = field.size.most;
      if (field.size.rule == Extent::Rule::kTerminated) one = 1;
      break;
    default:
      one = field.width;
  }
  return field.count.rule == Extent::Rule::kFixed ? one * field.count.most : 0;
}

void FieldReader::Read(const XmlElement& element) {
  if (element.name == "Reply") {
    RefuseOthers(element, {"longer"});
  } else {
    RefuseOthers(element, {});
  }
  message_.is_open = FlagAttribute(element, "longer");
  ReadFields(element.children, {message_.fields, nullptr, 0, 1, ""});
  file_.at = &element;
  Complete(message_.fields);
  for (const Field& field : message_.fields) message_.shortest += ShortestOf(field);
  if (message_.shortest > kLongestMessage) throw BadXml("<" + element.name + "> is longer than 64 KiB");
}

// When all fields are where they stay.
void FieldReader::Complete(std::vector<Field>& fields) {
  for (Field& field : fields) {
    field.counts = field.slot != kNoSlot && std::ranges::find(counters_, field.slot) != counters_.end();
    if (field.slot != kNoSlot) message_.slots.push_back(&field);
    Complete(field.members);
    const bool sized = !field.is_number() && field.size.rule == Extent::Rule::kCounted;
    field.is_counted = sized || field.count.rule == Extent::Rule::kCounted ||
                       std::ranges::any_of(field.members, [](const Field& member) { return member.is_counted; });
  }
}

void FieldReader::ReadFields(const std::vector<XmlElement>& elements, const Scope& scope) {
  if (scope.depth > kDeepest) throw BadXml("groups are nested too deeply");
  scope.fields.reserve(elements.size());
  for (const XmlElement& element : elements) {
    file_.at = &element;
    if (element.name != "Field") throw BadXml("<" + element.name + "> is not expected in the place of a <Field>");
    Field field = ReadField(element, scope);
    scope.fields.push_back(std::move(field));
  }
  CheckEnds(elements, scope.fields);
}

Field FieldReader::ReadField(const XmlElement& element, const Scope& scope) {
  RefuseOthers(element, {"name", "doc", "unit", "type", "order", "count", "max_count", "size", "max_size", "min", "max",
                         "default", "enum", "when", "success"});
  Field field;
  NameField(element, scope, field);
  ReadType(element, field);
  if (const std::string* const when = element.Attribute("when")) field.condition = ReadCondition(*when, scope);
  ReadExtents(element, scope, field);
  if (field.is_group()) {
    ReadMembers(element, scope, field);
  } else {
    if (!element.children.empty()) Reject(field, "fields of type " + TypeText(field) + " have no fields of their own");
    ReadNumber(element, field);
    GiveSlot(field);
  }
  file_.at = &element;
  if (ShortestOf(field) > kLongestMessage || (field.count.rule != Extent::Rule::kToEnd &&
                                              field.count.most * std::max<size_t>(field.width, 1) > kLongestMessage)) {
    Reject(field, "more than 64 KiB");
  }
  return field;
}

void FieldReader::NameField(const XmlElement& element, const Scope& scope, Field& field) {
  if (++file_.fields > kMostFields) throw BadXml("too many fields");
  field.name = TextAttribute(element, "name");
  RequireName(element, field.name, false);
  field.path = scope.prefix + field.name;
  field.depth = scope.depth;
  field.documentation = TextAttribute(element, "doc");
  field.unit = TextAttribute(element, "unit");
  if (field.unit.size() > kLongestUnit) Reject(field, "the unit is longer than 15 bytes");
  if (std::ranges::find(scope.fields, field.name, &Field::name) != scope.fields.end()) {
    Reject(field, "there are two fields of this name");
  }
}

void FieldReader::ReadType(const XmlElement& element, Field& field) {
  const std::string type = TextAttribute(element, "type");
  field.big_endian = file_.big_endian;
  if (const std::string* const order = element.Attribute("order")) {
    if (*order != "big" && *order != "little") Reject(field, "order=\"" + *order + "\" is neither big nor little");
    field.big_endian = *order == "big";
  }
  const auto* const number = std::ranges::find(kNumberTypes, type, &NumberType::name);
  if (number != std::end(kNumberTypes)) {
    field.kind = number->kind;
    field.width = number->width;
    if (!element.children.empty()) {
      if (field.kind != Kind::kUnsigned) Reject(field, "only unsigned words have bits");
      field.kind = Kind::kBits;
    }
    return;
  }
  field.width = 0;
  if (type == "text") {
    field.kind = Kind::kText;
  } else if (type == "bytes") {
    field.kind = Kind::kBytes;
  } else if (type == "zlib") {
    field.kind = Kind::kPacked;
  } else if (type == "record" || file_.records.contains(type)) {
    field.kind = Kind::kRecord;
  } else {
    Reject(field, type.empty() ? "there is no type" : "there is no type or record " + type);
  }
}

void FieldReader::ReadNumber(const XmlElement& element, Field& field) {
  const std::string* const preset = element.Attribute("default");
  if (!field.is_number()) {
    for (const char* const attribute : {"min", "max", "enum", "success", "order"}) {
      if (element.Attribute(attribute) != nullptr) Reject(field, std::string(attribute) + " is for numbers");
    }
    if (preset != nullptr) field.preset_bytes = *preset;
    if (preset != nullptr && field.kind == Kind::kBytes && !preset->empty())
      Reject(field, "blocks have no default but an empty one");
    if (preset != nullptr && preset->size() > field.size.most) Reject(field, "the default does not fit");
    return;
  }
  if (const std::string* const name = element.Attribute("enum")) {
    const auto found = file_.enumerations.find(*name);
    if (found == file_.enumerations.end()) Reject(field, "there is no enumeration " + *name);
    field.enumeration = found->second;
    for (const auto& [word, value] : field.enumeration->values) {
      if (field.kind == Kind::kReal || !FitsType(field, value)) {
        Reject(field, word + " of enumeration " + *name + " is no value of " + TypeText(field));
      }
    }
  }
  field.least = NumberOf(element, "min", field);
  field.most = NumberOf(element, "max", field);
  if (field.least && !IsInRange(field, *field.least)) Reject(field, "min is greater than max");
  field.preset = NumberOf(element, "default", field);
  if (field.preset && !IsInRange(field, *field.preset))
    Reject(field, "the default is out of range: " + RangeText(field));
  if (const std::string* const success = element.Attribute("success")) {
    if (field.kind == Kind::kReal || field.is_array) Reject(field, "a status is one whole number");
    for (const std::string_view word : Split(*success, ',')) {
      const auto value = ParseNumber(field, word);
      if (!value) Reject(field, "success=\"" + *success + "\" is no value of " + TypeText(field));
      if (!IsInRange(field, *value)) Reject(field, "success=\"" + *success + "\" is out of range: " + RangeText(field));
      field.success.push_back(*value);
    }
  }
}

void FieldReader::ReadExtents(const XmlElement& element, const Scope& scope, Field& field) {
  field.is_array = element.Attribute("count") != nullptr;
  if (field.is_array) {
    field.count = ReadExtent(element, "count", "max_count", kMostElements, scope);
  } else if (element.Attribute("max_count") != nullptr) {
    Reject(field, "max_count without count");
  }
  if (field.count.rule == Extent::Rule::kToEnd && element.Attribute("max_count") == nullptr) {
    field.count.most = std::min(field.is_group() ? kMostGroups : kMostElements, kMostElements / scope.capacity);
  }
  if (field.count.most > kMostElements / scope.capacity) Reject(field, "more than 65,536 elements in all");
  field.capacity = scope.capacity * field.count.most;
  const bool has_size = field.kind == Kind::kText || field.kind == Kind::kBytes || field.kind == Kind::kPacked;
  if (!has_size) {
    if (element.Attribute("size") != nullptr) Reject(field, "a size is for texts, bytes and zlib");
    return;
  }
  if (element.Attribute("size") == nullptr) Reject(field, "there is no size");
  field.size = ReadExtent(element, "size", "max_size", kLongestMessage, scope);
  if (field.size.rule == Extent::Rule::kTerminated && field.kind != Kind::kText)
    Reject(field, "only texts are terminated");
  if (field.size.rule == Extent::Rule::kFixed && field.kind == Kind::kPacked) {
    Reject(field, "a zlib stream has no fixed size: name the field that holds it, or *");
  }
}

Extent FieldReader::ReadExtent(const XmlElement& element, const char* name, const char* most_name, uint64_t limit,
                               const Scope& scope) {
  const std::string& text = *element.Attribute(name);
  const std::string where = TextAttribute(element, "name") + ": " + name + "=\"" + text + "\"";
  const auto most = NumberAttribute(element, most_name, limit);
  Extent extent;
  if (!text.empty() && text[0] >= '0' && text[0] <= '9') {
    const auto number = ParseDecimal(text, limit);
    if (!number || *number == 0) throw BadXml(where + " is out of range: 1 to " + std::to_string(limit));
    if (most) throw BadXml(where + " is fixed, and " + most_name + " is not expected");
    extent.most = static_cast<uint32_t>(*number);
    return extent;
  }
  if (text == "*" || text == "terminated") {
    extent.rule = text == "*" ? Extent::Rule::kToEnd : Extent::Rule::kTerminated;
    extent.most = static_cast<uint32_t>(most.value_or(limit));
    return extent;
  }
  extent.rule = Extent::Rule::kCounted;
  const Field& counter = Resolve(text, scope, extent.counted_by);
  counters_.push_back(counter.slot);
  if (counter.kind == Kind::kSigned && (!counter.least || static_cast<int64_t>(*counter.least) < 0)) {
    throw BadXml(where + " may be negative");
  }
  const unsigned bits = BitCount(counter) - (counter.kind == Kind::kSigned ? 1 : 0);
  const Bits type_most = bits >= 64 ? UINT64_MAX : (Bits{1} << bits) - 1;
  const Bits counted = std::min(type_most, most.value_or(counter.most.value_or(std::min<Bits>(type_most, 0xFFFF))));
  if (!most && !counter.most && type_most > 0xFFFF)
    throw BadXml(where + " may be more than 64 KiB: there is no " + most_name);
  if (counted > limit || counted == 0) throw BadXml(where + " is out of range: 1 to " + std::to_string(limit));
  extent.most = static_cast<uint32_t>(counted);
  for (const auto& [number, when] : {std::pair(counter.least, "at least"), std::pair(counter.preset, "by default")}) {
    if (number && *number > counted) {
      throw BadXml(where + ": " + counter.name + " is " + when + " " + std::to_string(*number) +
                   ", and it takes at most " + std::to_string(counted));
    }
  }
  return extent;
}

void FieldReader::ReadMembers(const XmlElement& element, const Scope& scope, Field& field) {
  for (const char* const attribute : {"min", "max", "enum", "success", "default"}) {
    if (element.Attribute(attribute) != nullptr) Reject(field, std::string(attribute) + " is for numbers");
  }
  if (field.kind == Kind::kBits) return ReadBits(element, scope, field);
  const std::string type = TextAttribute(element, "type");
  if (file_.records.contains(type)) {
    if (!element.children.empty()) Reject(field, "the fields of " + type + " stand in the record");
    ReadRecord(type, scope, field);
  } else {
    ReadFields(element.children, {field.members, &scope, scope.depth + 1, field.capacity, field.path + "."});
  }
  file_.at = &element;
  if (field.members.empty()) Reject(field, "a group without fields");
  if (field.is_array && field.kind == Kind::kRecord && std::ranges::any_of(field.members, IsOpen)) {
    Reject(field, "its last field takes all the rest, and there is more than one");
  }
}

void FieldReader::ReadRecord(const std::string& name, const Scope& scope, Field& field) {
  if (std::ranges::find(expanding_, name) != expanding_.end()) Reject(field, "the record " + name + " contains itself");
  expanding_.push_back(name);
  ReadFields(file_.records.find(name)->second->children,
             {field.members, nullptr, scope.depth + 1, field.capacity, field.path + "."});
  expanding_.pop_back();
}

void FieldReader::ReadBits(const XmlElement& element, const Scope& scope, Field& word) {
  Bits taken = 0;
  const Scope inner{word.members, &scope, scope.depth + 1, word.capacity, word.path + "."};
  for (const XmlElement& child : element.children) {
    file_.at = &child;
    if (child.name != "Bit") throw BadXml("<" + child.name + "> is not expected in the place of a <Bit>");
    RefuseOthers(child, {"name", "doc", "unit", "bits", "signed", "min", "max", "default", "enum", "success"});
    RefuseInside(child);
    Field field;
    NameField(child, inner, field);
    field.kind = FlagAttribute(child, "signed") ? Kind::kSigned : Kind::kUnsigned;
    field.width = word.width;
    field.capacity = word.capacity;
    const std::string bits = TextAttribute(child, "bits");
    const size_t dash = std::min(bits.find('-'), bits.size());
    const uint64_t highest = 8U * word.width - 1;
    const auto first = ParseDecimal(std::string_view(bits).substr(0, dash), highest);
    const auto last = dash == bits.size() ? first : ParseDecimal(std::string_view(bits).substr(dash + 1), highest);
    if (!first || !last || *last < *first) {
      Reject(field, "bits=\"" + bits + "\" are not some of 0 to " + std::to_string(highest));
    }
    field.first_bit = static_cast<uint8_t>(*first);
    field.bit_count = static_cast<uint8_t>(*last - *first + 1);
    const Bits mask = (field.bit_count == 64 ? UINT64_MAX : (Bits{1} << field.bit_count) - 1) << field.first_bit;
    if ((taken & mask) != 0) Reject(field, "bits=\"" + bits + "\" overlap with those of another field");
    taken |= mask;
    ReadNumber(child, field);
    GiveSlot(field);
    word.members.push_back(std::move(field));
  }
}

Condition FieldReader::ReadCondition(const std::string& text, const Scope& scope) const {
  const size_t equals = text.find('=');
  if (equals == std::string::npos || equals == 0) throw BadXml("when=\"" + text + "\" is not of the form field=value");
  Condition condition;
  condition.is_not = text[equals - 1] == '!';
  const Field& field = Resolve(text.substr(0, equals - (condition.is_not ? 1 : 0)), scope, condition.on);
  for (const std::string_view word : Split(std::string_view(text).substr(equals + 1), ',')) {
    const auto value = ParseNumber(field, word);
    if (!value || !IsInRange(field, *value))
      throw BadXml("when=\"" + text + "\": " + field.name + " never is " + std::string(word));
    condition.values.push_back(*value);
  }
  return condition;
}

const Field& FieldReader::Resolve(const std::string& name, const Scope& scope, Reference& reference) const {
  const auto parts = Split(name, '.');
  for (const Scope* at = &scope; at != nullptr; at = at->outer) {
    const std::vector<Field>* fields = &at->fields;
    const Field* found = nullptr;
    for (size_t i = 0; i < parts.size(); ++i) {
      const auto field = std::ranges::find(*fields, parts[i], [](const Field& f) { return std::string_view(f.name); });
      if (field == fields->end()) break;
      if (field->is_array || field->condition) throw BadXml(name + " is an array, or not always there");
      if (i + 1 == parts.size()) found = &*field;
      fields = &field->members;
    }
    if (found == nullptr) continue;
    if (found->kind != Kind::kUnsigned && found->kind != Kind::kSigned) throw BadXml(name + " is no whole number");
    reference = {found->slot, at->depth, found->name};
    return *found;
  }
  throw BadXml("there is no earlier field " + name);
}

void FieldReader::GiveSlot(Field& field) {
  if (next_slot_ >= kMostSlots) throw BadXml("more than 4,096 fields in one message");
  field.slot = next_slot_++;
}

// Fields that take all the rest may follow each other where only one of them is there at a time.
void FieldReader::CheckEnds(const std::vector<XmlElement>& elements, const std::vector<Field>& fields) {
  for (size_t i = 0; i + 1 < fields.size(); ++i) {
    if (!IsOpen(fields[i])) continue;
    file_.at = &elements[i];
    const auto meets = [&](const Field& later) { return MayMeet(fields[i], later); };
    if (std::ranges::any_of(std::span(fields).subspan(i + 1), meets))
      Reject(fields[i], "it takes all the rest, and is not the last");
  }
}

}  // namespace kral::defined
