// Takes texts apart, character by character.
#include "tools/kral/safe_text.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>

#include "tools/kral/format.h"

namespace kral::tool {
namespace {

struct Character {
  std::size_t length = 0;  // in bytes; 0: no UTF-8
  bool is_control = false;
};

Character FirstOf(std::string_view text) {
  const auto at = [&text](std::size_t i) -> std::uint32_t {
    return i < text.size() ? static_cast<unsigned char>(text[i]) : 0;
  };
  const auto first = at(0);
  if (first < 0x80) return {1, first < ' ' || first == 0x7F};
  if (first < 0xC2 || first > 0xF4) return {};
  const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  std::uint32_t code = first & (0x7FU >> length);
  for (std::size_t i = 1; i < length; ++i) {
    if ((at(i) & 0xC0U) != 0x80) return {};
    code = code << 6 | (at(i) & 0x3FU);
  }
  constexpr std::array<std::uint32_t, 5> kLeast{0, 0, 0x80, 0x800, 0x10000};
  const bool is_surrogate = code >= 0xD800 && code < 0xE000;
  if (code < kLeast[length] || code > 0x10FFFF || is_surrogate) return {};
  return {length, code < 0xA0};
}

std::string Escaped(std::string_view text, std::string_view kept) {
  std::string safe;
  while (!text.empty()) {
    const auto [length, is_control] = FirstOf(text);
    const auto piece = text.substr(0, std::max<std::size_t>(length, 1));
    text.remove_prefix(piece.size());
    if (length != 0 && (!is_control || kept.find(piece) != std::string_view::npos)) {
      safe += piece;
    } else {
      for (const char byte : piece) safe += Format("\\x{:02X}", static_cast<unsigned char>(byte));
    }
  }
  return safe;
}

}  // namespace

std::string NameText(std::string_view name) {
  return Escaped(name, "");
}

std::string SafeText(std::string_view text) {
  return Escaped(text, "\n\t");
}

std::string FirstCharacters(std::string_view text, std::size_t count) {
  std::size_t end = 0;
  for (; count > 0 && end < text.size(); --count) end += std::max<std::size_t>(FirstOf(text.substr(end)).length, 1);
  return std::string(text.substr(0, end));
}

bool IsUtf8(std::string_view text) {
  while (!text.empty()) {
    const auto length = FirstOf(text).length;
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

}  // namespace kral::tool
