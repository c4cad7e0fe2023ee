// What came in over one connection, and what was lost of it.
#ifndef KRAL_TRANSPORT_ENGINE_TRAFFIC_COUNTERS_H
#define KRAL_TRANSPORT_ENGINE_TRAFFIC_COUNTERS_H

#include <cstdint>

namespace kral {

struct TrafficCounters {
  uint64_t bytes_received = 0;    // from the port
  uint64_t packets_received = 0;  // handed to the dispatcher
  uint64_t collected = 0;         // put into the asynchronous queue
  uint64_t events = 0;            // put into the event queue
  // The oldest of a full queue, taken out of it before anybody read them; and what there was no memory for.
  uint64_t dropped_asynchronous = 0;
  uint64_t dropped_events = 0;
  uint64_t dropped_responses = 0;
  uint64_t dropped_not_collecting = 0;  // asynchronous packets while collection was off
  uint64_t bad_fcs = 0;
  uint64_t oversized = 0;     // in the de-framer, and packets of a size that the sorter does not take
  uint64_t waiting = 0;       // handed to the dispatcher, and not yet through callbacks and queues
  uint64_t most_waiting = 0;  // the greatest that was
};

}  // namespace kral

#endif
