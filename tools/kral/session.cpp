// Finds the port, connects, and tells a port and a handset in trouble from a request that failed.
#include "tools/kral/session.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <charconv>
#include <cstdio>
#include <exception>
#include <memory>

#include "platform/clock.h"
#include "platform/file_util.h"
#include "platform/port_list.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/handset_identity.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/port_report.h"
#include "tools/kral/result_lines.h"

namespace kral::tool {
namespace {

constexpr std::uint16_t kMostPorts = 256;
constexpr int kMostAskings = 3;
constexpr std::int32_t kTrafficMs = 200;
constexpr double kLeastTraffic = 10;  // packets a second that are no answers to earlier requests

std::string Describe(const std::vector<std::uint16_t>& ports) {
  std::string text;
  for (const auto port : ports) text += (text.empty() ? "" : ", ") + DescribePort(port);
  return text;
}

// With what stands in the way of each.
std::string DescribeWithState(const std::vector<std::uint16_t>& ports) {
  std::vector<std::string> names;
  for (const auto& report : ReportPorts(ports, false)) {
    const auto state = StateText(report);
    names.push_back(state.empty() ? DescribePort(report.port) : Format("{}: {}", DescribePort(report.port), state));
  }
  return Joined(names, ", ");
}

// Who has it, where the system tells.
std::string OtherProgram(std::uint16_t port) {
  KRAL_PORT_INFO info{};
  if (KRAL_GetPortInfo(port, 0, &info) == 0 || info.process == 0) return "another program";
  return HolderText(info);
}

// Nothing is asked: it would cost a boot loader its hello.
std::uint16_t TheOnlyListedPort() {
  const auto ports = ListPorts();
  if (ports.size() == 1) return ports.front();
  throw ToolError(ExitCode::kUsage,
                  ports.empty() ? "this machine has no serial port" : "this machine has several ports",
                  "name the port of the boot loader: -p N");
}

std::uint16_t TheOnlyPort(Expected expected) {
  if (expected == Expected::kInBootLoader) return TheOnlyListedPort();
  const auto answering = ListPortsWithHandset();
  if (answering.size() == 1) return answering.front();
  if (answering.size() > 1) {
    throw ToolError(ExitCode::kUsage, Format("handsets answer on several ports: {}", Describe(answering)),
                    Format("choose one: -p {}", answering.front()));
  }
  const auto ports = ListPorts();
  if (ports.empty()) {
    throw ToolError(ExitCode::kNoPort, "this machine has no serial port",
                    "plug the handset in, or name its port with -p N");
  }
  if (expected == Expected::kMayBeInDownload && ports.size() == 1) return ports.front();
  throw ToolError(ExitCode::kNoPort, Format("no handset answers on {}", DescribeWithState(ports)),
                  "check cable and power of the handset and that no other program uses its port, or name it with -p N");
}

// The state when it stands in the way of every request; nothing when the port is open, or closed by a time-out only.
std::optional<std::int32_t> TroubleOf(KRAL_HANDLE handle) {
  std::int32_t state = KRAL_PORT_OPEN;
  if (KRAL_GetPortState(handle, &state) == 0 || state == KRAL_PORT_OPEN || state == KRAL_PORT_CLOSED) {
    return std::nullopt;
  }
  return state;
}

ToolError PortError(std::uint16_t port, std::int32_t state, bool was_connected,
                    const std::optional<KRAL_ERROR>& record) {
  const auto name = DescribePort(port);
  switch (state) {
    case KRAL_PORT_BUSY:
      return {ExitCode::kPortInUse, Format("{} is in use by {}", name, OtherProgram(port)),
              "close the program that holds the port, then run the command again", record};
    case KRAL_PORT_NOT_PERMITTED:
      return {ExitCode::kPortInUse, Format("{} may not be opened by this user", name),
              "on Linux, join the group of the device (often dialout) and log in again", record};
    case KRAL_PORT_NOT_FOUND:
      if (was_connected) break;
      return {ExitCode::kNoPort, Format("there is no port {}", name), "kral ports lists the ports there are", record};
    default:
      if (was_connected) break;
      return {ExitCode::kNoPort, Format("{} cannot be opened as a serial port", name),
              "kral ports lists the ports there are; --log FILE tells what the system said", record};
  }
  return {ExitCode::kLost, Format("the handset on {} went away", name),
          "check the cable; a handset that restarts comes back on its port after a while", record};
}

std::atomic<std::uint16_t> latest_port{0};

constexpr const char* kLivenessCheck = "the question whether a handset is there";

// Something answers, if not what was asked for.
bool IsOtherThanSilence(const std::optional<KRAL_ERROR>& record) {
  return record && (record->code == KRAL_ERROR_LINK || record->code == KRAL_ERROR_REFUSED);
}

}  // namespace

SessionOptions OfNullPort(SessionOptions options) {
  options.port = std::to_string(KRAL_PORT_NULL);
  options.serial.clear();
  options.log_file.clear();
  options.trace = {};
  return options;
}

std::uint16_t ParsePort(std::string_view text) {
  auto digits = text;
  if (digits.size() > 3 && (digits.substr(0, 3) == "COM" || digits.substr(0, 3) == "com")) digits.remove_prefix(3);
  std::uint16_t port = 0;
  const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), port);
  if (error != std::errc() || end != digits.data() + digits.size()) {
    throw ToolError(ExitCode::kUsage, Format("{} is not a port number", text),
                    "give the number of a COM port, such as -p 7");
  }
  return port;
}

