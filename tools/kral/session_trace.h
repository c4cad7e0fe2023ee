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
  bool in_json = false;  // what is told of it
};

// ToolError when something else would be written to the file of the text log: each would destroy the other.
void RefuseLogFile(const std::string& log_file, const std::string& file, const char* what);

// The files of a verb: those that it writes, and the words of its command line, of which any may be a file, or one
// behind the number of an image's type.
struct FilesOfVerb {
  std::vector<std::string> written;
  std::vector<std::string> words;  // with those that it writes
};
// ToolError when text log, trace or report would be written to one of them, and when what it writes is twice among
// them: it would destroy what it reads.
void RefuseSharedFiles(const std::string& log_file, const TraceOptions& trace, const std::string& report,
                       const FilesOfVerb& files);

class SessionTrace {
 public:
  // ToolError when the file cannot be written, and when both are asked for.
  SessionTrace(KRAL_HANDLE handle, const TraceOptions& options);

  // In front of the disconnect. What goes wrong is told: the verb has done its work, or failed, all the same.
  void End(bool failed) noexcept;

 private:
  void Tell(const std::string& text) const;

  const KRAL_HANDLE handle_;
  const TraceOptions options_;
};

}  // namespace kral::tool

#endif
