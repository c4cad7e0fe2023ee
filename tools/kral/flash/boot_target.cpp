// Drives the boot transfer of the library, and says what to do about one that failed.
#include "tools/kral/flash/boot_target.h"

#include "platform/clock.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/result_lines.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLookAroundMs = 100;

bool IsListed(std::uint16_t port) {
  KRAL_PORT_INFO info{};
  return KRAL_GetPortInfo(port, 0, &info) != 0 && info.state != KRAL_PORT_NOT_FOUND;
}

}  // namespace

std::string BootHint(std::uint32_t code) {
  switch (code) {
    case KRAL_ERROR_NO_ANSWER:
      return "power the handset off and on: its hello comes once, and is lost when another program reads it";
    case KRAL_ERROR_LINK:
      return "power the handset off and on and begin again; one that runs its software is led into its boot loader by "
             "--enter";
    case KRAL_ERROR_LOST:
      return "check the cable, power the handset off and on and begin again";
    case KRAL_ERROR_BAD_FILE:
      return "check that the file is whole and meant for this handset; power the handset off and on and begin again";
    default:
      return {};
  }
}

BootTarget::BootTarget(const Context& context, const BootOptions& options)
    : context_(context),
      options_(options),
      session_(context.session, options.enter ? Expected::kAnswers : Expected::kInBootLoader),
      watch_(session_.handle()) {
  const KRAL_HANDLE handle = session_.handle();
  KRAL_Kivrat_Configure(handle, 0, 0, options.pre_done_delay_ms);
  KRAL_ConfigureDownloadCallBack(handle, &BootTarget::OnProgress, reinterpret_cast<std::uintptr_t>(this));
  if (options.enter) {
    session_.Run("the switch into download mode", [handle] { return KRAL_DIAG_DLOAD_F(handle); });
  }
}

BootTarget::~BootTarget() {
  KRAL_ConfigureDownloadCallBack(session_.handle(), nullptr, 0);
}

void KRAL_CALL BootTarget::OnProgress(KRAL_HANDLE, std::uint32_t done, std::uint32_t, std::uintptr_t value) {
  const auto& self = *reinterpret_cast<BootTarget*>(value);
  if (self.progress_ != nullptr) self.progress_->Update(done);
}

BootIdentity BootTarget::Connect(bool ask_identity) {
  BootIdentity identity;
  AwaitPort([&] {
    constexpr std::uint32_t kNone = 0;  // no chip has it
    std::uint32_t chip = kNone;
    if (KRAL_Kivrat_Connect(session_.handle(), &identity.version, ask_identity ? &chip : nullptr) == 0) return false;
    if (chip != kNone) identity.chip = chip;
    return true;
  });
  return identity;
}

void BootTarget::Load(const std::string& programmer) {
  Progress progress(context_.out, "load", 0);
  progress.Describe(programmer);
  progress_ = &progress;
  session_.Begin();
  const bool loaded = KRAL_Kivrat_DownloadFlashProgrammer(session_.handle(), programmer.c_str()) != 0;
  progress_ = nullptr;
  if (!loaded) throw Explain();
  // The protocol goes on whatever the target says; a person wants to know.
  const auto status = ResultLine(kTransferStatus, session_.handle());
  if (status && *status != "0") {
    throw ToolError(
        ExitCode::kRefused,
        Format("the boot loader on {} refused {}: status {}", DescribePort(session_.port()), programmer, *status),
        "check that the file is a flash programmer for this handset");
  }
}

void BootTarget::FlashAll(const std::string& programmer, const std::vector<FlashImage>& images) {
  std::vector<const char*> files;
  std::vector<std::uint8_t> types;
  for (const auto& image : images) {
    files.push_back(image.file.c_str());
    types.push_back(image.type.value_or(0));
  }
  std::uint32_t result = 0;
  std::uint32_t failed = KRAL_FLASH_NO_IMAGE;
  AwaitPort([&] {
    Progress progress(context_.out, "flash", 0);
    progress_ = &progress;
    const bool done = KRAL_Kivrat_FlashAll(session_.handle(), programmer.c_str(), files.data(), types.data(),
                                           static_cast<std::uint32_t>(files.size()), &result, &failed) != 0;
    progress_ = nullptr;
    if (done || result == KRAL_FLASH_CONNECT_FAILED) return done;
    if (result == KRAL_DOWNLOAD_ABORTED) throw InterruptedError();
    if (result == KRAL_FLASH_PROGRAMMER_FAILED) throw Explain();
    if (result == KRAL_FLASH_HELLO_FAILED) {
      throw ToolError(ExitCode::kNoAnswer,
                      Format("{} was transferred but does not answer on {}", programmer, DescribePort(session_.port())),
                      "check that the programmer is meant for this handset", LastError(session_.handle()));
    }
    if (failed < images.size()) throw ExplainWrite(session_, images[failed].file, result);
    throw Explain();
  });
}

void BootTarget::Reset() {
  session_.Run("the reset", [this] { return KRAL_KOVA_RESET(session_.handle()); });
}

void BootTarget::AwaitPort(const std::function<bool()>& attempt) {
  Clock& clock = SystemClock();
  const std::uint32_t start = clock.TickMs();
  const auto is_late = [&] { return clock.TickMs() - start >= options_.wait_s * 1000; };
  for (;;) {
    session_.Begin();
    if (attempt()) return;
    if (Interrupted()) throw InterruptedError();
    if (!IsPortMissing() || is_late()) throw Explain();
    // An attempt begins with its files.
    do {
      clock.SleepMs(kLookAroundMs);
    } while (!Interrupted() && !is_late() && !IsListed(session_.port()));
  }
}

// Also one that has gone and may come back.
bool BootTarget::IsPortMissing() const {
  const auto record = LastError(session_.handle());
  return record && (record->code == KRAL_ERROR_NO_PORT || record->code == KRAL_ERROR_LOST);
}

ToolError BootTarget::Explain() const {
  const auto record = LastError(session_.handle());
  if (Interrupted()) return InterruptedError();
  return ExplainRecord(record, "the boot transfer", session_.port(), record ? BootHint(record->code) : std::string());
}

}  // namespace kral::tool
