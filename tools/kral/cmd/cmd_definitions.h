// Definition files of commands, as the cmd verbs are given them, and what the library tells of their commands.
#ifndef KRAL_TOOLS_CMD_CMD_DEFINITIONS_H
#define KRAL_TOOLS_CMD_CMD_DEFINITIONS_H

#include <string>
#include <vector>

#include "tools/kral/session.h"

namespace kral::tool {

// Definitions need no handset: the null port answers for one.
SessionOptions WithoutHandset(const SessionOptions& options);

// Into the connection, in their order; ToolError where there are none.
void LoadCommands(Session& session, const std::vector<std::string>& files);

struct DefinedCommand {
  std::string name;
  KRAL_CMD_COMMAND record;
};

std::vector<DefinedCommand> ListCommands(const Session& session);
// ToolError, with the nearest name, for one that is not defined.
DefinedCommand FindCommand(const Session& session, const std::string& name);
std::vector<KRAL_CMD_FIELD> FieldsOf(const Session& session, const DefinedCommand& command, bool of_reply);

}  // namespace kral::tool

#endif
