// kral sim: a virtual handset on a pseudo terminal, for as long as it is wanted.
#include <algorithm>
#include <cctype>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "handset/log_generator.h"
#include "handset/pty_cable.h"
#include "handset/virtual_handset.h"
#include "platform/clock.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/sim/sim_faults.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kWatchIntervalMs = 20;
constexpr std::size_t kServiceCodeSize = 6;

struct SimOptions {
  handset::Identity identity;
  std::optional<std::uint16_t> switches;
  std::uint32_t switching_delay_ms = 0;
  std::uint32_t reset_time_ms = 0;
  std::uint32_t back_after_ms = 0;  // 0: a handset that hung up stays away
  std::uint32_t efs_blocks = 0;     // 0: as many as there are
  std::optional<std::uint32_t> efs_bad_offset;
  std::vector<std::pair<std::string, std::string>> efs_shown_names;
  std::uint32_t flash_block = 0;  // 0: as the programmer has it
  std::uint16_t flash_window = 0;
  std::vector<std::string> faults;
  double bit_errors = 0;
  handset::LogTraffic traffic;
  std::uint64_t seed = 1;
  std::string link;
  bool boot_loader = false;
  std::string loader = "kova";
  std::optional<std::uint32_t> chip_identity;
};

void Prepare(handset::VirtualHandset& handset, const SimOptions& options) {
  if (options.switches) handset.maintenance().SetSwitches(*options.switches);
  handset.mode().SetSwitchingDelay(options.switching_delay_ms);
  handset.mode().SetResetTime(options.reset_time_ms);
  if (options.efs_blocks != 0) handset.efs().SetTotalBlocks(options.efs_blocks);
  if (options.efs_bad_offset) handset.efs().SetBadOffset(*options.efs_bad_offset);
  for (const auto& [name, shown] : options.efs_shown_names) handset.efs().ShowNameAs(name, shown);
  auto programmer = handset.programmer().settings();
  if (options.flash_block != 0) programmer.block_size = options.flash_block;
  if (options.flash_window != 0) programmer.window = options.flash_window;
  handset.programmer().Set(programmer);
  handset.programmer().KeepPackets(false);
  handset.loader().KeepPackets(false);
  handset.faults().SetSeed(options.seed);
  handset.faults().SetBitErrorRate(options.bit_errors);
  for (const auto& fault : options.faults) AddFault(handset.faults(), fault);
  const auto& boot_loader = handset.boot_loader();
  if (options.chip_identity) boot_loader->Set({.chip_identity = *options.chip_identity});
  if (options.loader == "boot") handset.mode().SetLoader(std::make_shared<handset::Reappearance>(boot_loader));
  if (options.boot_loader) {
    handset.SetStartMode(boot_loader);
    handset.Restart();
  }
  handset.KeepTrace(false);  // nobody asks for it, and it would grow without end
}

// Until Ctrl-C; what hung up is plugged in again when that was asked for.
void Serve(handset::VirtualHandset& handset, const SimOptions& options) {
  Clock& clock = SystemClock();
  bool away = false;
  std::uint32_t since = 0;
  while (!Interrupted()) {
    clock.SleepMs(kWatchIntervalMs);
    if (!handset.vanished()) {
      away = false;
    } else if (!away) {
      away = true;
      since = clock.TickMs();
    } else if (options.back_after_ms != 0 && clock.TickMs() - since >= options.back_after_ms) {
      handset.PlugIn();
    }
  }
}

void Simulate(const Context& context, const SimOptions& options) {
  handset::VirtualHandset handset(options.identity);
  Prepare(handset, options);
  std::string error;
  const auto cable = handset::PtyCable::Attach(handset, options.link, error);
  if (!cable) {
    throw ToolError(ExitCode::kUsage, Format("the handset cannot be put on a pseudo terminal: {}", error),
                    "kral sim needs Linux, and a --link that can be made");
  }
  std::optional<handset::LiveTraffic> traffic;
  if (options.traffic.logs + options.traffic.reports + options.traffic.messages > 0) {
    traffic.emplace(handset, options.traffic);
  }
  context.out.Result({{"device", cable->device_path()}}, cable->device_path() + "\n");
  Serve(handset, options);
}

