// Writes JSON; what it says is left to others.
#include "commands/defined/json_text.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>

namespace kral::defined {
namespace {

// Bytes of the UTF-8 character at the beginning; 0 for none.
size_t CharacterSize(std::string_view text) {
  const auto at = [&](size_t i) { return i < text.size() ? static_cast<uint8_t>(text[i]) : uint8_t{0}; };
  const auto follows = [&](size_t i) { return (at(i) & 0xC0) == 0x80; };
  const uint8_t first = at(0);
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first <= 0xDF) return follows(1) ? 2 : 0;
  if (first >= 0xE0 && first <= 0xEF) {
    const bool shortest = first != 0xE0 || at(1) >= 0xA0;
    const bool surrogate = first == 0xED && at(1) >= 0xA0;
    return follows(1) && follows(2) && shortest && !surrogate ? 3 : 0;
  }
  if (first >= 0xF0 && first <= 0xF4) {
    const bool in_range = (first != 0xF0 || at(1) >= 0x90) && (first != 0xF4 || at(1) < 0x90);
    return follows(1) && follows(2) && follows(3) && in_range ? 4 : 0;
  }
  return 0;
}

}  // namespace

JsonText& JsonText::Begin(char bracket) {
  Comma();
  text_ += bracket;
  is_first_ = true;
  return *this;
}

JsonText& JsonText::End(char bracket) {
  text_ += bracket;
  is_first_ = false;
  return *this;
}

JsonText& JsonText::Name(std::string_view name) {
  Comma();
  Quote(name);
  text_ += ':';
  is_first_ = true;
  return *this;
}

JsonText& JsonText::Raw(std::string_view text) {
  Comma();
  text_ += text;
  return *this;
}

JsonText& JsonText::Text(std::string_view text) {
  Comma();
  Quote(text);
  return *this;
}

JsonText& JsonText::Member(std::string_view name, std::string_view text) {
  return text.empty() ? *this : Name(name).Text(text);
}

void JsonText::Comma() {
  if (!is_first_) text_ += ',';
  is_first_ = false;
}

void JsonText::Quote(std::string_view text) {
  text_ += '"';
  while (!text.empty()) {
    const size_t size = CharacterSize(text);
    const char c = text[0];
    if (size == 0) {
      text_ += "\\ufffd";
    } else if (c == '"' || c == '\\') {
      text_ += {'\\', c};
    } else if (size == 1 && (c < ' ' || c == 0x7F)) {
      std::array<char, 8> escaped;
      std::snprintf(escaped.data(), escaped.size(), "\\u%04x", static_cast<unsigned>(static_cast<uint8_t>(c)));
      text_ += escaped.data();
    } else {
      text_ += text.substr(0, size);
    }
    text.remove_prefix(std::max<size_t>(size, 1));
  }
  text_ += '"';
}

}  // namespace kral::defined
