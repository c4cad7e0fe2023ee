// Drives the download functions of the library and turns their results into errors that say what to try next.
#include "tools/kral/flash/flash_target.h"

#include <algorithm>
#include <array>
#include <chrono>

#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"

namespace kral::tool {
namespace {

constexpr std::chrono::milliseconds kLookAround{50};
constexpr std::uint32_t kAllTries = 5;
constexpr std::uint32_t kRetryDelayMs = 500;

constexpr const char* kLooksInto = "kral flash verify-image FILE tells what is in it";

// What to do about an image that was not written; nothing where code and status of the record say enough.
std::string HintOfWrite(std::uint32_t result, std::uint32_t code) {
  if (code == KRAL_ERROR_NO_PORT || code == KRAL_ERROR_PORT_IN_USE) return {};
  constexpr const char* kTakesLong = "flash that is being erased takes long: --time-out MS waits longer";
  const bool silent = code == KRAL_ERROR_NO_ANSWER;
  const bool refused = code == KRAL_ERROR_REFUSED;
  switch (result) {
    case KRAL_STREAM_FILE_NOT_OPENED:
    case KRAL_STREAM_FILE_NOT_DECODED:
    case KRAL_STREAM_BAD_IMAGE:
    case KRAL_STREAM_DATA_LOST:
    case KRAL_STREAM_FILE_TOO_LARGE:
    case KRAL_STREAM_PAST_END:
      return kLooksInto;
    case KRAL_STREAM_FILE_NOT_READ:
      return "the flash holds part of the image: write it again when the file is complete";
    case KRAL_STREAM_OPEN_FAILED:
      return silent    ? kTakesLong
             : refused ? "check the image type (--type) and that the header has at most 512 bytes"
                       : "";
    case KRAL_STREAM_WRITE_FAILED:
      return "the flash holds part of the image: check cable and power and write it again; a programmer that never "
             "answers long blocks needs --block-size 8186";
    case KRAL_STREAM_NOT_COMPLETED:
      return "write the image again";
    case KRAL_STREAM_CLOSE_FAILED:
      return silent    ? kTakesLong
             : refused ? "check that the image is meant for this handset and the header belongs to it"
                       : "";
    default:
      return {};
  }
}

}  // namespace

AbortWatch::AbortWatch(KRAL_HANDLE handle) : thread_([this, handle] { Run(handle); }) {}

AbortWatch::~AbortWatch() {
  {
    const std::lock_guard lock(mutex_);
    stop_ = true;
  }
  changed_.notify_one();
  thread_.join();
}

// Again and again: an abort that comes before the download begins is forgotten.
void AbortWatch::Run(KRAL_HANDLE handle) {
  std::unique_lock lock(mutex_);
  while (!changed_.wait_for(lock, kLookAround, [this] { return stop_; })) {
    if (Interrupted()) KRAL_AbortDownload(handle);
  }
}

FlashTarget::FlashTarget(const Context& context)
    : context_(context), session_(context.session, Expected::kMayBeInDownload), watch_(session_.handle()) {
  KRAL_ConfigureDownloadCallBack(session_.handle(), &FlashTarget::OnProgress, reinterpret_cast<std::uintptr_t>(this));
}

FlashTarget::~FlashTarget() {
  KRAL_ConfigureDownloadCallBack(session_.handle(), nullptr, 0);
}

void KRAL_CALL FlashTarget::OnProgress(KRAL_HANDLE, std::uint32_t done, std::uint32_t, std::uintptr_t value) {
  auto& self = *reinterpret_cast<FlashTarget*>(value);
  if (self.progress_ != nullptr) self.progress_->Update(self.done_before_ + done);
}

std::optional<std::uint8_t> FlashTarget::LoaderVersion() {
  session_.Begin();
  std::uint8_t version = 0;
  if (KRAL_KOVA_SW_VERSION(session_.handle(), &version) == 0) return std::nullopt;
  return version;
}

std::optional<ProgrammerLimits> FlashTarget::TryHello(std::uint32_t tries) {
  session_.Begin();
  ProgrammerLimits limits;
  KRAL_STREAM_ConfigureHello(session_.handle(), tries, kRetryDelayMs);
  if (KRAL_STREAM_HELLO(session_.handle(), KRAL_STREAM_HELLO_VARIANT, &limits.block_size, &limits.window) == 0) {
    ThrowIfInterrupted();
    return std::nullopt;
  }
  return limits;
}

ProgrammerLimits FlashTarget::Hello() {
  if (session_.answers_diagnostics()) throw InDiagnosticMode(session_.port());
  if (const auto limits = TryHello(kAllTries)) return *limits;
  throw ToolError(ExitCode::kNoAnswer, Format("no flash programmer answers on {}", DescribePort(session_.port())),
                  "kral flash info tells what has the line; a programmer is loaded with kral flash load FILE");
}

void FlashTarget::EnterLoader() {
  if (!session_.answers_diagnostics()) return;
  session_.Run("the switch into download mode", [&] { return KRAL_DIAG_DLOAD_F(session_.handle()); });
}

// Loader and flash programmer take the same request.
void FlashTarget::Reset() {
  session_.Run("the reset", [this] { return KRAL_KOVA_RESET(session_.handle()); });
}

void FlashTarget::Load(const FlashImage& programmer, std::uint32_t maximum_packet) {
  Progress progress(context_.out, "load", programmer.info.size[0]);
  progress.Describe(programmer.file);
  progress_ = &progress;
  done_before_ = 0;
  session_.Begin();
  std::uint32_t result = 0;
  const bool loaded =
      KRAL_KOVA_LoadFlashProgrammer(session_.handle(), programmer.file.c_str(), maximum_packet, &result) != 0;
  progress_ = nullptr;
  if (loaded) return;
  const auto record = LastError(session_.handle());
  if (result == KRAL_DOWNLOAD_ABORTED) throw InterruptedError();
  if (record && record->code == KRAL_ERROR_BAD_FILE) throw ExplainRecord(*record, {}, session_.port(), kLooksInto);
  throw session_.Explain(result == KRAL_KOVA_GO_FAILED ? "the start of the flash programmer"
                                                       : "loading the flash programmer");
}

void FlashTarget::SetSecurityMode(std::uint8_t mode) {
  session_.Run(Format("security mode {}", mode), [&] { return KRAL_STREAM_SECURITY_MODE(session_.handle(), mode); });
}

void FlashTarget::SendPartitionTable(const std::string& file, bool override_table) {
  session_.Begin();
  std::uint8_t status = 0;
  if (KRAL_STREAM_PARTITION_TABLE(session_.handle(), file.c_str(), override_table ? 1 : 0, &status) != 0) return;
  const auto record = LastError(session_.handle());
  if (record && record->code == KRAL_ERROR_BAD_FILE) {
    throw ExplainRecord(*record, {}, session_.port(), "the file must be readable and have at most 512 bytes");
  }
  if (status == 0) throw session_.Explain("the partition table");
  static constexpr std::array kHints{"--override replaces the table, and with it what the partitions hold",
                                     "check that the file is a table for this handset",
                                     "the flash could not be erased"};
  throw ExplainRecord(record, Format("the partition table {}", file), session_.port(),
                      status <= kHints.size() ? kHints[status - 1u] : "see the documentation of the flash programmer");
}

void FlashTarget::Write(const FlashImage& image, const WriteOptions& options, const ProgrammerLimits& limits,
                        std::uint64_t done_before, Progress& progress) {
  progress.Describe(image.file);
  progress_ = &progress;
  done_before_ = done_before;
  session_.Begin();
  const auto block_size = options.block_size == 0 ? limits.block_size : std::min(options.block_size, limits.block_size);
  std::uint32_t result = 0;
  const bool written = KRAL_STREAM_WriteImageFile(session_.handle(), image.file.c_str(), options.format,
                                                  image.type.value_or(options.type),
                                                  options.header.empty() ? nullptr : options.header.c_str(),
                                                  options.nor ? KRAL_STREAM_NOR : KRAL_STREAM_MULTI_IMAGE, block_size,
                                                  limits.window, &result) != 0;
  progress_ = nullptr;
  if (!written) throw ExplainWrite(session_, image.file, result);
}

ToolError InDiagnosticMode(std::uint16_t port) {
  return {ExitCode::kRefused, Format("the handset on {} is in diagnostic mode", DescribePort(port)),
          "load a flash programmer first: kral flash load FILE"};
}

ToolError ExplainWrite(const Session& session, const std::string& file, std::uint32_t result) {
  const auto record = LastError(session.handle());
  if (result == KRAL_DOWNLOAD_ABORTED) return InterruptedError();
  return ExplainRecord(record, Format("writing {}", file), session.port(),
                       HintOfWrite(result, record ? record->code : KRAL_ERROR_INTERNAL));
}

}  // namespace kral::tool
