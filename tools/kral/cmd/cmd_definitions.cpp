// Loads definitions and asks for them.
#include "tools/kral/cmd/cmd_definitions.h"

#include <array>

#include "tools/kral/format.h"
#include "tools/kral/nearest_word.h"

namespace kral::tool {

SessionOptions WithoutHandset(const SessionOptions& options) {
  SessionOptions without = options;
  without.port = std::to_string(KRAL_PORT_NULL);
  return without;
}

void LoadCommands(Session& session, const std::vector<std::string>& files) {
  if (files.empty()) {
    throw ToolError(ExitCode::kUsage, "no commands are defined",
                    "name a definition file with --defs, in the environment variable KRAL_COMMANDS, or in the "
                    "settings: kral config");
  }
  for (const auto& file : files) {
    session.Run(Format("loading {}", file),
                [&] { return KRAL_CMD_LoadDefinitions(session.handle(), file.c_str(), nullptr); });
  }
}

std::vector<DefinedCommand> ListCommands(const Session& session) {
  std::vector<DefinedCommand> commands;
  std::uint32_t count = 0;
  KRAL_CMD_GetCount(session.handle(), &count);
  std::array<char, 160> name{};
  for (std::uint32_t i = 0; i < count; ++i) {
    DefinedCommand command{};
    command.record.size = sizeof command.record;
    if (KRAL_CMD_GetName(session.handle(), i, name.data(), name.size()) == 0) continue;
    command.name = name.data();
    if (KRAL_CMD_GetCommand(session.handle(), name.data(), &command.record) != 0) commands.push_back(command);
  }
  return commands;
}

DefinedCommand FindCommand(const Session& session, const std::string& name) {
  DefinedCommand command{name, {}};
  command.record.size = sizeof command.record;
  if (KRAL_CMD_GetCommand(session.handle(), name.c_str(), &command.record) != 0) return command;
  std::vector<std::string> names;
  for (auto& known : ListCommands(session)) names.push_back(std::move(known.name));
  const auto near = NearestWord(name, names);
  throw ToolError(ExitCode::kUsage, Format("there is no command {}", name),
                  near ? Format("did you mean {}?", *near) : "kral cmd list shows those that are defined");
}

std::vector<KRAL_CMD_FIELD> FieldsOf(const Session& session, const DefinedCommand& command, bool of_reply) {
  std::vector<KRAL_CMD_FIELD> fields;
  const std::uint32_t count = of_reply ? command.record.reply_fields : command.record.request_fields;
  for (std::uint32_t i = 0; i < count; ++i) {
    KRAL_CMD_FIELD field{};
    field.size = sizeof field;
    const std::uint8_t which = of_reply ? 1 : 0;
    if (KRAL_CMD_GetField(session.handle(), command.name.c_str(), which, i, &field) != 0) fields.push_back(field);
  }
  return fields;
}

}  // namespace kral::tool
