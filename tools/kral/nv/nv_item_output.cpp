// Gives the numbers of a value the names of the members that they belong to.
#include "tools/kral/nv/nv_item_output.h"

#include <algorithm>
#include <charconv>
#include <set>

#include "tools/kral/format.h"

namespace kral::tool {
namespace {

// The words of the library have up to 64 bits, more than a double holds exactly: they stay whole numbers.
Json JsonNumber(const std::string& text) {
  if (text.starts_with('-')) {
    std::int64_t value = 0;
    std::from_chars(text.data(), text.data() + text.size(), value);
    return value;
  }
  std::uint64_t value = 0;
  std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

// The number as the unsigned word of this type: of a signed word8, -1 is 255.
std::uint64_t WordOf(const std::string& number, const std::string& type) {
  std::uint64_t word = 0;
  std::int64_t negative = 0;
  const char* const end = number.data() + number.size();
  if (number.starts_with('-')) {
    std::from_chars(number.data(), end, negative);
    word = static_cast<std::uint64_t>(negative);
  } else {
    std::from_chars(number.data(), end, word);
  }
  for (const unsigned bits : {8u, 16u, 32u}) {
    if (type.ends_with(Format("word{}", bits))) return word & ((std::uint64_t{1} << bits) - 1);
  }
  return word;
}

const NvForm* FormOf(const NvItem& item, const std::vector<std::string>& numbers) {
  const NvForm* other = nullptr;
  for (const NvForm& form : item.forms) {
    if (form.selector.empty()) {
      other = &form;
    } else if (!numbers.empty() && !form.members.empty() &&
               std::to_string(WordOf(numbers[0], form.members[0].type)) == form.selector) {
      return &form;
    }
  }
  return other;
}

struct NamedNumbers {
  std::string name;
  bool is_list;
  std::vector<std::string> numbers;
};

std::vector<NamedNumbers> Named(const NvItem& item, const std::vector<std::string>& numbers) {
  std::vector<NamedNumbers> named;
  const NvForm* const form = FormOf(item, numbers);
  if (form == nullptr) return named;
  std::size_t next = 0;
  for (const NvMember& member : form->members) {
    const std::size_t count = std::min(member.count, numbers.size() - next);
    const auto first = numbers.begin() + static_cast<std::ptrdiff_t>(next);
    named.push_back({member.name, member.count > 1, {first, first + static_cast<std::ptrdiff_t>(count)}});
    next += count;
  }
  return named;
}

Json JsonNumbers(const std::vector<std::string>& numbers) {
  Json list = Json::array();
  for (const std::string& number : numbers) list.push_back(JsonNumber(number));
  return list;
}

// An object of the members; a list of them where names are missing or stand for several.
Json JsonMembers(const std::vector<NamedNumbers>& members) {
  std::set<std::string> names{""};
  const bool told_apart =
      std::ranges::all_of(members, [&](const NamedNumbers& member) { return names.insert(member.name).second; });
  Json json = told_apart ? Json::object() : Json::array();
  for (const NamedNumbers& member : members) {
    Json list = JsonNumbers(member.numbers);
    Json value = member.is_list || list.empty() ? list : list[0];
    if (told_apart) {
      json[member.name] = std::move(value);
    } else {
      json.push_back(std::move(value));
    }
  }
  return json;
}

std::string FormText(const NvForm& form) {
  std::string text;
  for (const NvMember& member : form.members) {
    text += Format("{}{}: {}", text.empty() ? "" : ", ", member.name, member.type);
    if (member.count > 1) text += Format("[{}]", member.count);
  }
  return text;
}

Json FormJson(const NvForm& form) {
  Json members = Json::array();
  for (const NvMember& member : form.members) {
    members.push_back({{"name", member.name}, {"type", member.type}, {"count", member.count}});
  }
  Json json{{"members", members}};
  if (!form.selector.empty()) json["variant"] = form.selector;
  return json;
}

bool IsOfBytes(const NvItem& item) {
  return !item.defined && item.path.empty();
}

}  // namespace

Json TitleJson(const NvItem& item) {
  Json json = Json::object();
  if (item.id) json["id"] = *item.id;
  if (!item.path.empty()) json["path"] = Printable(item.path);
  if (!item.name.empty()) json["name"] = item.name;
  return json;
}

Json ValueJson(const NvItem& item, const NvReading& reading) {
  Json json = TitleJson(item);
  if (IsOfBytes(item)) {
    json["bytes"] = HexText(reading.bytes);
    return json;
  }
  Json elements = Json::array();
  for (const auto& [index, numbers] : reading.elements) {
    Json value = item.defined ? JsonMembers(Named(item, numbers)) : JsonNumbers(numbers);
    elements.push_back(Json{{"index", index}, {"value", std::move(value)}});
  }
  if (item.max_index > 0) {
    json["elements"] = elements;
  } else {
    json["value"] = elements.empty() ? Json() : elements[0]["value"];
  }
  return json;
}

std::string ValueText(const NvItem& item, const NvReading& reading) {
  std::string text = item.Title() + "\n";
  if (IsOfBytes(item)) return text + HexDump(reading.bytes);
  for (const auto& [index, numbers] : reading.elements) {
    const std::string element = item.max_index > 0 ? Format("[{}] ", index) : "";
    if (!item.defined) text += Format("  {}{}\n", element, Joined(numbers, ","));
    for (const auto& member : Named(item, numbers)) {
      text += Format("  {}{:<24} {}\n", element, member.name, Joined(member.numbers, " "));
    }
  }
  return text;
}

std::string DefinitionText(const NvItem& item) {
  std::string text = item.Title() + (item.max_index > 0 ? Format(" [0-{}]", item.max_index) : "") + "\n";
  for (const NvForm& form : item.forms) {
    text += Format("  {}{}\n", form.selector.empty() ? "" : form.selector + " -> ", FormText(form));
  }
  return text;
}

Json DefinitionJson(const NvItem& item) {
  Json json = TitleJson(item);
  json["name"] = item.name;
  if (item.max_index > 0) json["max_index"] = item.max_index;
  json["forms"] = Json::array();
  for (const NvForm& form : item.forms) json["forms"].push_back(FormJson(form));
  return json;
}

}  // namespace kral::tool
