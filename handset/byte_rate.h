// How many bytes a cable carries in a while.
#ifndef KRAL_HANDSET_BYTE_RATE_H
#define KRAL_HANDSET_BYTE_RATE_H

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "platform/clock.h"

namespace kral::handset {

// Of one direction. What was not used is saved up for a moment only: a thread that is woken late makes up for it.
class ByteRate {
 public:
  explicit ByteRate(uint32_t per_second, Clock& clock = SystemClock())  // 0: no limit
      : per_second_(per_second), clock_(clock), last_tick_(clock.TickMs()) {}

  size_t Room() {
    if (per_second_ == 0) return SIZE_MAX;
    const uint32_t now = clock_.TickMs();
    const uint64_t elapsed = std::min(now - last_tick_, kSavedMs);
    last_tick_ = now;
    thousandths_ = std::min(thousandths_ + elapsed * per_second_, uint64_t{kSavedMs} * per_second_);
    return static_cast<size_t>(thousandths_ / 1000);
  }
  void Take(size_t bytes) {  // at most the room
    if (per_second_ != 0) thousandths_ -= uint64_t{bytes} * 1000;
  }

 private:
  static constexpr uint32_t kSavedMs = 20;

  const uint32_t per_second_;
  Clock& clock_;
  uint32_t last_tick_;
  uint64_t thousandths_ = 0;  // of a byte
};

}  // namespace kral::handset

#endif
