// Sets a job up, watches it, and makes verdicts of its results.
#include "tools/kral/flash/flash_many.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/kral/call_failure.h"
#include "tools/kral/flash/boot_target.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/many_handsets.h"
#include "tools/kral/port_report.h"
#include "tools/kral/verdicts.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kDrawEveryMs = 100;
constexpr std::uint32_t kHelloMs = 5000;
constexpr std::uint32_t kHelloDelayMs = 500;  // between two looks, as the library has it
constexpr std::uint32_t kEndOfThreadsMs = 1000;

template <class Record>
Record Empty() {
  Record record{};
  record.size = sizeof record;
  return record;
}

class FlashJob {
 public:
  FlashJob(Context& context, const FlashPlan& plan) : context_(context), plan_(plan), job_(KRAL_VENTRIMS_Create()) {}
  ~FlashJob() { KRAL_VENTRIMS_Free(job_); }
  FlashJob(const FlashJob&) = delete;
  FlashJob& operator=(const FlashJob&) = delete;

  void Run();

 private:
  struct OneHandset {
    Verdict verdict;
    Output out;  // of its own line
    std::optional<Progress> progress;
    bool ended = false;
    StepTimes steps;
    std::string log_name;
    std::shared_ptr<std::FILE> log;
  };

  void Do(std::uint8_t result, const char* what) const;
  std::vector<std::uint16_t> Ports() const;
  void SetUp();
  void AddHandset(std::uint16_t port);
  void Start();
  void Watch(Board& board);
  void Look(std::uint32_t number, Board& board);
  double SecondsNow() const;
  void Judge(std::uint32_t number);
  ToolError Explain(const KRAL_VENTRIMS_RESULT& result) const;
  // On a thread of the job.
  void NoteStep(std::uint32_t number);

  Context& context_;
  const FlashPlan& plan_;
  const KRAL_VENTRIMS_JOB job_;
  std::uint64_t programmer_bytes_ = 0;
  const std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
  std::deque<OneHandset> handsets_;
  std::mutex steps_mutex_;  // of all of them
};

void FlashJob::Do(std::uint8_t result, const char* what) const {
  if (result == 0) throw ExplainRecord(LastError(job_), what, 0);
}

// Those that can do the first step.
std::vector<std::uint16_t> FlashJob::Ports() const {
  if (!context_.all) return WithoutTwins(ParsePorts(context_.session.port), true);
  if (!plan_.programmer.empty() && !plan_.enter) throw MustNameBootLoaders();
  const std::uint32_t wanted = plan_.enter ? KRAL_ANSWERS_DIAGNOSTICS : KRAL_ANSWERS_FLASH_PROGRAMMER;
  std::vector<std::uint16_t> ports;
  for (const auto& report : ReportPorts(WithoutTwins(ListPorts(), false), true)) {
    if (report.info.answers == wanted) ports.push_back(report.port);
  }
  if (!ports.empty()) return ports;
  throw ToolError(ExitCode::kNoPort, plan_.enter ? "no handset answers on any port" : "no flash programmer answers",
                  "kral ports --probe tells who answers where");
}

void FlashJob::SetUp() {
  const auto& trace = context_.session.trace;
  if (!trace.file.empty() || !trace.file_on_failure.empty()) {
    throw ToolError(ExitCode::kUsage, "downloads to several handsets are not traced", "name one port: -p 7");
  }
  auto options = Empty<KRAL_VENTRIMS_OPTIONS>();
  Do(KRAL_VENTRIMS_GetOptions(job_, &options), "the job");
  options.flags = (plan_.enter ? KRAL_VENTRIMS_ENTER_LOADER : 0) | (plan_.reset ? KRAL_VENTRIMS_RESET : 0);
  options.at_once = context_.jobs;
  options.block_size = plan_.options.block_size;
  options.command_ms = context_.session.time_out_ms.value_or(0);
  if (plan_.return_s != 0) options.return_ms = plan_.return_s * 1000;
  // It is said by now, or as soon as the port is there.
  if (!plan_.programmer.empty()) options.hello_ms = plan_.return_s * 1000 + kHelloMs;
  Do(KRAL_VENTRIMS_SetOptions(job_, &options), "the job");
  if (!plan_.programmer.empty()) {
    programmer_bytes_ = CheckFile(plan_.programmer);
    Do(KRAL_VENTRIMS_AddProgrammer(job_, plan_.programmer.c_str(), KRAL_VENTRIMS_PROGRAMMER_BOOT), "the programmer");
  }
  if (!plan_.partition_table.empty()) {
    Do(KRAL_VENTRIMS_AddPartitionTable(job_, plan_.partition_table.c_str(), plan_.override_table ? 1 : 0),
       "the partition table");
  }
  for (const auto& argument : plan_.images) {
    const auto image = NameFlashImage(argument);
    Do(KRAL_VENTRIMS_AddImage(job_, image.file.c_str(), plan_.options.format, image.type.value_or(plan_.options.type),
                              plan_.options.header.empty() ? nullptr : plan_.options.header.c_str(),
                              plan_.options.nor ? KRAL_STREAM_NOR : KRAL_STREAM_MULTI_IMAGE),
       "the image");
  }
}