std::string DescribePort(std::uint16_t port) {
  const std::string name = Format("COM{}", port);
  const std::string device = ComPortDevice(port);
  return device.empty() || device.find(name) != std::string::npos ? name : Format("{} ({})", name, device);
}

std::shared_ptr<std::FILE> OpenLogFile(const std::string& name) {
  if (std::FILE* const file = OpenToWriteText(name)) return {file, std::fclose};
  throw ToolError(ExitCode::kBadFile, Format("the log file {} cannot be written", name),
                  "check folder and permissions of the file named by --log; a pipe must have its reader already");
}

std::uint16_t LatestPort() {
  return latest_port;
}

std::vector<std::uint16_t> ListPorts() {
  std::vector<std::uint16_t> ports(kMostPorts);
  std::uint16_t count = kMostPorts;
  if (KRAL_GetAllPortList(&count, ports.data()) == 0) count = 0;
  ports.resize(count);
  return ports;
}

std::vector<std::uint16_t> ListPortsWithHandset() {
  std::vector<std::uint16_t> ports;
  // On a busy machine a healthy handset may answer later than a check waits.
  for (int i = 0; i < kMostAskings && ports.empty() && !Interrupted(); ++i) {
    std::uint16_t count = kMostPorts;
    ports.resize(count);
    if (KRAL_GetAvailablePhonesPortList(&count, ports.data(), 0, nullptr) == 0) count = 0;
    ports.resize(count);
  }
  return ports;
}

Session::Session(const SessionOptions& options, Expected expected)
    : port_(0), handle_(0), exceptions_(std::uncaught_exceptions()) {
  RefuseLogFile(options.log_file, options.trace.file, "the trace");
  RefuseLogFile(options.log_file, options.trace.file_on_failure, "the trace");
  if (!options.log_file.empty()) log_file_ = OpenLogFile(options.log_file);
  KRAL_SetDefaultReceiveMode(KRAL_RECEIVE_MODE_WAKE);
  port_ = options.port.empty() ? TheOnlyPort(expected) : ParsePort(options.port);
  if (port_ != KRAL_PORT_NULL) latest_port = port_;
  ThrowIfInterrupted();
  handle_ = expected == Expected::kInBootLoader ? KRAL_Kivrat_ConnectServer(port_) : KRAL_ConnectServer(port_);
  if (handle_ == 0) {
    throw ToolError(ExitCode::kInternal, Format("no connection to {} could be made", DescribePort(port_)),
                    "close other programs that use the library, then run the command again", LastError(0));
  }
  try {
    StartLog(options);
    trace_.emplace(handle_, options.trace);
    if (options.time_out_ms) {
      const auto milliseconds = static_cast<std::int32_t>(*options.time_out_ms);
      KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_COMMAND, milliseconds);
      KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_LIVENESS, milliseconds);
    }
    // What the handset answers late shall not be taken for the answer to something else.
    KRAL_SetResynchronise(handle_, 1);
    KRAL_SetEfsAutomaticPacketSize(handle_, 1);
    CheckAnswers(expected);
    if (answers_ && !options.serial.empty()) CheckSerial(options.serial);
  } catch (...) {
    if (trace_) trace_->End(true);
    KRAL_DisconnectServer(handle_);
    throw;
  }
}

