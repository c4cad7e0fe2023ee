// The trace of a connection for the length of a verb: all of it, or, once the verb has failed, the end of it.
#ifndef KRAL_TOOLS_SESSION_TRACE_H
#define KRAL_TOOLS_SESSION_TRACE_H

#include <string>
#include <vector>

#include "kral/kral.h"

namespace kral::tool {

struct TraceOptions {
  std::string file;
  std::string file_on_failure;
};

// ToolError when something else would be written to the file of the text log: each would destroy the other.
void RefuseLogFile(const std::string& log_file, const std::string& file, const char* what);

// ToolError when text log or trace would be written to a file of the verb: one of these words, or what stands behind
// the number of an image's type in it.
void RefuseFilesOfVerb(const std::string& log_file, const TraceOptions& trace, const std::vector<std::string>& words);

class SessionTrace {
 public:
  // ToolError when the file cannot be written, and when both are asked for.
  SessionTrace(KRAL_HANDLE handle, const TraceOptions& options);

  // In front of the disconnect. What goes wrong is told: the verb has done its work, or failed, all the same.
  void End(bool failed) noexcept;

 private:
  const KRAL_HANDLE handle_;
  const TraceOptions options_;
};

}  // namespace kral::tool

#endif
