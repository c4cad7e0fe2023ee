// What all nv verbs share: definition files, ranges of ids, and the sentence about a file that cannot be used.
#ifndef KRAL_TOOLS_NV_NV_OPTIONS_H
#define KRAL_TOOLS_NV_NV_OPTIONS_H

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace kral::tool {

class Command;

struct NvOptions {
  std::vector<std::string> definitions;  // files, loaded in this order
  std::vector<std::string> dictionaries;
  std::optional<std::uint16_t> subscription;
};

void AddDefinitionOptions(const Command& verb, NvOptions& options);  // --defs, --types; `options` must outlive the verb
void AddDictionaryOption(const Command& verb, NvOptions& options);   // --types alone

// "7" or "0-9999", first and last; ToolError for anything else.
std::pair<std::uint16_t, std::uint16_t> ParseIdRange(const std::string& text);

}  // namespace kral::tool

#endif
