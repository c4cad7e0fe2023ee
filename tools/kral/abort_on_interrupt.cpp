// Looks for an interrupt, and aborts.
#include "tools/kral/abort_on_interrupt.h"

#include <chrono>
#include <condition_variable>
#include <mutex>

#include "tools/kral/interrupt.h"

namespace kral::tool {
namespace {

constexpr std::chrono::milliseconds kPoll{100};

}  // namespace

AbortOnInterrupt::AbortOnInterrupt(KRAL_HANDLE handle)
    : thread_([handle](const std::stop_token& stop) { Watch(stop, handle); }) {}

// The abort is repeated: what begins in that moment forgets it.
void AbortOnInterrupt::Watch(const std::stop_token& stop, KRAL_HANDLE handle) {
  std::mutex mutex;
  std::condition_variable_any stopped;
  std::unique_lock lock(mutex);
  while (!stopped.wait_for(lock, stop, kPoll, [&] { return stop.stop_requested(); })) {
    if (Interrupted()) KRAL_AbortEFS_Operation(handle);
  }
}

}  // namespace kral::tool
