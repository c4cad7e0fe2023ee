// Reads the events out of an event report: first byte 96, the length of what follows (u16), then events back to back.
// Each begins with a header word: bits 0..11 event id, 13..14 payload form, 15 truncated time stamp.
#ifndef KRAL_TRANSPORT_COLLECTION_EVENT_REPORT_H
#define KRAL_TRANSPORT_COLLECTION_EVENT_REPORT_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

#include "base/wire_codes.h"
#include "transport/collection/event_record.h"

namespace kral {

inline constexpr size_t kSmallestEvent = 4;  // header and truncated time stamp

struct Event {
  uint16_t id = 0;
  std::span<const uint8_t> payload;  // inside the report; also what the record's payload length does not tell
  EventRecord record;
};

class EventReportReader {
 public:
  // A packet as de-framed, its two FCS bytes at the end.
  explicit EventReportReader(std::span<const uint8_t> packet);

  // The next event; nothing at the end, and nothing from the first event on that does not fit into the report.
  std::optional<Event> Next();

 private:
  std::optional<std::span<const uint8_t>> Take(size_t count);
  std::optional<size_t> PayloadSize(unsigned form);

  std::span<const uint8_t> rest_;
};

}  // namespace kral

#endif
