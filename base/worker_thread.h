// A thread of the library: it keeps its owner alive while it runs, and nobody ever waits for it without a bound.
#ifndef KRAL_BASE_WORKER_THREAD_H
#define KRAL_BASE_WORKER_THREAD_H

#include <atomic>
#include <cstddef>
#include <functional>
#include <memory>
#include <thread>

#include "platform/loaded_module.h"

namespace kral {

class WorkerThread {
 public:
  WorkerThread() = default;
  // Never waits. A thread that has not ended is parked: it goes on alone, to be joined once it has.
  ~WorkerThread();
  WorkerThread(const WorkerThread&) = delete;
  WorkerThread& operator=(const WorkerThread&) = delete;

  // Runs `body` on a thread of its own; `owner`, which holds this object, lives at least until the body has returned.
  // The host's signal handlers don't run on it. False while an earlier body still runs, and when the system gives no
  // thread or memory.
  bool Start(std::function<void()> body, std::shared_ptr<void> owner);
  bool running() const { return thread_.joinable() && !progress_->body_ended.load(std::memory_order_acquire); }
  // For a body that has announced its end: waits for the moment it takes to leave. One that cannot leave now, as its
  // host is loading or unloading a library, is parked.
  void Join();

  struct Progress {
    std::atomic<bool> body_ended{false};
    std::atomic<bool> owner_released{false};  // the thread touches nothing of the library any more
    // Once it is parked. Parking takes no memory: it must not fail.
    std::thread parked;
    ModuleReference parked_module;
    std::shared_ptr<Progress> next_parked;
  };

 private:
  void Park();

  ModuleReference module_;  // of the thread
  std::thread thread_;
  std::shared_ptr<Progress> progress_;
};

// Joins the parked threads that have ended meanwhile and tells how many are left. Every start does so as well; at the
// end of the process those still running are left alone.
size_t ReapParkedThreads();

}  // namespace kral

#endif
