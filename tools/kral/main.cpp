// The command line: common options, the choice of a verb, and how its end becomes an exit code.
#include <algorithm>
#include <array>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/console.h"
#include "tools/kral/examples.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/many_handsets.h"
#include "tools/kral/result_lines.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLongestTimeOutMs = 3600 * 1000;
constexpr std::uint16_t kMostJobs = 48;

std::string VersionText() {
  std::array<char, 64> text{};
  KRAL_GetLibraryVersion(text.data());
  return text.data();
}

void AddCommonOptions(const Command& root, Context& context) {
  root.Add("-p,--port", context.session.port,
           "COM port numbers, such as 7 or 7,8,20-27; default: the only one with a "
           "handset");
  root.Flag("--all", context.all, "Every port on which a handset answers");
  root.Add("--jobs", context.jobs, "How many handsets are worked on at once; default: all").Between(1, kMostJobs);
  root.Flag(
      "--json", [&context] { context.out.UseJson(); }, "Print one JSON object");
  root.Add("--log", context.session.log_file, "Write the text log of the connection to this file").File();
  root.Add("--log-flags", context.session.log_flags, "Categories of the text log, such as 0x421F");
  root.Add("--time-out", context.session.time_out_ms, "Milliseconds to wait for each answer")
      .Between(1, kLongestTimeOutMs, "ms");
}

struct VerbsOf {
  std::string_view nouns;  // that must be there, too
  void (*add)(const Command& root, Context& context);
};

constexpr VerbsOf kVerbs[] = {
    {"ports", AddPortVerbs},  {"info", AddInfoVerbs},   {"mode", AddModeVerbs},       {"fs", AddFsVerbs},
    {"ftm", AddFtmVerbs},     {"log", AddLogVerbs},     {"event", AddEventVerbs},     {"nv", AddNvVerbs},
    {"flash", AddFlashVerbs}, {"nv", AddNvBackupVerbs}, {"flash boot", AddBootVerbs}, {"band", AddBandVerbs},
    {"raw", AddRawVerbs},     {"sim", AddSimVerbs},
};

// Of one noun, or of all: a command line for each of many handsets costs time.
std::unique_ptr<ParsedCommand> Declared(std::string_view noun) {
  auto command = std::make_unique<ParsedCommand>();
  const auto version = [context = &command->context] {
    return context->out.json() ? Json{{"ok", true}, {"version", VersionText()}}.dump() : VersionText();
  };
  command->line = std::make_unique<CommandLine>("kral", "Talks to mobile handsets in production and test.", version);
  const auto root = command->line->root();
  AddCommonOptions(root, command->context);
  for (const auto& verbs : kVerbs) {
    if (verbs.nouns.find(noun) != std::string_view::npos) verbs.add(root, command->context);
  }
  return command;
}

// The verb has done its work all the same.
void TellLogFileTrouble(const Context& context) {
  if (const auto trouble = ResultLine(kLogFileTrouble)) context.out.Note(Format("{}{}", kLogFileTrouble, *trouble));
}

int End(const Context& context, const ToolError& error) {
  try {
    TellLogFileTrouble(context);
    context.out.Failure(error, context.found);
  } catch (const std::exception&) {  // nobody is left to be told
  }
  return static_cast<int>(error.code());
}

// Again, with the names of files that are this handset's.
std::unique_ptr<ParsedCommand> ParseAgain(const std::vector<std::string>& arguments, const CommandLine& line,
                                          const Names& names) {
  const auto verb = line.verb();
  auto command = Declared(verb.substr(0, verb.find(' ')));
  command->line->SetNames(names);
  command->act = command->line->Parse(arguments);
  return command;
}

void Act(std::unique_ptr<ParsedCommand>& command, const std::vector<std::string>& arguments) {
  const auto parse_for = [&](std::uint16_t port, const Names& names) {
    auto own = ParseAgain(arguments, *command->line, names);
    own->context.session.port = std::to_string(port);
    own->context.all = false;
    return own;
  };
  if (IsForMany(*command)) return RunOnMany(*command, parse_for);
  if (!command->line->asked().empty()) {
    command = ParseAgain(arguments, *command->line, NamesOf(*command->line, command->context.session));
  }
  command->act();
}

int Run(const std::vector<std::string>& arguments) {
  auto command = Declared("");
  // Known before the command line is understood, so that mistakes in it are told in JSON, too.
  if (std::ranges::find(arguments, "--json") != arguments.end()) command->context.out.UseJson();
  AddExamples(*command->line);

  try {
    command->act = command->line->Parse(arguments);
    if (command->act == nullptr) return static_cast<int>(ExitCode::kDone);  // help
    Act(command, arguments);
    TellLogFileTrouble(command->context);
    return static_cast<int>(ExitCode::kDone);
  } catch (const ToolError& error) {
    return End(command->context, error);
  } catch (const std::exception& error) {
    return End(command->context, ToolError(ExitCode::kInternal, Format("internal error: {}", error.what()),
                                           "run again with --log FILE and report what it shows"));
  }
}

}  // namespace
}  // namespace kral::tool

int main(int argc, char** argv) {
  const kral::Utf8Terminal terminal;
  kral::tool::CatchInterrupts();
  return kral::tool::Run(kral::ProgramArguments(argc, argv));
}
