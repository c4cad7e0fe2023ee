// Requests to a receive thread. When they are made, and how long an answer is awaited, is the connection's affair.
#include "transport/engine/thread_control.h"

#include <chrono>

namespace kral {

void ThreadControl::Reset() {
  stop_requested_ = false;
  pause_wanted_ = 0;
  stop_event_.Reset();
  pause_event_.Reset();
}

void ThreadControl::RequestPause() {
  pause_event_.Reset();
  if (++last_pause_ == 0) ++last_pause_;
  pause_wanted_ = last_pause_;
  Notify();
}

void ThreadControl::ClearPause() {
  pause_wanted_ = 0;
  Notify();
}

void ThreadControl::RequestStop() {
  stop_event_.Reset();
  stop_requested_ = true;
  Notify();
}

void ThreadControl::Notify() {
  const MutexLock lock(mutex_);
  ++changes_;
  changed_.NotifyAll();
}

void ThreadControl::WaitForChange(uint32_t seen, uint32_t milliseconds) {
  MutexLock lock(mutex_);
  changed_.WaitFor(lock, std::chrono::milliseconds(milliseconds), [this, seen] { return changes_ != seen; });
}

}  // namespace kral
