// The one file with the whole formatting library in it; all others see its declarations only and call none of them.
#define FMT_HEADER_ONLY 1
#include <fmt/format.h>

#include "tools/kral/format.h"

namespace kral::tool {

std::string FormatArguments(fmt::string_view format, fmt::format_args arguments) {
  return fmt::vformat(format, arguments);
}

std::string Joined(const std::vector<std::string>& parts, std::string_view separator) {
  std::string text;
  for (std::size_t i = 0; i < parts.size(); ++i) {
    if (i > 0) text += separator;
    text += parts[i];
  }
  return text;
}

std::string Counted(std::uint64_t count, std::string_view thing) {
  return Format("{} {}{}", count, thing, count == 1 ? "" : "s");
}

}  // namespace kral::tool
