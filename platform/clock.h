// Time as the library sees it: a millisecond tick and a sleep, behind an interface so that tests can fake both.
#ifndef KRAL_PLATFORM_CLOCK_H
#define KRAL_PLATFORM_CLOCK_H

#include <cstdint>

namespace kral {

class Clock {
 public:
  virtual ~Clock() = default;

  // Milliseconds since an arbitrary start, modulo 2^32; never steps back.
  virtual uint32_t TickMs() = 0;
  virtual void SleepMs(uint32_t milliseconds) = 0;
};

// The machine's clock. Its sleeps and every timed wait are good to about 1 ms while a FineTimer lives.
Clock& SystemClock();

// Held while a connection is open. Windows rounds sleeps and waits up to its timer tick (15.6 ms by default), which
// this raises to 1 ms for as long as somebody holds one; Linux needs nothing.
class FineTimer {
 public:
  FineTimer();
  ~FineTimer();
  FineTimer(const FineTimer&) = delete;
  FineTimer& operator=(const FineTimer&) = delete;
};

}  // namespace kral

#endif
