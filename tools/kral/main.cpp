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
#include "tools/kral/page.h"
#include "tools/kral/port_names.h"
#include "tools/kral/result_lines.h"
#include "tools/kral/session_trace.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLongestTimeOutMs = 3600 * 1000;
constexpr std::uint16_t kMostJobs = 48;
constexpr const char* kUsualWait = "--wait=30";
constexpr double kLongestWaitS = 24 * 3600;

std::string VersionText() {
  std::array<char, 64> text{};
  KRAL_GetLibraryVersion(text.data());
  return text.data();
}

std::string FaultOfTraceFile(const std::string& file) {
  return file.empty() ? "a trace has a file" : "";
}

std::string FaultOfOutput(const std::string& file) {
  return file.empty() ? "that is no name of a file" : "";
}

// What others take for the parents of a directory is the port here, in front of the verb and behind it.
std::string FaultOfPort(const std::string& name) {
  if (name.empty()) return "that is no port; without --port the only one with a handset is taken";
  if (name.starts_with('-')) return "ports are numbers from 1 to 255, or names";
  return name.starts_with(':') ? "that is a path on the handset; kral fs mkdir --parents makes those above, too" : "";
}

void AddCommonOptions(const Command& root, Context& context) {
  root.Flag("--all", context.all, "Every port on which a handset answers");
  root.Add("-p,--port", context.session.port,
           "Ports, such as 7, 20-27, /dev/ttyUSB0, esn:80C0FFEE, usb:1-4.2, slot:3, or several with commas; default: "
           "the only one with a handset")
      .Check(FaultOfPort)
      .Suggests(SuggestPorts)
      .Settled("port", "--all");
  root.Add("--wait", context.wait_s, "Wait so long until the ports are there and handsets answer; --wait alone: 30 s")
      .Between(0, kLongestWaitS, "s");
  root.Add("--jobs", context.jobs, "How many handsets are worked on at once; default: all").Between(1, kMostJobs);
  root.Flag(
      "--json",
      [&context] {
        context.out.UseJson();
        context.session.trace.in_json = true;
      },
      "Print one JSON object");
  root.Add("--log", context.session.log_file, "Write the text log of the connection to this file")
      .File()
      .Check(FaultOfOutput)
      .Settled("log");
  root.Add("--log-flags", context.session.log_flags, "Categories of the text log, such as 0x421F").Settled("log_flags");
  root.Add("--trace", context.session.trace.file, "Write what passes over the port to this file, as pcapng")
      .File()
      .Check(FaultOfTraceFile);
  root.Add("--trace-on-failure", context.session.trace.file_on_failure,
           "Write the last of it to this file, if the command fails")
      .File()
      .Check(FaultOfTraceFile);
  root.Add("--report", context.report, "Write a page with steps, times and verdict of each handset to this file")
      .Check(FaultOfOutput);
  root.Add("--time-out", context.session.time_out_ms, "Milliseconds to wait for each answer")
      .Between(1, kLongestTimeOutMs, "ms")
      .Settled("time_out");
}

struct VerbsOf {
  std::string_view nouns;  // that must be there, too
  void (*add)(const Command& root, Context& context);
};

constexpr VerbsOf kVerbs[] = {
    {"ports", AddPortVerbs},       {"doctor", AddDoctorVerbs}, {"info", AddInfoVerbs},
    {"mode", AddModeVerbs},        {"fs", AddFsVerbs},         {"ftm", AddFtmVerbs},
    {"log", AddLogVerbs},          {"event", AddEventVerbs},   {"nv", AddNvVerbs},
    {"flash boot", AddFlashVerbs}, {"nv", AddNvBackupVerbs},   {"flash boot", AddBootVerbs},
    {"band", AddBandVerbs},        {"raw", AddRawVerbs},       {"sim", AddSimVerbs},
    {"cmd", AddCmdVerbs},          {"config", AddConfigVerbs}, {"completion", AddCompletionVerbs},
};

