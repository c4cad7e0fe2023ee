// Sets simulated handsets up and connects them.
#include "tools/kral/sim/sim_fixture.h"

#include <charconv>
#include <stdexcept>

#include "handset/caller_transport.h"
#include "kral/kral.h"
#include "platform/clock.h"
#include "platform/folder.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/numbers.h"
#include "tools/kral/sim/sim_faults.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kAnyPort = 1;

handset::Identity IdentityOf(std::uint16_t number, const SimOptions& options) {
  auto identity = options.identity;
  identity.serial_number += number - 1u;
  return identity;
}

// Through the library itself, in this process. The serial number stays the handset's own.
void RestorePkv(handset::VirtualHandset& handset, const std::string& file) {
  handset::CallerTransport transport(handset);
  const KRAL_HANDLE handle = KRAL_ConnectServer_UserDefinedTransport(
      kAnyPort, transport.handle_value(), transport.context(), &handset::CallerTransport::Send,
      &handset::CallerTransport::Receive, &handset::CallerTransport::Flush);
  const std::uint16_t own = handset::kSerialNumberItem;
  KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle, &own, 1);
  const bool restored = KRAL_RestoreNVFromPKV(handle, file.c_str(), nullptr) != 0;
  const auto record = LastError(handle);
  KRAL_DisconnectServer(handle);
  if (restored) return;
  throw ToolError(
      ExitCode::kBadFile,
      Format("{} cannot be restored to a simulated handset{}{}", file, record ? ": " : "", record ? record->text : ""),
      "kral sim --pkv takes a file of kral nv backup", record);
}

void AnswerCommands(handset::VirtualHandset& handset, const std::string& file) try {
  handset.LoadCommands(file);
} catch (const std::invalid_argument& error) {
  throw ToolError(ExitCode::kBadFile, Format("{} cannot be used: {}", file, error.what()),
                  "kral cmd list --defs says more of what is wrong with a file");
}

void SetUp(handset::VirtualHandset& handset, const SimOptions& options) {
  for (const auto& file : options.commands) AnswerCommands(handset, file);
  if (options.switches) handset.maintenance().SetSwitches(*options.switches);
  handset.mode().SetSwitchingDelay(options.switching_delay_ms);
  handset.mode().SetResetTime(options.reset_time_ms);
  if (options.efs_blocks != 0) handset.efs().SetTotalBlocks(options.efs_blocks);
  if (options.efs_bad_offset) handset.efs().SetBadOffset(*options.efs_bad_offset);
  for (const auto& [name, shown] : options.efs_shown_names) handset.efs().ShowNameAs(name, shown);
  for (const auto& text : options.arrays) {
    const auto array = ParseArray(text);
    handset.nv().MakeArray(array->first, array->second);
  }
  auto programmer = handset.programmer().settings();
  if (options.flash_block != 0) programmer.block_size = options.flash_block;
  if (options.flash_window != 0) programmer.window = options.flash_window;
  handset.programmer().Set(programmer);
  const auto& boot_loader = handset.boot_loader();
  if (options.chip_identity) boot_loader->Set({.chip_identity = *options.chip_identity});
  if (options.loader == "boot") handset.mode().SetLoader(std::make_shared<handset::Reappearance>(boot_loader));
  if (options.boot_loader) {
    handset.SetStartMode(boot_loader);
    handset.Restart();
  }
}

// "3:lose,of=08" of this handset, or of another one.
void AddFaultAt(handset::FaultPlan& faults, std::uint16_t number, std::uint16_t count, const std::string& words) {
  const auto colon = words.find(':');
  std::uint16_t which = 0;
  const auto* const end = words.data() + std::min(colon, words.size());
  const auto parsed = std::from_chars(words.data(), end, which);
  if (colon == std::string::npos || parsed.ec != std::errc() || parsed.ptr != end || which == 0 || which > count) {
    throw ToolError(ExitCode::kUsage, Format("--fault-at {}: it begins with a number from 1 to {}", words, count),
                    "for example --fault-at 1:lose,of=08");
  }
  if (which == number) AddFault(faults, words.substr(colon + 1));
}

void Misbehave(handset::FaultPlan& faults, std::uint16_t number, const SimOptions& options) {
  faults.SetSeed(options.seed + number - 1);
  faults.SetBitErrorRate(options.bit_errors);
  for (const auto& fault : options.faults) AddFault(faults, fault);
  for (const auto& fault : options.faults_at) AddFaultAt(faults, number, options.count, fault);
}

}  // namespace

std::optional<std::pair<std::uint16_t, std::uint8_t>> ParseArray(const std::string& text) {
  const auto colon = text.find(':');
  if (colon == std::string::npos) return std::nullopt;
  const auto item = ParseNumber<std::uint16_t>(std::string_view(text).substr(0, colon));
  const auto count = ParseNumber<std::uint8_t>(std::string_view(text).substr(colon + 1));
  if (!item || !count || *count == 0) return std::nullopt;
  return std::pair{*item, *count};
}

std::optional<std::uint32_t> ParseRate(const std::string& text) {
  std::uint32_t value = 0;
  const auto* const end = text.data() + text.size();
  const auto [rest, error] = std::from_chars(text.data(), end, value);
  const std::string unit(rest, end);
  const std::uint32_t factor = unit.empty() ? 1 : unit == "k" ? 1000 : unit == "M" ? 1000000 : 0;
  if (error != std::errc() || value == 0 || factor == 0 || value > UINT32_MAX / factor) return std::nullopt;
  return value * factor;
}

SimSocket::SimSocket(std::uint16_t number, const SimOptions& options)
    : number_(number), back_after_ms_(options.back_after_ms), handset_(IdentityOf(number, options)) {
  // Nobody asks for them, and they would grow without end.
  handset_.KeepTrace(false);
  handset_.programmer().KeepPackets(false);
  handset_.loader().KeepPackets(false);
  if (!options.pkv.empty()) RestorePkv(handset_, options.pkv);
  SetUp(handset_, options);
  Misbehave(handset_.faults(), number, options);
}

void SimSocket::Connect(const SimOptions& options) {
  const auto link = options.ports.empty() ? options.link : JoinPath(options.ports, Format("com{}", number_));
  std::string error;
  cable_ = handset::PtyCable::Attach(handset_, link, error, ParseRate(options.rate).value_or(0));
  if (!cable_) {
    throw ToolError(ExitCode::kUsage, Format("the handset cannot be put on a pseudo terminal: {}", error),
                    "kral sim needs Linux, and a --link, or folder of --ports, that can be made");
  }
  if (options.traffic.logs + options.traffic.reports + options.traffic.messages > 0) {
    traffic_.emplace(handset_, options.traffic);
  }
}

void SimSocket::Watch() {
  if (!handset_.vanished()) {
    away_ = false;
  } else if (!away_) {
    away_ = true;
    away_since_ = SystemClock().TickMs();
  } else if (back_after_ms_ != 0 && SystemClock().TickMs() - away_since_ >= back_after_ms_) {
    handset_.PlugIn();
  }
}

SimFixture::SimFixture(const SimOptions& options) {
  if (!options.link.empty() && (options.count > 1 || !options.ports.empty())) {
    throw ToolError(ExitCode::kUsage, "--link is for one handset",
                    "--ports DIR makes a link for each: com1, com2, ...");
  }
  for (std::uint16_t number = 1; number <= options.count; ++number) {
    ThrowIfInterrupted();
    sockets_.emplace_back(number, options);
  }
  if (!options.ports.empty()) MakeFolder(options.ports);
  for (auto& socket : sockets_) socket.Connect(options);
}

}  // namespace kral::tool
