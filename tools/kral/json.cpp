// Keeps values as a tree, and has the JSON library write it: no other file includes that.
#include "tools/kral/json.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <utility>

#include "tools/kral/output.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {

struct Json::Entry {
  std::string name;
  Json value;
};

Json::Json() = default;
Json::Json(const Json& other) = default;
Json::Json(Json&& other) noexcept = default;
Json& Json::operator=(const Json& other) = default;
Json& Json::operator=(Json&& other) noexcept = default;
Json::~Json() = default;

Json::Json(bool value) : kind_(Kind::kBool), bool_(value) {}

Json::Json(long long value) : kind_(Kind::kSigned), signed_(value) {}

Json::Json(unsigned long long value) : kind_(Kind::kUnsigned), unsigned_(value) {}

Json::Json(double value) : kind_(Kind::kDouble), double_(value) {}

Json::Json(std::string_view text) : kind_(Kind::kText), text_(text) {}

Json::Json(const std::vector<std::uint16_t>& numbers) : kind_(Kind::kArray) {
  for (const unsigned number : numbers) push_back(number);
}

Json::Json(std::initializer_list<Member> members) : kind_(Kind::kObject) {
  for (const auto& [name, value] : members) entries_.push_back({std::string(name), value});
}

Json Json::array() {
  Json json;
  json.kind_ = Kind::kArray;
  return json;
}

Json Json::object() {
  Json json;
  json.kind_ = Kind::kObject;
  return json;
}

std::size_t Json::size() const {
  return entries_.size();
}

void Json::push_back(Json element) {
  entries_.push_back({{}, std::move(element)});
}

Json& Json::back() {
  return entries_.back().value;
}

Json& Json::operator[](std::size_t index) {
  return entries_[index].value;
}

Json& Json::operator[](std::string_view name) {
  kind_ = Kind::kObject;
  const auto found = std::ranges::find_if(entries_, [name](const Entry& entry) { return entry.name == name; });
  if (found != entries_.end()) return found->value;
  entries_.push_back({std::string(name), {}});
  return entries_.back().value;
}

void Json::update(const Json& object) {
  for (const auto& [name, value] : object.entries_) (*this)[name] = value;
}

struct Json::Writer {
  static Json Value(const nlohmann::ordered_json& tree) {
    if (tree.is_object()) {
      Json object = Json::object();
      for (const auto& [name, value] : tree.items()) object[name] = Value(value);
      return object;
    }
    if (tree.is_array()) {
      Json array = Json::array();
      for (const auto& value : tree) array.push_back(Value(value));
      return array;
    }
    if (tree.is_string()) return Json(tree.get<std::string>());
    if (tree.is_boolean()) return Json(tree.get<bool>());
    if (tree.is_number_unsigned()) return Json(static_cast<unsigned long long>(tree.get<std::uint64_t>()));
    if (tree.is_number_integer()) return Json(static_cast<long long>(tree.get<std::int64_t>()));
    return tree.is_number() ? Json(tree.get<double>()) : Json();
  }

  static nlohmann::ordered_json Tree(const Json& json) {
    switch (json.kind_) {
      case Kind::kNull:
        break;
      case Kind::kBool:
        return json.bool_;
      case Kind::kSigned:
        return json.signed_;
      case Kind::kUnsigned:
        return json.unsigned_;
      case Kind::kDouble:
        return json.double_;
      case Kind::kText:
        return IsUtf8(json.text_) ? json.text_ : NameText(json.text_);
      case Kind::kArray: {
        auto array = nlohmann::ordered_json::array();
        for (const auto& entry : json.entries_) array.push_back(Tree(entry.value));
        return array;
      }
      case Kind::kObject: {
        auto object = nlohmann::ordered_json::object();
        for (const auto& [name, value] : json.entries_) {
          object[name] = Tree(value);
          // A name that is no text, to be given back.
          if (value.kind_ == Kind::kText && !IsUtf8(value.text_))
            object[name + "_bytes"] =
                HexText({reinterpret_cast<const std::uint8_t*>(value.text_.data()), value.text_.size()});
        }
        return object;
      }
    }
    return nullptr;
  }
};

Json Json::parsed(std::string_view text) {
  return Writer::Value(nlohmann::ordered_json::parse(text));
}

std::string Json::dump() const {
  return Writer::Tree(*this).dump();
}

}  // namespace kral::tool
