// Reads hex as people write it, with or without separators and prefixes.
#include "tools/kral/hex_bytes.h"

#include <charconv>
#include <string_view>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr std::string_view kSeparators = " ,:\t";

[[noreturn]] void Refuse(std::string_view group) {
  throw ToolError(ExitCode::kUsage, Format("{} is not hex", group),
                  "give bytes as pairs of hex digits, with or without blanks: 4B 0F 00 00");
}

void AppendGroup(std::string_view group, std::vector<std::uint8_t>& bytes) {
  auto digits = group;
  if (digits.starts_with("0x") || digits.starts_with("0X")) digits.remove_prefix(2);
  if (digits.empty() || (digits.size() > 1 && digits.size() % 2 != 0)) Refuse(group);
  while (!digits.empty()) {
    const auto pair = digits.substr(0, 2);
    std::uint8_t byte = 0;
    const auto [end, error] = std::from_chars(pair.data(), pair.data() + pair.size(), byte, 16);
    if (error != std::errc() || end != pair.data() + pair.size()) Refuse(group);
    bytes.push_back(byte);
    digits.remove_prefix(pair.size());
  }
}

}  // namespace

std::vector<std::uint8_t> ParseHex(const std::vector<std::string>& words) {
  std::vector<std::uint8_t> bytes;
  for (std::string_view rest : words) {
    while (!rest.empty()) {
      const auto end = std::min(rest.find_first_of(kSeparators), rest.size());
      if (end > 0) AppendGroup(rest.substr(0, end), bytes);
      rest.remove_prefix(std::min(end + 1, rest.size()));
    }
  }
  return bytes;
}

}  // namespace kral::tool
