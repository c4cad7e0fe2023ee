// Options and texts of all nv verbs.
#include "tools/kral/nv/nv_options.h"

#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <charconv>

#include "tools/kral/exit_codes.h"

namespace kral::tool {

void AddDefinitionOptions(CLI::App& verb, NvOptions& options) {
  verb.add_option("--defs", options.definitions, "Definition file; may be given several times")
      ->allow_extra_args(false);
  AddDictionaryOption(verb, options);
}

void AddDictionaryOption(CLI::App& verb, NvOptions& options) {
  verb.add_option("--types", options.dictionaries, "Data-type dictionary that the definitions use")
      ->allow_extra_args(false);
}

std::pair<std::uint16_t, std::uint16_t> ParseIdRange(const std::string& text) {
  std::uint16_t first = 0;
  std::uint16_t last = 0;
  const char* const end = text.data() + text.size();
  auto parsed = std::from_chars(text.data(), end, first);
  last = first;
  if (parsed.ec == std::errc() && parsed.ptr != end && *parsed.ptr == '-') {
    parsed = std::from_chars(parsed.ptr + 1, end, last);
  }
  if (parsed.ec == std::errc() && parsed.ptr == end && first <= last) return {first, last};
  throw ToolError(ExitCode::kUsage, fmt::format("{} is no range of NV ids", text), "give --items as in 0-9999");
}

}  // namespace kral::tool