void FlashJob::AddHandset(std::uint16_t port) {
  std::uint32_t number = 0;
  Do(KRAL_VENTRIMS_AddPort(job_, port, &number), "the port");
  handsets_.emplace_back().verdict.port = port;
  KRAL_HANDLE handle = 0;
  Do(KRAL_VENTRIMS_GetHandle(job_, number, &handle), "the handset");
  if (plan_.pre_done_delay_ms != 0) KRAL_Kivrat_Configure(handle, 0, kHelloDelayMs, plan_.pre_done_delay_ms);
  const auto log = FileOfPort(context_.session.log_file, context_.session, port, handsets_.size());
  if (log.empty()) return;
  for (const auto& handset : handsets_) {
    if (handset.log_name != log) continue;
    throw ToolError(ExitCode::kUsage, Format("the log {} would be that of several handsets", log),
                    "put {port} or {slot} into its name");
  }
  handsets_.back().log_name = log;
  handsets_.back().log = OpenLogFile(log);
  if (context_.session.log_flags) KRAL_SetLogFlags(handle, *context_.session.log_flags);
  KRAL_StartLogging(handle, log.c_str());
}

// What the job says of a file is put into more words.
void FlashJob::Start() {
  if (KRAL_VENTRIMS_Start(job_) != 0) return;
  const auto record = LastError(job_);
  if (record && record->code == KRAL_ERROR_BAD_FILE) {
    for (const auto& image : plan_.images) ReadFlashImage(image, plan_.options.format);
  }
  throw ExplainRecord(record, "the start of the download", 0);
}

void FlashJob::Look(std::uint32_t number, Board& board) {
  auto& handset = handsets_[number];
  if (handset.ended) return;
  auto now = Empty<KRAL_VENTRIMS_PROGRESS>();
  if (KRAL_VENTRIMS_GetProgress(job_, number, &now) == 0 || now.state == KRAL_VENTRIMS_WAITING) return;
  const bool is_new = !handset.progress || handset.verdict.serial != now.serial;
  handset.verdict.serial = now.serial;
  handset.verdict.model = now.model;
  if (is_new) board.Begin(number, handset.verdict);
  if (!handset.progress) handset.progress.emplace(handset.out, "flash", now.bytes_total);
  handset.progress->SetTotal(now.bytes_total);
  handset.progress->Describe(now.state == KRAL_VENTRIMS_RETURNING ? "lost: waits for its return" : now.step_name);
  handset.progress->Update(now.bytes_done);
  if (now.state < KRAL_VENTRIMS_PASSED) return;
  Judge(number);
  handset.ended = true;
  board.End(number, handset.verdict);
}

void FlashJob::Judge(std::uint32_t number) {
  auto& verdict = handsets_[number].verdict;
  auto result = Empty<KRAL_VENTRIMS_RESULT>();
  Do(KRAL_VENTRIMS_GetResult(job_, number, &result), "the result");
  verdict.seconds = result.progress.elapsed_ms / 1000.0;
  verdict.members = {{"bytes", result.progress.bytes_done},
                     {"step", result.progress.step_name},
                     {"attempts", result.progress.attempts}};
  if (result.passed != 0) {
    verdict.data =
        Format("{} in {} written and acknowledged\n", Counted(result.progress.bytes_done - programmer_bytes_, "byte"),
               Counted(plan_.images.size(), "image"));
  } else if (result.progress.state == KRAL_VENTRIMS_ABORTED) {
    verdict.failure = InterruptedError();
  } else {
    verdict.failure = Explain(result);
  }
}

