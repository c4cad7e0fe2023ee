// What came in over one connection, and what was lost of it.
#ifndef KRAL_TRANSPORT_TRAFFIC_COUNTERS_H
#define KRAL_TRANSPORT_TRAFFIC_COUNTERS_H

#include <cstdint>

namespace kral {

struct TrafficCounters {
  uint64_t bytes_received = 0;      // from the port
  uint64_t packets_received = 0;    // handed to the dispatcher
  uint64_t dropped_queue_full = 0;  // response and asynchronous queue
  uint64_t dropped_events_queue_full = 0;
  uint64_t dropped_not_collecting = 0;  // asynchronous packets while collection was off
  uint64_t bad_fcs = 0;
  uint64_t oversized = 0;  // in the de-framer, and packets of a size that the sorter does not take
};

}  // namespace kral

#endif