// A verb fails by an exception.
Session::~Session() {
  trace_->End(std::uncaught_exceptions() > exceptions_);
  KRAL_ConfigureLibraryTextLogCallBack(handle_, nullptr);
  KRAL_DisconnectServer(handle_);
}

void Session::StartLog(const SessionOptions& options) const {
  CollectResultLines(handle_);
  const bool to_file = !options.log_file.empty();
  // Errors and results are always in it.
  if (options.log_flags || !to_file) KRAL_SetLogFlags(handle_, options.log_flags.value_or(0) | kResultLines);
  if (to_file) KRAL_StartLogging(handle_, options.log_file.c_str());
}

bool Session::AnswersInTheEnd() const {
  constexpr std::array<std::int32_t, 2> kLonger = {300, 1000};
  const std::int32_t before = KRAL_GetTimeOut(handle_, KRAL_TIME_OUT_LIVENESS);
  bool answers = false;
  for (const std::int32_t longer : kLonger) {
    if (answers || TroubleOf(handle_) || Interrupted()) break;
    KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_LIVENESS, std::max(before, longer));
    answers = KRAL_IsPhoneConnected(handle_) != 0;
  }
  KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_LIVENESS, before);
  return answers;
}

// What it sends by itself stands in front of its answer: while such packets come it is asked once more, for as long as
// any answer may take. The rate is 0 when none come.
bool Session::AnswersBehindTraffic(double& packets_per_second) const {
  const auto received = [this] {
    KRAL_TRAFFIC_COUNTERS counters{};
    return KRAL_GetTrafficCounters(handle_, &counters) == 0 ? std::uint64_t{0} : counters.packets_received;
  };
  Clock& clock = SystemClock();
  const auto packets = received();
  const auto start = clock.TickMs();
  const std::int32_t before = KRAL_GetTimeOut(handle_, KRAL_TIME_OUT_LIVENESS);
  // First for a moment only, which tells whether anything comes at all.
  for (const std::int32_t wait : {kTrafficMs, KRAL_GetTimeOut(handle_, KRAL_TIME_OUT_COMMAND)}) {
    KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_LIVENESS, std::max(before, wait));
    const bool answers = KRAL_IsPhoneConnected(handle_) != 0;
    KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_LIVENESS, before);
    const auto elapsed = std::max<std::uint32_t>(clock.TickMs() - start, 1);
    packets_per_second = static_cast<double>(received() - packets) * 1000 / elapsed;
    if (answers) return true;
    if (packets_per_second < kLeastTraffic || TroubleOf(handle_) || Interrupted()) return false;
  }
  return false;
}

NoDiagnosticsError Session::Flooded(double packets_per_second, const std::optional<KRAL_ERROR>& record) const {
  return {ExitCode::kNoAnswer,
          Format("{} sends {:.0f} packets/s and answers late", DescribePort(port_), packets_per_second),
          "kral log off --all, with --time-out 60000 where its answer has to wait as well", record};
}

// What has the line of a handset that is being downloaded to, in words; null for anything else. A no-operation of
// either tells; handsets in diagnostic mode refuse both.
const char* Session::DownloadState() const {
  const auto answers = [this](std::uint8_t request, std::uint8_t answer) {
    constexpr std::uint32_t kPatienceMs = 200;
    std::array<std::uint8_t, 64> reply{};
    auto size = static_cast<std::uint16_t>(reply.size());
    KRAL_SendSync(handle_, 1, &request, &size, reply.data(), kPatienceMs);
    return size > 0 && size < reply.size() && reply[0] == answer;
  };
  if (TroubleOf(handle_)) return nullptr;
  KRAL_SetResynchronise(handle_, 0);  // with a question that neither of them takes
  const char* const state = answers(9, 10) ? "a flash programmer" : answers(6, 2) ? "the loader" : nullptr;
  KRAL_SetResynchronise(handle_, 1);
  return state;
}

