// kral ports: which serial ports there are, and on which a handset answers.
#include <algorithm>
#include <memory>

#include "platform/port_list.h"
#include "tools/kral/format.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

void ShowPorts(const Context& context, bool probe) {
  const auto ports = ListPorts();
  const auto answering = probe ? ListPortsWithHandset() : std::vector<std::uint16_t>{};
  Json list = Json::array();
  std::string text;
  for (const auto port : ports) {
    const bool answers = std::ranges::find(answering, port) != answering.end();
    Json row{{"port", port}, {"device", ComPortDevice(port)}};
    if (probe) row["handset"] = answers;
    list.push_back(row);
    text += Format("{}{}\n", DescribePort(port), answers ? "  handset" : "");
  }
  if (ports.empty()) context.out.Note("this machine has no serial port");
  context.out.Result({{"ports", list}}, text);
}

}  // namespace

void AddPortVerbs(const Command& root, Context& context) {
  const auto probe = std::make_shared<bool>(false);
  const auto ports = root.Verb("ports", "List the serial ports without opening them");
  ports.Flag("--probe", *probe, "Open each port that is free and ask whether a handset answers");
  ports.Run([&context, probe] { ShowPorts(context, *probe); });
}

}  // namespace kral::tool
