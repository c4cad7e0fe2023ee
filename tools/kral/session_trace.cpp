// Starts a trace, and brings it to its file.
#include "tools/kral/session_trace.h"

#include <exception>
#include <utility>

#include "tools/kral/call_failure.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/one_file.h"
#include "tools/kral/output.h"

namespace kral::tool {
namespace {

// Of the traffic in front of a failure: minutes of commands, or seconds of a flood.
constexpr std::uint32_t kKeptBytes = 8u << 20;
// Each waits for a second; a disk that takes nothing for so long has gone.
constexpr int kMostWaits = 30;

bool Stop(KRAL_HANDLE handle) {
  KRAL_TRACE_COUNTERS counters{};
  for (int i = 0; i < kMostWaits; ++i) {
    if (KRAL_StopTrace(handle) != 0) return true;
    if (KRAL_GetTraceCounters(handle, &counters) == 0 || counters.pending == 0) break;
  }
  return false;
}

}  // namespace

void RefuseLogFile(const std::string& log_file, const std::string& file, const char* what) {
  if (log_file.empty() || file.empty() || !IsOneFile(log_file, file)) return;
  throw ToolError(ExitCode::kUsage, Format("{} cannot be in the file of the text log, {}", what, file),
                  "name another file than that of --log");
}

void RefuseFilesOfVerb(const std::string& log_file, const TraceOptions& trace, const std::vector<std::string>& words) {
  const std::pair<const char*, const std::string&> files[] = {
      {"--log", log_file}, {"--trace", trace.file}, {"--trace-on-failure", trace.file_on_failure}};
  for (const auto& [option, file] : files) {
    if (file.empty()) continue;
    for (const auto& word : words) {
      const auto name = word.substr(word.find_first_not_of("0123456789") == word.find(':') ? word.find(':') + 1 : 0);
      if (word.empty() || (!IsOneFile(file, word) && !IsOneFile(file, name))) continue;
      throw ToolError(ExitCode::kUsage, Format("{} would destroy {}, a file of the command itself", option, name),
                      Format("name another file behind {}", option));
    }
  }
}

SessionTrace::SessionTrace(KRAL_HANDLE handle, const TraceOptions& options) : handle_(handle), options_(options) {
  if (!options.file.empty() && !options.file_on_failure.empty()) {
    throw ToolError(ExitCode::kUsage, "--trace and --trace-on-failure exclude each other",
                    "--trace has everything, whatever the end");
  }
  if (!options.file_on_failure.empty()) KRAL_KeepTrace(handle, kKeptBytes);
  if (options.file.empty() || KRAL_StartTrace(handle, options.file.c_str()) != 0) return;
  throw ToolError(ExitCode::kBadFile, Format("the trace file {} cannot be written", options.file),
                  "check folder and permissions of the file named by --trace, and that nothing else writes it",
                  LastError(handle));
}

void SessionTrace::End(bool failed) noexcept {
  try {
    if (!options_.file.empty() && !Stop(handle_)) {
      WriteAside(Format("the trace file {} does not hold everything: its disk is full, slow or gone\n", options_.file));
    }
    if (options_.file_on_failure.empty() || !failed) return;
    const auto& file = options_.file_on_failure;
    const bool saved = KRAL_SaveTrace(handle_, file.c_str()) != 0;
    WriteAside(saved ? Format("the traffic in front of the failure is in {}\n", file)
                     : Format("the trace file {} cannot be written\n", file));
  } catch (const std::exception&) {  // nobody is left to be told
  }
}

}  // namespace kral::tool
