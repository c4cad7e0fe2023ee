// Drives the boot transfer of the library, and finds in its log why a transfer failed.
#include "tools/kral/boot_target.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>

#include "platform/clock.h"
#include "tools/kral/error_lines.h"
#include "tools/kral/interrupt.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLookAroundMs = 100;
constexpr std::string_view kGone = "the device has gone";
constexpr std::string_view kStatus = "Kivrat: image transfer status ";

struct Reason {
  std::string_view line;  // part of the library's line
  ExitCode code;
  std::string_view text;  // what happened on the port
  std::string_view hint;
};

// The first that is in the log explains the failure.
constexpr std::array<Reason, 9> kReasons{{
    {kGone, ExitCode::kLost, "the handset went away", "check the cable, power the handset off and on and begin again"},
    {"is not a HELLO_REQ", ExitCode::kLink, "something other than a boot loader answers",
     "check the port: the handset may be running its software, from which --enter leads into the boot loader"},
    {"cannot be opened", ExitCode::kBadFile, "the file of the flash programmer cannot be read",
     "check its name and permissions, power the handset off and on and begin again"},
    {"Kivrat: the file has no more", ExitCode::kBadFile,
     "the flash programmer ends before the boot loader has all of it",
     "check that the file is whole and meant for this handset; power the handset off and on and begin again"},
    {"Failed to send", ExitCode::kLink, "a packet could not be written", "check the cable and begin again"},
    {"Failed to write", ExitCode::kLink, "a packet could not be written", "check the cable and begin again"},
    // In front of the lines that follow it in the log.
    {"Kivrat: a ", ExitCode::kLink, "the boot loader sent a packet that makes no sense",
     "power the handset off and on and begin again; --log FILE shows the packets"},
    {"Failed to re", ExitCode::kNoAnswer, "no boot loader answers in time",
     "power the handset off and on: its hello comes once, and is lost when another program reads it"},
    {"Recieved ", ExitCode::kLink, "the boot loader answered with something else",
     "power the handset off and on and begin again; --log FILE shows the packets"},
}};

}  // namespace

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
    std::uint32_t chip = 0;
    if (KRAL_Kivrat_Connect(session_.handle(), &identity.version, ask_identity ? &chip : nullptr) == 0) return false;
    if (FindErrorLine("BXC ID read from PBL")) identity.chip = chip;
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
  const auto status = FindErrorLine(kStatus);
  if (status && !status->ends_with(" 0")) {
    throw ToolError(ExitCode::kRefused,
                    fmt::format("the boot loader on {} refused {}: status {}", DescribePort(session_.port()),
                                programmer, status->substr(kStatus.size())),
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
      throw ToolError(
          ExitCode::kNoAnswer,
          fmt::format("{} was transferred but does not answer on {}", programmer, DescribePort(session_.port())),
          "check that the programmer is meant for this handset");
    }
    if (failed < images.size()) throw ExplainWrite(session_.port(), images[failed].file, result);
    throw ToolError(ExitCode::kBadFile, fmt::format("{} is missing, empty or unreadable", programmer),
                    "check its name and permissions");
  });
}

void BootTarget::Reset() {
  session_.Run("the reset", [this] { return KRAL_KOVA_RESET(session_.handle()); });
}

void BootTarget::AwaitPort(const std::function<bool()>& attempt) {
  Clock& clock = SystemClock();
  const std::uint32_t start = clock.TickMs();
  for (;;) {
    session_.Begin();
    if (attempt()) return;
    if (Interrupted()) throw InterruptedError();
    if (!IsPortMissing() || clock.TickMs() - start >= options_.wait_s * 1000) throw Explain();
    clock.SleepMs(kLookAroundMs);
  }
}

bool BootTarget::IsPortMissing() const {
  if (FindErrorLine(kGone)) return true;
  std::int32_t state = KRAL_PORT_CLOSED;
  KRAL_GetPortState(session_.handle(), &state);
  return FindErrorLine("Failed KivratInit()") && state != KRAL_PORT_BUSY && state != KRAL_PORT_NOT_PERMITTED;
}

ToolError BootTarget::Explain() const {
  if (Interrupted()) return InterruptedError();
  if (const auto trouble = session_.PortTrouble()) return *trouble;
  for (const auto& reason : kReasons) {
    if (!FindErrorLine(reason.line)) continue;
    return {reason.code, fmt::format("{} on {}", reason.text, DescribePort(session_.port())), std::string(reason.hint)};
  }
  return {ExitCode::kLink, fmt::format("the boot transfer on {} failed", DescribePort(session_.port())),
          "--log FILE shows the packets"};
}

}  // namespace kral::tool
