// Starts a trace, and brings it to its file.
#include "tools/kral/session_trace.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "tools/kral/call_failure.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/one_file.h"
#include "tools/kral/output.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

// Of the traffic in front of a failure: minutes of commands, or seconds of a flood.
constexpr std::uint32_t kKeptBytes = 8u << 20;
// Each waits for a second; a disk that takes nothing for so long has gone.
constexpr int kMostWaits = 30;

// Whether a word names that file.
auto IsFile(const std::string& file) {
  return [&file](const std::string& word) {
    if (word.empty()) return false;
    const auto colon = word.find(':');
    const bool has_type = colon != std::string::npos && word.find_first_not_of("0123456789") == colon;
    return IsOneFile(file, word) || (has_type && IsOneFile(file, word.substr(colon + 1)));
  };
}

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

void RefuseSharedFiles(const std::string& log_file, const TraceOptions& trace, const std::string& report,
                       const FilesOfVerb& files) {
  const std::pair<const char*, const std::string&> others[] = {{"--log", log_file},
                                                               {"--trace", trace.file},
                                                               {"--trace-on-failure", trace.file_on_failure},
                                                               {"--report", report}};
  for (const auto& [option, file] : others) {
    if (file.empty()) continue;
    if (!std::ranges::any_of(files.words, IsFile(file)) && !std::ranges::any_of(files.written, IsFile(file))) continue;
    throw ToolError(ExitCode::kUsage, Format("{} would destroy {}, a file of the command itself", option, file),
                    Format("name another file behind {}", option));
  }
  for (const auto& file : files.written) {
    if (file.empty() || file == "-" || std::ranges::count_if(files.words, IsFile(file)) < 2) continue;
    throw ToolError(ExitCode::kUsage, Format("{} would be written, and is named once more", file),
                    "give what is written a file of its own");
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

void SessionTrace::Tell(const std::string& text) const {
  const Json event{{"event", "note"}, {"text", text}};
  WriteAside(options_.in_json ? JsonLine(event) : SafeText(text) + "\n");
}

void SessionTrace::End(bool failed) noexcept {
  try {
    if (!options_.file.empty() && !Stop(handle_)) {
      Tell(Format("the trace file {} does not hold everything: its disk is full, slow or gone", options_.file));
    }
    if (options_.file_on_failure.empty() || !failed) return;
    const auto& file = options_.file_on_failure;
    const bool saved = KRAL_SaveTrace(handle_, file.c_str()) != 0;
    Tell(saved ? Format("the traffic in front of the failure is in {}", file)
               : Format("the trace file {} cannot be written", file));
  } catch (const std::exception&) {  // nobody is left to be told
  }
}

}  // namespace kral::tool
