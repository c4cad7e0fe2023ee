// Has the library look at the ports, and puts what it says into words.
#include "tools/kral/port_report.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <thread>

#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

constexpr std::size_t kMostAsked = 40;  // the library keeps 50 connections

constexpr std::array<const char*, 6> kAnswers{"not asked", "nothing",          "diagnostics",
                                              "loader",    "flash programmer", "boot loader"};
static_assert(kAnswers.size() == KRAL_ANSWERS_BOOT_LOADER + 1);

std::string AnswersText(const KRAL_PORT_INFO& info) {
  return info.answers < kAnswers.size() ? kAnswers[info.answers] : "something unknown";
}

// As a word of JSON.
const char* StateWord(const PortReport& report) {
  switch (report.info.state) {
    case KRAL_PORT_NOT_FOUND:
      return "missing";
    case KRAL_PORT_BUSY:
      return "in-use";
    case KRAL_PORT_NOT_PERMITTED:
      return "not-permitted";
    case KRAL_PORT_FAILED:
    case KRAL_PORT_GONE:
      return "failed";
    default:
      break;
  }
  if (!report.asked || report.info.answers == KRAL_ANSWERS_NOT_ASKED) return "free";
  return report.has_handset() ? "handset" : "silent";
}

}  // namespace

void InParallel(std::size_t count, const std::function<void(std::size_t number)>& work) {
  std::atomic<std::size_t> next{0};
  std::vector<std::jthread> threads;
  for (std::size_t i = 0; i < std::min(count, kMostAsked); ++i) {
    threads.emplace_back([&] {
      for (auto number = next++; number < count && !Interrupted(); number = next++) work(number);
    });
  }
}

std::vector<PortReport> ReportPorts(const std::vector<std::uint16_t>& ports, bool ask) {
  std::vector<PortReport> reports(ports.size());
  const auto report = [&](std::size_t number) {
    reports[number].port = ports[number];
    reports[number].asked = ask;
    KRAL_GetPortInfo(ports[number], ask ? 1 : 0, &reports[number].info);
  };
  if (ask) {
    InParallel(ports.size(), report);
  } else {
    for (std::size_t number = 0; number < ports.size(); ++number) report(number);
  }
  ThrowIfInterrupted();
  return reports;
}

std::string HolderText(const KRAL_PORT_INFO& info) {
  if (info.process == 0) return {};
  return info.process_name[0] == '\0' ? Format("process {}", info.process)
                                      : Format("{} (process {})", NameText(info.process_name), info.process);
}

std::string StateText(const PortReport& report) {
  const std::string_view word = StateWord(report);
  if (word == "free") return {};
  if (word == "handset") return Format("handset ({})", AnswersText(report.info));
  if (word == "not-permitted") return "not permitted";
  if (word == "failed") return "cannot be opened";
  if (word != "in-use") return std::string(word);
  const auto holder = HolderText(report.info);
  return holder.empty() ? "in use" : Format("in use by {}", holder);
}

std::string UsbText(const KRAL_PORT_INFO& info) {
  if (info.usb_path[0] == '\0') return NameText(info.description);
  std::string text = Format("usb:{}:{}  {:04X}:{:04X}", info.usb_path, info.usb_interface, info.vendor, info.product);
  if (info.serial[0] != '\0') text += Format(" {}", info.serial);
  if (info.description[0] != '\0') text += Format("  {}", info.description);
  return NameText(text);
}

Json PortJson(const PortReport& report) {
  const auto& info = report.info;
  Json row{{"port", report.port}, {"device", info.device}, {"state", StateWord(report)}};
  if (report.asked) {
    row["handset"] = report.has_handset();
    if (info.answers != KRAL_ANSWERS_NOT_ASKED) row["answers"] = AnswersText(info);
  }
  if (info.description[0] != '\0') row["description"] = info.description;
  if (info.usb_path[0] != '\0') {
    row["usb"] = {{"path", info.usb_path},
                  {"interface", info.usb_interface},
                  {"vendor", Format("{:04X}", info.vendor)},
                  {"product", Format("{:04X}", info.product)},
                  {"serial", info.serial}};
  }
  if (info.process != 0) row["process"] = {{"id", info.process}, {"name", info.process_name}};
  return row;
}

}  // namespace kral::tool
