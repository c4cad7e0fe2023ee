// Text from a format string, checked while compiling: std::format's place until the compilers have it. The work is done
// in format.cpp, so that including this costs little.
#ifndef KRAL_TOOLS_FORMAT_H
#define KRAL_TOOLS_FORMAT_H

#include <fmt/core.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace kral::tool {

std::string FormatArguments(fmt::string_view format, fmt::format_args arguments);

template <class... Arguments>
std::string Format(fmt::format_string<Arguments...> format, Arguments&&... arguments) {
  return FormatArguments(format, fmt::make_format_args(arguments...));
}

// "a, b, c"
std::string Joined(const std::vector<std::string>& parts, std::string_view separator);

// "1 image", "2 images"
std::string Counted(std::uint64_t count, std::string_view thing);

}  // namespace kral::tool

#endif
