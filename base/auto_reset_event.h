// An event that one waiter takes: it is reset by the wait that it ends.
#ifndef KRAL_BASE_AUTO_RESET_EVENT_H
#define KRAL_BASE_AUTO_RESET_EVENT_H

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>

namespace kral {

class AutoResetEvent {
 public:
  void Set() {
    const std::lock_guard lock(mutex_);
    set_ = true;
    changed_.notify_one();
  }

  bool WaitFor(uint32_t milliseconds) {
    std::unique_lock lock(mutex_);
    if (!changed_.wait_for(lock, std::chrono::milliseconds(milliseconds), [this] { return set_; })) return false;
    set_ = false;
    return true;
  }

 private:
  std::mutex mutex_;
  std::condition_variable changed_;
  bool set_ = false;
};

}  // namespace kral

#endif
