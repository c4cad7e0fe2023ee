// The command line: common options, the choice of a verb, and how its end becomes an exit code.
#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <string>
#include <utility>
#include <vector>

#include "platform/console.h"
#include "tools/kral/exit_codes.h"
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

void AddCommonOptions(CLI::App& app, Context& context) {
  app.add_option("-p,--port", context.session.port, "COM port number; default: the only one with a handset");
  app.add_flag_callback(
      "--json", [&context] { context.out.UseJson(); }, "Print one JSON object");
  app.add_option("--log", context.session.log_file, "Write the text log of the connection to this file");
  app.add_option("--log-flags", context.session.log_flags, "Categories of the text log, such as 0x421F");
  app.add_option("--time-out", context.session.time_out_ms, "Milliseconds to wait for each answer")
      ->check(CLI::Range(1u, kLongestTimeOutMs));
}

// Common options are taken behind a verb, too.
void AllowOptionsAnywhere(CLI::App& app) {
  for (auto* verb : app.get_subcommands([](CLI::App*) { return true; })) {
    verb->fallthrough();
    AllowOptionsAnywhere(*verb);
  }
}

// The verb has done its work all the same.
void TellLogFileTrouble(const Context& context) {
  if (const auto trouble = ResultLine(kLogFileTrouble))
    context.out.Note(fmt::format("{}{}", kLogFileTrouble, *trouble));
}

int End(const Context& context, const ToolError& error) {
  try {
    TellLogFileTrouble(context);
    context.out.Failure(error, context.found);
  } catch (const std::exception&) {  // nobody is left to be told
  }
  return static_cast<int>(error.code());
}

int Run(std::vector<std::string> arguments) {
  Context context;
  // Known before the command line is understood, so that mistakes in it are told in JSON, too.
  if (std::find(arguments.begin(), arguments.end(), "--json") != arguments.end()) context.out.UseJson();
  CLI::App app("Talks to mobile handsets in production and test.", "kral");
  app.require_subcommand(1);
  app.set_version_flag("--version", VersionText);
  AddCommonOptions(app, context);
  AddPortVerbs(app, context);
  AddInfoVerbs(app, context);
  AddModeVerbs(app, context);
  AddFsVerbs(app, context);
  AddFtmVerbs(app, context);
  AddLogVerbs(app, context);
  AddEventVerbs(app, context);
  AddNvVerbs(app, context);
  AddFlashVerbs(app, context);
  AddNvBackupVerbs(app, context);
  AddBootVerbs(app, context);
  AddBandVerbs(app, context);
  AddRawVerbs(app, context);
  AddSimVerbs(app, context);
  AllowOptionsAnywhere(app);

  try {
    std::reverse(arguments.begin(), arguments.end());  // as the parser wants them
    app.parse(std::move(arguments));
    context.run();
    TellLogFileTrouble(context);
    return static_cast<int>(ExitCode::kDone);
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);  // --help, --version
    return End(context, ToolError(ExitCode::kUsage, error.what(), "kral --help lists the verbs and options"));
  } catch (const ToolError& error) {
    return End(context, error);
  } catch (const std::exception& error) {
    return End(context, ToolError(ExitCode::kInternal, fmt::format("internal error: {}", error.what()),
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
