// A clock that moves only when it is told to, or when somebody sleeps by it.
#ifndef KRAL_TESTS_SUPPORT_FAKE_CLOCK_H
#define KRAL_TESTS_SUPPORT_FAKE_CLOCK_H

#include <atomic>
#include <cstdint>

#include "platform/clock.h"

namespace kral::test {

class FakeClock final : public Clock {
 public:
  // Begins shortly before the tick wraps around, so that code which cannot stand that fails.
  explicit FakeClock(uint32_t start = 0xFFFFFF00) : now_(start) {}

  uint32_t TickMs() override { return now_; }
  void SleepMs(uint32_t milliseconds) override {
    slept_ += milliseconds;
    now_ += milliseconds;
  }
  void Advance(uint32_t milliseconds) { now_ += milliseconds; }
  uint32_t slept() const { return slept_; }

 private:
  std::atomic<uint32_t> now_;
  std::atomic<uint32_t> slept_ = 0;
};

}  // namespace kral::test

namespace kral {

using test::FakeClock;

}  // namespace kral

#endif
