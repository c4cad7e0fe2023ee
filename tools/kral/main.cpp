// The command line: common options, the choice of a verb, and how its end becomes an exit code.
#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "platform/console.h"
#include "tools/kral/examples.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/result_lines.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLongestTimeOutMs = 3600 * 1000;

std::string VersionText() {
  std::array<char, 64> text{};
  KRAL_GetLibraryVersion(text.data());
  return text.data();
}

void AddCommonOptions(const Command& root, Context& context) {
  root.Add("-p,--port", context.session.port, "COM port number; default: the only one with a handset");
  root.Flag(
      "--json", [&context] { context.out.UseJson(); }, "Print one JSON object");
  root.Add("--log", context.session.log_file, "Write the text log of the connection to this file");
  root.Add("--log-flags", context.session.log_flags, "Categories of the text log, such as 0x421F");
  root.Add("--time-out", context.session.time_out_ms, "Milliseconds to wait for each answer")
      .Between(1, kLongestTimeOutMs, "ms");
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

int Run(const std::vector<std::string>& arguments) {
  Context context;
  // Known before the command line is understood, so that mistakes in it are told in JSON, too.
  if (std::ranges::find(arguments, "--json") != arguments.end()) context.out.UseJson();
  CommandLine command_line("kral", "Talks to mobile handsets in production and test.", VersionText);
  const auto root = command_line.root();
  AddCommonOptions(root, context);
  AddPortVerbs(root, context);
  AddInfoVerbs(root, context);
  AddModeVerbs(root, context);
  AddFsVerbs(root, context);
  AddFtmVerbs(root, context);
  AddLogVerbs(root, context);
  AddEventVerbs(root, context);
  AddNvVerbs(root, context);
  AddFlashVerbs(root, context);
  AddNvBackupVerbs(root, context);
  AddBootVerbs(root, context);
  AddBandVerbs(root, context);
  AddRawVerbs(root, context);
  AddSimVerbs(root, context);
  AddExamples(command_line);

  try {
    const auto act = command_line.Parse(arguments);
    if (act == nullptr) return static_cast<int>(ExitCode::kDone);  // help
    act();
    TellLogFileTrouble(context);
    return static_cast<int>(ExitCode::kDone);
  } catch (const ToolError& error) {
    return End(context, error);
  } catch (const std::exception& error) {
    return End(context, ToolError(ExitCode::kInternal, Format("internal error: {}", error.what()),
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