void Session::CheckAnswers(Expected expected) {
  if (expected == Expected::kInBootLoader) return;
  const bool may_be_in_download = expected == Expected::kMayBeInDownload;
  answers_ = KRAL_IsPhoneConnected(handle_) != 0;
  auto record = LastError(handle_);
  if (!answers_ && may_be_in_download && DownloadState() != nullptr) return;
  // A busy machine may keep a healthy handset's answer for longer than one check waits. With the port in order, ask
  // again, for longer each time.
  if (!answers_) answers_ = AnswersInTheEnd();
  if (answers_) return;
  ThrowIfInterrupted();
  // What came to the first question may be in the way of the later ones.
  if (!IsOtherThanSilence(record)) record = LastError(handle_);
  if (const auto trouble = TroubleOf(handle_)) throw PortError(port_, *trouble, false, record);
  double rate = 0;
  answers_ = AnswersBehindTraffic(rate);
  if (answers_) return;
  ThrowIfInterrupted();
  if (rate >= kLeastTraffic) throw Flooded(rate, record);
  if (may_be_in_download) return;
  if (const auto* const state = DownloadState()) {
    throw NoDiagnosticsError(ExitCode::kRefused, Format("{} runs {}, and no diagnostics", DescribePort(port_), state),
                             "kral flash info tells more, kral flash reset restarts the handset");
  }
  if (IsOtherThanSilence(record)) throw ExplainRecord(*record, kLivenessCheck, port_);
  throw ToolError(ExitCode::kNoAnswer, Format("nothing answers on {}", DescribePort(port_)),
                  "check that this is the handset's diagnostic port and that the handset is on; --time-out MS waits "
                  "longer, --log FILE shows what came",
                  record);
}

// Minutes may have passed, and hands plug.
void Session::CheckSerial(const std::string& serial) {
  const auto now = IfTold(*this, SerialOf);
  if (now == serial) return;
  throw ToolError(ExitCode::kSafetyStop,
                  Format("another handset is on {} by now: {} in place of {}", DescribePort(port_),
                         now.empty() ? "one that does not tell its serial number" : now, serial),
                  "nothing was done to it; run the command again");
}

void Session::Begin() {
  ThrowIfInterrupted();
}

std::optional<ToolError> Session::Silence() const {
  // That the device is gone is told only until the asking has closed its port.
  const auto before = TroubleOf(handle_);
  if (KRAL_IsPhoneConnected(handle_) != 0 || AnswersInTheEnd()) return std::nullopt;
  const auto record = LastError(handle_);
  const auto after = TroubleOf(handle_);
  if (const auto trouble = after ? after : before) return PortError(port_, *trouble, true, record);
  // The first of many frames may be damaged: the port was opened in the middle of it.
  double rate = 0;
  if (AnswersBehindTraffic(rate)) return std::nullopt;
  if (rate >= kLeastTraffic) return Flooded(rate, record);
  if (IsOtherThanSilence(record)) return ExplainRecord(*record, kLivenessCheck, port_);
  return ToolError(ExitCode::kNoAnswer, Format("the handset on {} answers nothing any more", DescribePort(port_)),
                   "check cable and power", record);
}

// The library tells a port that was never there from one that came and went by the same code.
std::optional<ToolError> Session::ExplainPort(const KRAL_ERROR& record) const {
  if (record.code != KRAL_ERROR_NO_PORT && record.code != KRAL_ERROR_PORT_IN_USE) return std::nullopt;
  const auto trouble = TroubleOf(handle_);
  return trouble ? std::optional(PortError(port_, *trouble, answers_, record)) : std::nullopt;
}

ToolError Session::Explain(std::string_view what) const {
  const auto record = LastError(handle_);
  if (Interrupted()) return InterruptedError();
  if (!record) return ExplainRecord(record, what, port_);
  if (const auto error = ExplainPort(*record)) return *error;
  if (record->code != KRAL_ERROR_NO_ANSWER || !answers_) return ExplainRecord(*record, what, port_);
  const auto silence = Silence();
  if (silence && silence->code() == ExitCode::kLost) return *silence;
  return ExplainRecord(*record, what, port_,
                       silence ? Format("{}: {}", silence->what(), silence->hint())
                               : "the handset still answers other requests; --time-out MS waits longer");
}

}  // namespace kral::tool
