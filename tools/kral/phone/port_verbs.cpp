// kral ports: which serial ports there are, what is plugged into them, and who has them or answers there. Which slots
// of a fixture they are.
#include <map>
#include <memory>
#include <optional>
#include <string>

#include "tools/kral/format.h"
#include "tools/kral/port_names.h"
#include "tools/kral/port_report.h"
#include "tools/kral/safe_text.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct PortOptions {
  bool probe = false;
  std::optional<std::uint16_t> slot;
  std::string name;
  bool remove = false;
};

void ShowPorts(const Context& context, bool probe) {
  const auto reports = ReportPorts(ListPorts(), probe);
  Json list = Json::array();
  std::string text;
  for (const auto& report : reports) {
    list.push_back(PortJson(report));
    text += DescribePort(report.port);
    for (const auto& part : {StateText(report), UsbText(report.info)}) {
      if (!part.empty()) text += "  " + part;
    }
    text += "\n";
  }
  if (reports.empty()) context.out.Note("this machine has no serial port");
  context.out.Result({{"ports", list}}, text);
}

void ShowSlots(const Context& context, const std::map<std::uint16_t, std::string>& slots) {
  Json list = Json::array();
  std::string text;
  for (const auto& [slot, name] : slots) {
    list.push_back({{"slot", slot}, {"name", name}});
    text += Format("slot:{}  {}\n", slot, NameText(name));
  }
  if (slots.empty()) context.out.Note(Format("no slot is assigned in {}", SlotFile()));
  context.out.Result({{"slots", list}, {"file", SlotFile()}}, text);
}

void Change(std::map<std::uint16_t, std::string>& slots, const PortOptions& options) {
  if (slots.erase(*options.slot) == 0 && options.remove) {
    throw ToolError(ExitCode::kUsage, Format("slot {} is not assigned", *options.slot),
                    "kral ports assign lists those that are");
  }
  if (options.remove) return;
  const auto wanted = PortName(options.name);
  for (const auto& [slot, name] : slots) {
    if (name == wanted) {
      throw ToolError(ExitCode::kUsage, Format("{} is slot {} already", name, slot),
                      Format("kral ports assign {} --remove takes it away from there", slot));
    }
  }
  slots[*options.slot] = wanted;
}

void Assign(const Context& context, const PortOptions& options) {
  if (options.slot || options.remove) {
    if (options.name.empty() != options.remove || !options.slot) {
      throw ToolError(ExitCode::kUsage, "a slot is assigned to a port, or removed",
                      "kral ports assign 3 usb:1-4.2, or kral ports assign 3 --remove");
    }
    ChangeSlots([&](auto& slots) { Change(slots, options); });
  }
  ShowSlots(context, ReadSlots());
}

}  // namespace

void AddPortVerbs(const Command& root, Context& context) {
  constexpr double kLastSlot = 999;
  const auto options = std::make_shared<PortOptions>();
  const auto ports = root.Verb("ports", "List the serial ports without opening them");
  ports.Flag("--probe", options->probe, "Open each port that is free and find out who answers");
  ports.NeedsNoHandset();
  ports.Run([&context, options] { ShowPorts(context, options->probe); });

  const auto assign = ports.Verb("assign", "Tell which port a slot of the fixture is, for -p slot:N; alone: list them");
  assign.NeedsNoHandset();
  assign.Add("slot", options->slot, "Number of the slot").Between(1, kLastSlot);
  assign.Add("name", options->name, "Its port: usb:1-4.2, esn:80C0FFEE, /dev/ttyUSB0, 7");
  assign.Flag("--remove", options->remove, "Forget the slot");
  assign.Run([&context, options] { Assign(context, *options); });
}

}  // namespace kral::tool
