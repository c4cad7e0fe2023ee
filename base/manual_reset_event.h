// An event that stays set until it is reset, with a label for whoever looks at it in a debugger. It belongs to one
// connection: two connections' events may share a label and are still never taken for one another.
#ifndef KRAL_BASE_MANUAL_RESET_EVENT_H
#define KRAL_BASE_MANUAL_RESET_EVENT_H

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace kral {

class ManualResetEvent {
 public:
  explicit ManualResetEvent(const char* label) : label_(label) {}

  const char* label() const { return label_; }

  // Notified under the lock: whoever waited may destroy the event as soon as the wait is over.
  void Set() {
    const std::lock_guard lock(mutex_);
    set_ = true;
    changed_.notify_all();
  }

  void Reset() {
    const std::lock_guard lock(mutex_);
    set_ = false;
  }

  bool WaitFor(uint32_t milliseconds) {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, std::chrono::milliseconds(milliseconds), [this] { return set_; });
  }

 private:
  const char* const label_;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool set_ = false;
};

}  // namespace kral

#endif
