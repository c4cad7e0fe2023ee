// Events between threads. Each belongs to one connection: two connections' events may share a label and are still never
// taken for one another.
#ifndef KRAL_BASE_EVENT_H
#define KRAL_BASE_EVENT_H

#include <chrono>
#include <cstdint>

#include "base/mutex.h"

namespace kral {

template <bool kTakenByWait>
class ThreadEvent {
 public:
  explicit ThreadEvent(const char* label = "") : label_(label) {}

  // Notified under the lock: whoever waited may destroy the event as soon as the wait is over.
  void Set() {
    const MutexLock lock(mutex_);
    set_ = true;
    changed_.NotifyAll();
  }

  void Reset() {
    const MutexLock lock(mutex_);
    set_ = false;
  }

  bool WaitFor(uint32_t milliseconds) {
    MutexLock lock(mutex_);
    if (!changed_.WaitFor(lock, std::chrono::milliseconds(milliseconds),
                          [this]() KRAL_REQUIRES(mutex_) { return set_; }))
      return false;
    if (kTakenByWait) set_ = false;
    return true;
  }

 private:
  [[maybe_unused]] const char* const label_;  // for whoever looks at it in a debugger
  Mutex mutex_;
  Condition changed_;
  bool set_ KRAL_GUARDED_BY(mutex_) = false;
};

using ManualResetEvent = ThreadEvent<false>;  // stays set until it is reset
using AutoResetEvent = ThreadEvent<true>;     // one waiter takes it: the wait that it ends resets it

}  // namespace kral

#endif
