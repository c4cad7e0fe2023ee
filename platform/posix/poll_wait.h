// poll with a time-out that survives signals.
#ifndef KRAL_PLATFORM_POSIX_POLL_WAIT_H
#define KRAL_PLATFORM_POSIX_POLL_WAIT_H

#include <poll.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <climits>
#include <cstdint>
#include <span>

namespace kral {

// True when one of the descriptors reports something before the time is over.
inline bool PollFor(std::span<pollfd> descriptors, uint32_t milliseconds) {
  using std::chrono::steady_clock;
  const auto deadline = steady_clock::now() + std::chrono::milliseconds(milliseconds);
  int remaining = static_cast<int>(std::min<uint32_t>(milliseconds, INT_MAX));
  for (;;) {
    const int ready = ::poll(descriptors.data(), descriptors.size(), remaining);
    if (ready > 0) return true;
    if (ready == 0 || errno != EINTR) return false;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - steady_clock::now()).count();
    remaining = static_cast<int>(std::clamp<int64_t>(left, 0, INT_MAX));
  }
}

}  // namespace kral

#endif
