// kral sim: virtual handsets on pseudo terminals, for as long as they are wanted.
#include <algorithm>
#include <cctype>
#include <memory>
#include <string>

#include "platform/clock.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/sim/sim_faults.h"
#include "tools/kral/sim/sim_fixture.h"
#include "tools/kral/sim/sim_script.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kWatchIntervalMs = 20;
constexpr std::size_t kServiceCodeSize = 6;
constexpr std::uint16_t kMostHandsets = 255;

// Until Ctrl-C, or the end that the script makes.
void Serve(SimFixture& fixture, SimScript& script) {
  while (!Interrupted() && script.Run()) {
    SystemClock().SleepMs(kWatchIntervalMs);
    for (auto& socket : fixture.sockets()) socket.Watch();
  }
}

void Simulate(const Context& context, const SimOptions& options) {
  SimFixture fixture(options);
  SimScript script(context.out, fixture, options.script);
  Json rows = Json::array();
  std::string text;
  for (auto& socket : fixture.sockets()) {
    const auto serial = Format("{:08X}", socket.serial_number());
    rows.push_back({{"number", socket.number()}, {"device", socket.device()}, {"esn", serial}});
    text +=
        options.count == 1 ? socket.device() + "\n" : Format("{}  {}  {}\n", socket.number(), socket.device(), serial);
  }
  context.out.Result({{"device", fixture.sockets().front().device()}, {"handsets", rows}}, text);
  Serve(fixture, script);
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
  sim.Add("--count", options.count, "Handsets, each with a serial number of its own behind that of --esn")
      .Between(1, kMostHandsets)
      .ShowDefault();
  sim.Add("--ports", options.ports, "Keep links com1, com2, ... in this folder, for KRAL_PORT_DIR");
  sim.Add("--commands", options.commands, "Definition file, whose commands are answered (docs/commands.md)").OneEach();
  sim.Add("--pkv", options.pkv, "Items and files of each handset, from a backup");
  sim.Add("--rate", options.rate, "Bytes per second in each direction: 250k, 1M").Check([](const std::string& text) {
    return ParseRate(text) ? "" : "a rate is a number such as 250000, 250k or 1M";
  });
  sim.Add("--script", options.script, "Commands to carry out, see below; - reads them from the standard input");
  sim.Add("--switches", options.switches, "Switch word");
  sim.Add("--switching-delay", options.switching_delay_ms, "Milliseconds until a new mode is reported");
  sim.Add("--reset-time", options.reset_time_ms, "Milliseconds of silence after a reset");
  sim.Add("--efs-blocks", options.efs_blocks, "Size of the file system in blocks of 512 bytes");
  sim.Add("--efs-bad-offset", options.efs_bad_offset, "Files that are written keep a wrong byte at this offset");
  sim.Add("--efs-show", options.efs_shown_names, "NAME SHOWN: listings show one name as another; several times");
  sim.Add("--array", options.arrays, "ITEM:COUNT, as in 3101:4: an NV item that is an array of so many elements")
      .OneEach()
      .Check([](const std::string& text) {
        return ParseArray(text) ? "" : "an array is an item and the number of its elements, 1 to 255, such as 3101:4";
      });
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
  sim.Add("--fault-at", options.faults_at, "N:FAULT: the same of one handset").OneEach();
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
  const auto sim = root.Verb("sim", "Simulate a handset, or many; the first lines of the output are their devices");
  sim.NeedsNoHandset();
  AddOptions(sim, *options);
  sim.Explain([] { return DescribeFaults() + SimScript::Describe(); });
  sim.Run([&context, options] { Simulate(context, *options); });
}

}  // namespace kral::tool
