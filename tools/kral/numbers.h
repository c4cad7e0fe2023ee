// Numbers as they are typed.
#ifndef KRAL_TOOLS_NUMBERS_H
#define KRAL_TOOLS_NUMBERS_H

#include <charconv>
#include <optional>
#include <string_view>
#include <system_error>
#include <type_traits>

namespace kral::tool {

// Decimal, or, of whole numbers, hexadecimal with 0x in front; nothing for what is no number or does not fit.
template <class Number>
std::optional<Number> ParseNumber(std::string_view text) {
  const char* const end = text.data() + text.size();
  Number value{};
  std::from_chars_result parsed{};
  if constexpr (std::is_floating_point_v<Number>) {
    parsed = std::from_chars(text.data(), end, value);
  } else {
    const bool hex = text.starts_with("0x") || text.starts_with("0X");
    parsed = std::from_chars(text.data() + (hex ? 2 : 0), end, value, hex ? 16 : 10);
  }
  if (parsed.ec != std::errc() || parsed.ptr != end) return std::nullopt;
  return value;
}

}  // namespace kral::tool

#endif
