// Options and texts of all nv verbs.
#include "tools/kral/nv/nv_options.h"

#include <charconv>

#include "tools/kral/command_line.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {

void AddDefinitionOptions(const Command& verb, NvOptions& options) {
  verb.Add("--defs", options.definitions, "Definition file; may be given several times")
      .OneEach()
      .Settled("definitions");
  AddDictionaryOption(verb, options);
}

void AddDictionaryOption(const Command& verb, NvOptions& options) {
  verb.Add("--types", options.dictionaries, "Data-type dictionary that the definitions use").OneEach().Settled("types");
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
  throw ToolError(ExitCode::kUsage, Format("{} is no range of NV ids", text), "give --items as in 0-9999");
}

}  // namespace kral::tool
