// What is known of ports, in words and as JSON.
#ifndef KRAL_TOOLS_PORT_REPORT_H
#define KRAL_TOOLS_PORT_REPORT_H

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "kral/kral.h"
#include "tools/kral/json.h"

namespace kral::tool {

struct PortReport {
  std::uint16_t port = 0;
  bool asked = false;
  KRAL_PORT_INFO info{};

  // Who answers there, whoever it is.
  bool has_handset() const { return info.answers > KRAL_ANSWERS_NOTHING; }
};

// Asks all of them at once.
std::vector<PortReport> ReportPorts(const std::vector<std::uint16_t>& ports, bool ask);

// "handset (diagnostics)", "silent", "in use by prober (process 42)", "not permitted", ...; empty for a port that is
// free and was not asked.
std::string StateText(const PortReport& report);
std::string HolderText(const KRAL_PORT_INFO& info);  // "prober (process 42)"; empty when not known
Json PortJson(const PortReport& report);
// "usb:1-4.2  1D6B:00A2 80C0FFEE  Acme Handset"; empty for what is no USB device.
std::string UsbText(const KRAL_PORT_INFO& info);

// `work` for each of `count`, on a few threads.
void InParallel(std::size_t count, const std::function<void(std::size_t number)>& work);

}  // namespace kral::tool

#endif