ToolError FlashJob::Explain(const KRAL_VENTRIMS_RESULT& result) const {
  const auto& error = result.error;
  const auto port = static_cast<std::uint16_t>(result.progress.port);
  const std::string_view step = result.progress.step_name;
  // Whatever has a flash programmer's line takes its hello.
  if (plan_.programmer.empty() && result.progress.bytes_done == 0 && error.status_kind == KRAL_ERROR_STATUS_REFUSAL) {
    return InDiagnosticMode(port);
  }
  const bool is_transfer = step.starts_with("flash programmer");
  auto hint = is_transfer ? BootHint(error.code) : std::string();
  if (is_transfer && error.code == KRAL_ERROR_NO_ANSWER && result.progress.bytes_done != 0) {
    hint = "check that the programmer is meant for this handset";
  }
  return ExplainRecord(error, step, port, hint);
}

double FlashJob::SecondsNow() const {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - begin_).count();
}

void FlashJob::NoteStep(std::uint32_t number) {
  auto now = Empty<KRAL_VENTRIMS_PROGRESS>();
  if (KRAL_VENTRIMS_GetProgress(job_, number, &now) == 0) return;
  const std::lock_guard lock(steps_mutex_);
  auto& steps = handsets_[number].steps;
  if (now.state >= KRAL_VENTRIMS_PASSED) return steps.End(SecondsNow());
  steps.Enter(now.state == KRAL_VENTRIMS_RETURNING ? kLostStep : now.step_name, SecondsNow());
}

void FlashJob::Watch(Board& board) {
  bool aborted = false;
  for (std::size_t printed = 0; printed < handsets_.size();) {
    if (Interrupted() && !std::exchange(aborted, true)) KRAL_VENTRIMS_Abort(job_, KRAL_VENTRIMS_ALL);
    for (std::uint32_t number = 0; number < handsets_.size(); ++number) Look(number, board);
    for (; printed < handsets_.size() && handsets_[printed].ended; ++printed) {
      if (!context_.out.json()) board.Print(Labelled(handsets_[printed].verdict));
    }
    board.Draw();
    if (printed < handsets_.size()) KRAL_VENTRIMS_Wait(job_, kDrawEveryMs);
  }
}

void FlashJob::Run() {
  KRAL_SetDefaultReceiveMode(KRAL_RECEIVE_MODE_WAKE);
  const auto ports = Ports();
  SetUp();
  for (const auto port : ports) AddHandset(port);
  // Short steps would be missed by looking now and then.
  const auto note_step = [](KRAL_VENTRIMS_JOB, std::uint32_t number, std::uintptr_t job) {
    reinterpret_cast<FlashJob*>(job)->NoteStep(number);
  };
  Do(KRAL_VENTRIMS_SetCallback(job_, note_step, reinterpret_cast<std::uintptr_t>(this)), "the job");
  Start();
  {
    Board board(context_.out, ports);
    for (std::size_t number = 0; number < handsets_.size(); ++number) {
      auto& handset = handsets_[number];
      handset.out = context_.out;
      handset.out.UseLane(board.LaneOf(number, handset.verdict));
    }
    Watch(board);
    for (auto& handset : handsets_) handset.progress.reset();
  }
  KRAL_VENTRIMS_Wait(job_, kEndOfThreadsMs);  // which note the ends of the last steps
  {
    const std::lock_guard lock(steps_mutex_);
    for (auto& handset : handsets_) handset.verdict.steps = handset.steps;
  }
  std::vector<const Verdict*> verdicts;
  for (const auto& handset : handsets_) verdicts.push_back(&handset.verdict);
  ConcludeVerdicts(context_, verdicts);
}

}  // namespace

void FlashMany(Context& context, const FlashPlan& plan) {
  FlashJob(context, plan).Run();
}

}  // namespace kral::tool
