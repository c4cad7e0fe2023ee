// A clock that stands still until it is told to move; sleeping moves it.
#ifndef KRAL_TESTS_SUPPORT_FAKE_CLOCK_H
#define KRAL_TESTS_SUPPORT_FAKE_CLOCK_H

#include <atomic>
#include <cstdint>

#include "platform/clock.h"

namespace kral::test {

class FakeClock : public Clock {
 public:
  uint32_t TickMs() override { return now_; }
  void SleepMs(uint32_t milliseconds) override { Advance(milliseconds); }
  void Advance(uint32_t milliseconds) { now_ += milliseconds; }

 private:
  std::atomic<uint32_t> now_{1000};
};

}  // namespace kral::test

#endif
