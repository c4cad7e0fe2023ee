// Definition files of commands: docs/commands.md tells of their elements, share/kral/commands has the schema.
#ifndef KRAL_COMMANDS_DEFINED_DEFINITION_XML_H
#define KRAL_COMMANDS_DEFINED_DEFINITION_XML_H

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "commands/defined/definition.h"

namespace kral::defined {

// What is wrong with a file, and on which line; 0 where it is none's.
struct Problem {
  std::string text;
  uint32_t line = 0;
};

// False, with the problem told, for a file that cannot be used, beside the known definitions.
bool ReadDefinitions(std::span<const uint8_t> document, const Definitions& known, std::vector<CommandPtr>& commands,
                     Problem& problem);

}  // namespace kral::defined

#endif
