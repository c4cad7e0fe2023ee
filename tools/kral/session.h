// One connection to one handset for the length of a verb, and why things went wrong on it.
#ifndef KRAL_TOOLS_SESSION_H
#define KRAL_TOOLS_SESSION_H

#include <cstdint>
#include <cstdio>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kral/kral.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/session_trace.h"

namespace kral::tool {

struct SessionOptions {
  std::string port;                              // empty: the only port on which a handset answers
  std::map<std::uint16_t, std::uint16_t> slots;  // of those ports that were named by their slot
  std::string serial;                            // of the handset that it must still be; empty: any
  std::uint32_t wait_ms = 0;                     // for a port and its handset to appear
  std::string log_file;
  std::optional<std::uint32_t> log_flags;
  TraceOptions trace;
  std::optional<std::uint32_t> time_out_ms;  // of every request
};

// Of the null port, which answers for a handset where only the library is asked; neither logged nor traced.
SessionOptions OfNullPort(SessionOptions options);

// "7", "COM7"; ToolError kUsage for anything else.
std::uint16_t ParsePort(std::string_view text);
// "COM7", with the device behind it where that is a different name.
std::string DescribePort(std::uint16_t port);

std::vector<std::uint16_t> ListPorts();
std::vector<std::uint16_t> ListPortsWithHandset();

// On which the latest session of this process began; 0 for none.
std::uint16_t LatestPort();

// A handset that is being downloaded to does not answer diagnostic requests.
// One in its boot loader says hello once: its port is not even opened.
enum class Expected { kAnswers, kMayBeInDownload, kInBootLoader };

// A handset is there, but no diagnostics that answer in time: it is in download, or hidden behind what it sends.
class NoDiagnosticsError : public ToolError {
 public:
  using ToolError::ToolError;
};

// Kept open meanwhile: what the library cannot write is dropped without a word. ToolError kBadFile.
std::shared_ptr<std::FILE> OpenLogFile(const std::string& name);

class Session {
 public:
  // Connects and checks that a handset answers, unless it need not; ToolError when not, and when it is another one than
  // it must be.
  explicit Session(const SessionOptions& options, Expected expected = Expected::kAnswers);
  ~Session();
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  KRAL_HANDLE handle() const { return handle_; }
  std::uint16_t port() const { return port_; }
  bool answers_diagnostics() const { return answers_; }  // did, when the session began

  // The place where Ctrl-C takes effect; to be called before a request.
  void Begin();
  // Why the call that has just failed did so, in an error that names the port, and `what` where the library does not
  // say what was wrong. A silent handset is asked whether it still answers.
  ToolError Explain(std::string_view what) const;
  // Looks whether the handset still answers. Nothing when it does.
  std::optional<ToolError> Silence() const;
  // Begin, the request, and the error if it gives 0.
  template <class Request>
  void Run(std::string_view what, Request&& request) {
    Begin();
    if (request() == 0) throw Explain(what);
  }

 private:
  // Of a port that stands in the way of every request.
  std::optional<ToolError> ExplainPort(const KRAL_ERROR& record) const;
  void StartLog(const SessionOptions& options) const;
  void CheckAnswers(Expected expected);
  void CheckSerial(const std::string& serial);
  bool AnswersInTheEnd() const;
  bool AnswersBehindTraffic(double& packets_per_second) const;
  NoDiagnosticsError Flooded(double packets_per_second, const std::optional<KRAL_ERROR>& record) const;
  const char* DownloadState() const;

  std::uint16_t port_;
  KRAL_HANDLE handle_;
  bool answers_ = false;
  const int exceptions_;  // under way when the session began
  std::optional<SessionTrace> trace_;
  std::shared_ptr<std::FILE> log_file_;  // the library has its own; the reader of a pipe must not see its end before
};

}  // namespace kral::tool

#endif
