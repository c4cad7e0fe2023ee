// The events of a report packet, for verbs that show payloads: a record of the event queue does not tell how many bytes
// of the forms without a length are there, the report's headers do.
#ifndef KRAL_TOOLS_TRAFFIC_EVENT_REPORT_H
#define KRAL_TOOLS_TRAFFIC_EVENT_REPORT_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

namespace kral::tool {

inline constexpr std::uint8_t kEventReport = 96;  // the code of its packets

struct ReportedEvent {
  std::uint16_t id = 0;
  std::span<const std::uint8_t> time_stamp;  // 8 bytes, or 2 of a truncated one; inside the packet, as is the payload
  std::span<const std::uint8_t> payload;
};

class EventReport {
 public:
  // A packet with its two FCS bytes; one that is no report holds no events.
  explicit EventReport(std::span<const std::uint8_t> packet);

  // Nothing at the end, and from the first event on that does not fit into the report.
  std::optional<ReportedEvent> Next();

 private:
  std::optional<std::span<const std::uint8_t>> Take(std::size_t count);

  std::span<const std::uint8_t> rest_;
};

}  // namespace kral::tool

#endif
