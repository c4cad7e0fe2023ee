// The machine's clock on Windows, and the timer resolution that makes a sleep of 1 ms take 1 ms.
#include "platform/clock.h"

#include <windows.h>

#include <mmsystem.h>

#include <chrono>

namespace kral {
namespace {

class MonotonicClock final : public Clock {
 public:
  // From the performance counter: GetTickCount steps by 10 to 16 ms.
  uint32_t TickMs() override {
    const auto now = std::chrono::steady_clock::now().time_since_epoch();
    return static_cast<uint32_t>(std::chrono::duration_cast<std::chrono::milliseconds>(now).count());
  }

  void SleepMs(uint32_t milliseconds) override { ::Sleep(milliseconds); }
};

}  // namespace

// Never destroyed: a process may exit while threads of its connections still look at it.
Clock& SystemClock() {
  static Clock& clock = *new MonotonicClock;
  return clock;
}

// The system counts the requests of a process, so every holder asks and gives back for itself.
FineTimer::FineTimer() {
  ::timeBeginPeriod(1);
}
FineTimer::~FineTimer() {
  ::timeEndPeriod(1);
}

}  // namespace kral
