// One verb on several handsets at once: a verb does not know of it. Each handset has the command line for itself, with
// a context of its own, on one of the threads here.
#ifndef KRAL_TOOLS_MANY_HANDSETS_H
#define KRAL_TOOLS_MANY_HANDSETS_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/command_line.h"
#include "tools/kral/verbs.h"

namespace kral::tool {

inline constexpr std::uint16_t kLastPort = 255;

// A command line, parsed. `act` is empty when help was asked for.
struct ParsedCommand {
  Context context;
  std::unique_ptr<CommandLine> line;
  std::function<void()> act;
};
// The same command line again, for the handset on that port.
using ParseFor = std::function<std::unique_ptr<ParsedCommand>(std::uint16_t port, const Names& names)>;

// "7", "COM7", "7,8,20-27": in this order. ToolError kUsage for what is no list of ports, and for a port named twice.
std::vector<std::uint16_t> ParsePorts(std::string_view text);

// Without those that lead to the same device as one in front of them: a link of a port folder has a number beside that
// of its target. ToolError for such as were named.
std::vector<std::uint16_t> WithoutTwins(const std::vector<std::uint16_t>& ports, bool are_named);

// {port} and {slot} of a name put in, for handsets that are not asked who they are. `place` in the list, from 1.
std::string FileOfPort(std::string name, const SessionOptions& session, std::uint16_t port, std::size_t place);

// Of --all where boot loaders may be.
ToolError MustNameBootLoaders();

// What the names in its files stand for. Asks the handset only for what was asked for.
Names NamesOf(const CommandLine& line, const SessionOptions& session);

// Whether the command line is for several handsets; ToolError where its verb is not.
bool IsForMany(const ParsedCommand& command);
// Runs it on all of them and prints what became of each. ToolError, with what was found in the context, unless all of
// them passed.
void RunOnMany(ParsedCommand& command, const ParseFor& parse);

}  // namespace kral::tool

#endif
