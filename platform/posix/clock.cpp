// The machine's clock on Linux.
#include "platform/clock.h"

#include <cerrno>
#include <chrono>
#include <ctime>

namespace kral {
namespace {

class MonotonicClock final : public Clock {
 public:
  uint32_t TickMs() override {
    const auto now = std::chrono::steady_clock::now().time_since_epoch();
    return static_cast<uint32_t>(std::chrono::duration_cast<std::chrono::milliseconds>(now).count());
  }

  void SleepMs(uint32_t milliseconds) override {
    timespec left{};
    left.tv_sec = static_cast<time_t>(milliseconds / 1000);
    left.tv_nsec = static_cast<long>(milliseconds % 1000) * 1'000'000L;
    while (::clock_nanosleep(CLOCK_MONOTONIC, 0, &left, &left) == EINTR) {
    }
  }
};

}  // namespace

// Never destroyed: a process may exit while threads of its connections still look at it.
Clock& SystemClock() {
  static Clock& clock = *new MonotonicClock;
  return clock;
}

FineTimer::FineTimer() = default;
FineTimer::~FineTimer() = default;

}  // namespace kral