// Of one noun, or of all: a command line for each of many handsets costs time.
std::unique_ptr<ParsedCommand> Declared(std::string_view noun) {
  auto command = std::make_unique<ParsedCommand>();
  const auto version = [context = &command->context] {
    return context->out.json() ? Json{{"ok", true}, {"schema", kSchema}, {"version", VersionText()}}.dump()
                               : VersionText();
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
  for (const auto& trouble : ResultLines(kLogFileTrouble)) context.out.Note(Format("{}{}", kLogFileTrouble, trouble));
}

int End(const Context& context, const ToolError& error) {
  try {
    TellLogFileTrouble(context);
    Json members = Json::object();
    if (!context.for_several() && LatestPort() != 0) members["port"] = LatestPort();
    members.update(context.found);
    context.out.Failure(error, members);
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

// An option with "=" and nothing behind it: the parser would take the next word for its value.
void RefuseMissingValues(const std::vector<std::string>& arguments) {
  for (const auto& argument : arguments) {
    if (argument == "--") return;
    if (!argument.starts_with("--") || argument.find('=') != argument.size() - 1) continue;
    throw ToolError(ExitCode::kUsage, Format("there is nothing behind {}", argument),
                    "give it a value, or leave it out");
  }
}

// --wait without a value: the parser would take the word behind it, whatever that is.
std::vector<std::string> WithUsualWait(std::vector<std::string> arguments) {
  for (std::size_t i = 0; i < arguments.size() && arguments[i] != "--"; ++i) {
    if (arguments[i] != "--wait") continue;
    const bool has_value = i + 1 < arguments.size() && !arguments[i + 1].empty() &&
                           arguments[i + 1].find_first_not_of("0123456789.") == std::string::npos;
    if (!has_value) arguments[i] = kUsualWait;
  }
  return arguments;
}

// Before anything is done: the page comes at the end of work that may take long.
void CheckReport(Context& context, const CommandLine& line) {
  if (context.report.empty()) return;
  context.title = "kral " + line.verb();
  if (line.asks_nobody() || !line.for_many()) {
    throw ToolError(ExitCode::kUsage, Format("{} does nothing to handsets that could be reported", context.title),
                    "leave --report out");
  }
  if (!context.all && context.session.port.empty()) {
    throw ToolError(ExitCode::kUsage, "a report is of ports that are named", "-p 7, -p 7-14 or --all");
  }
  for (const char* name : {"{port}", "{serial}", "{model}", "{slot}"}) {
    if (context.report.find(name) == std::string::npos) continue;
    throw ToolError(ExitCode::kUsage, Format("one report is of all handsets: {} is of one", name), "leave it out");
  }
  RefuseLogFile(context.session.log_file, context.report, "the report");
  CheckPage(context.report, "--report");
}

void RefuseSharedFiles(const ParsedCommand& command) {
  const auto& session = command.context.session;
  RefuseSharedFiles(session.log_file, session.trace, command.context.report,
                    {command.line->Written(), command.line->words()});
}

// From here on ports are numbers.
void FindPorts(Context& context, const std::string& verb) {
  auto& session = context.session;
  if (!context.wait_s) {
    ResolvePortNames(session);
  } else {
    session.wait_ms = static_cast<std::uint32_t>(*context.wait_s * 1000);
    AwaitHandsets(session, context.all, verb.starts_with("boot ") || verb == "flash all");
  }
  if (session.port.empty()) return;
  if (session.port.find_first_of(",-") != std::string::npos) {
    ParsePorts(session.port);
  } else if (const auto port = ParsePort(session.port); port == 0 || port > kLastPort) {
    throw ToolError(ExitCode::kNoPort, Format("there is no port COM{}", port),
                    Format("ports have the numbers 1 to {}", kLastPort));
  }
}

void Act(std::unique_ptr<ParsedCommand>& command, const std::vector<std::string>& arguments) {
  RefuseSharedFiles(*command);
  CheckReport(command->context, *command->line);
  if (command->line->asks_nobody()) {
    IsForMany(*command);  // which may refuse
    return command->act();
  }
  if (command->context.for_several() && command->line->asked().empty()) command->line->Check();
  FindPorts(command->context, command->line->verb());
  const auto parse_for = [&](std::uint16_t port, const Names& names) {
    auto own = ParseAgain(arguments, *command->line, names);
    own->context.session.port = std::to_string(port);
    own->context.session.slots = command->context.session.slots;
    own->context.all = false;
    RefuseSharedFiles(*own);
    own->context.report.clear();
    return own;
  };
  if (IsForMany(*command)) return RunOnMany(*command, parse_for);
  // A verb that takes several ports as they are names their files itself.
  if (!command->line->asked().empty() && !command->context.for_several()) {
    const auto found = command->context.session;
    command = ParseAgain(arguments, *command->line, NamesOf(*command->line, found));
    command->context.session.port = found.port;
    RefuseSharedFiles(*command);
  }
  command->act();
}

// A shell that is completing a line has no use for messages.
int Complete(const std::vector<std::string>& words) {
  try {
    PrintCompletions(*Declared("")->line, words);
  } catch (const std::exception&) {
    return static_cast<int>(ExitCode::kUsage);
  }
  return static_cast<int>(ExitCode::kDone);
}

int Run(const std::vector<std::string>& words) {
  if (!words.empty() && words.front() == "__complete") return Complete({words.begin() + 1, words.end()});
  const auto arguments = WithUsualWait(words);
  auto command = Declared("");
  // Known before the command line is understood, so that mistakes in it are told in JSON, too.
  if (std::ranges::find(arguments, "--json") != arguments.end()) command->context.out.UseJson();
  AddExamples(*command->line);

  try {
    RefuseMissingValues(arguments);
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
