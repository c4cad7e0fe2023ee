// What a connection asks of its receive thread, and the thread's acknowledgements.
#ifndef KRAL_TRANSPORT_ENGINE_THREAD_CONTROL_H
#define KRAL_TRANSPORT_ENGINE_THREAD_CONTROL_H

#include <atomic>
#include <cstdint>

#include "base/event.h"
#include "base/mutex.h"

namespace kral {

class ThreadControl {
 public:
  // --- The connection's side ----------------------------------------------------------------------------------------
  void Reset();  // before a thread is started
  // Each request resets its event first, so that an acknowledgement cannot be wiped out by its own request.
  void RequestPause();
  bool AwaitPause(uint32_t milliseconds) { return pause_event_.WaitFor(milliseconds); }
  void ClearPause();
  void RequestStop();
  bool AwaitStop(uint32_t milliseconds) { return stop_event_.WaitFor(milliseconds); }
  void Notify();  // a setting has changed: ends WaitForChange

  // --- The thread's side --------------------------------------------------------------------------------------------
  bool stop_requested() const { return stop_requested_; }
  // 0, or the number of the pause that is wanted: one that follows on another is told from it even if the thread
  // has not seen the time between them.
  uint32_t pause_wanted() const { return pause_wanted_; }
  void AcknowledgePause() { pause_event_.Set(); }
  void AcknowledgeStop() { stop_event_.Set(); }

  // Taken before the requests are looked at; WaitForChange returns at once when one has come since.
  uint32_t changes() const { return changes_; }
  void WaitForChange(uint32_t seen, uint32_t milliseconds);

 private:
  ManualResetEvent stop_event_{"KRAL_THREAD_STOP_EVENT"};
  ManualResetEvent pause_event_{"KRAL_THREAD_PAUSE_EVENT"};
  std::atomic<bool> stop_requested_{false};
  std::atomic<uint32_t> pause_wanted_{0};
  uint32_t last_pause_ = 0;

  Mutex mutex_;
  Condition changed_;
  std::atomic<uint32_t> changes_{0};
};

}  // namespace kral

#endif
