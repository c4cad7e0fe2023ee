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

// The machine's clock. On Windows SleepMs(1) really takes about 1 ms (the timer resolution is raised while in use).
Clock& SystemClock();

}  // namespace kral

#endif
