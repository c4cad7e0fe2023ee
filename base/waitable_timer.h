// The deadline of one write.
#ifndef KRAL_BASE_WAITABLE_TIMER_H
#define KRAL_BASE_WAITABLE_TIMER_H

#include <chrono>
#include <cstdint>

namespace kral {

class CWaitableTimer {
 public:
  using Time = std::chrono::steady_clock::time_point;

  void Arm(uint32_t milliseconds) {
    deadline_ = std::chrono::steady_clock::now() + std::chrono::milliseconds(milliseconds);
  }
  bool expired() const { return std::chrono::steady_clock::now() >= deadline_; }
  Time deadline() const { return deadline_; }

 private:
  Time deadline_{};
};

}  // namespace kral

#endif