bool IsServiceCode(const std::string& text) {
  return text.size() == kServiceCodeSize &&
         std::ranges::all_of(text, [](unsigned char character) { return std::isdigit(character) != 0; });
}

void AddOptions(const Command& sim, SimOptions& options) {
  auto& identity = options.identity;
  sim.Add("--esn", identity.serial_number, "Electronic serial number").ShowDefault();
  sim.Add("--model", identity.model, "Model text of the build identity").ShowDefault();
  sim.Add("--software", identity.software_revision, "Software revision text").ShowDefault();
  sim.Add("--hardware", identity.hardware_version, "Hardware version").ShowDefault();
  sim.Add("--directory", identity.version_directory, "Version directory, 8 characters").ShowDefault();
  sim.Add("--spc", identity.service_code, "Service programming code, six digits")
      .ShowDefault()
      .Check([](const std::string& text) { return IsServiceCode(text) ? "" : "six digits are needed"; });
  sim.Add("--switches", options.switches, "Switch word");
  sim.Add("--switching-delay", options.switching_delay_ms, "Milliseconds until a new mode is reported");
  sim.Add("--reset-time", options.reset_time_ms, "Milliseconds of silence after a reset");
  sim.Add("--efs-blocks", options.efs_blocks, "Size of the file system in blocks of 512 bytes");
  sim.Add("--efs-bad-offset", options.efs_bad_offset, "Files that are written keep a wrong byte at this offset");
  sim.Add("--efs-show", options.efs_shown_names, "NAME SHOWN: listings show one name as another; several times");
  constexpr double kMostPerSecond = 1e6;
  sim.Add("--logs", options.traffic.logs, "Log packets per second, of the codes that are on")
      .Between(0, kMostPerSecond, "a second");
  sim.Add("--events", options.traffic.reports, "Event reports per second, of the events that are on")
      .Between(0, kMostPerSecond, "a second");
  sim.Add("--messages", options.traffic.messages, "Messages per second, of the categories that are on")
      .Between(0, kMostPerSecond, "a second");
  sim.Add("--log-size", options.traffic.log_size, "Bytes of a log packet").Between(16, 4090, "bytes");
  sim.Add("--burst", options.traffic.burst, "Packets that come at once; the rate stays").Between(1, 4096);
  sim.Add("--flash-block", options.flash_block, "Largest block that the flash programmer announces");
  sim.Add("--flash-window", options.flash_window, "Window that the flash programmer announces");
  sim.Add("--fault", options.faults, "Misbehaviour, see below; may be given several times").OneEach();
  sim.Add("--bit-errors", options.bit_errors, "Probability of an error per bit sent").Between(0., 1.);
  sim.Add("--seed", options.seed, "Of everything random").ShowDefault();
  sim.Add("--back-after", options.back_after_ms, "Milliseconds after which a handset that hung up is back");
  sim.Flag("--boot-loader", options.boot_loader, "Start in the primary boot loader, as without any software");
  sim.Add("--loader", options.loader,
          "What the download request leads to: the KOVA loader, or the boot loader, "
          "for which the handset leaves its port and comes back")
      .OneOf({"kova", "boot"})
      .ShowDefault();
  sim.Add("--chip-id", options.chip_identity, "Chip identity that the boot loader tells");
  sim.Add("--link", options.link, "Keep a symbolic link of this name to the device");
}

}  // namespace

void AddSimVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<SimOptions>();
  const auto sim = root.Verb("sim", "Simulate a handset; its device is the first line of the output");
  AddOptions(sim, *options);
  sim.Explain(DescribeFaults);
  sim.Run([&context, options] { Simulate(context, *options); });
}

}  // namespace kral::tool
