// The failures that callers may ask for: the latest of each thread on each handle.
#ifndef KRAL_FRAME_LAST_ERROR_H
#define KRAL_FRAME_LAST_ERROR_H

#include <cstdint>
#include <vector>

#include "base/mutex.h"
#include "kral/error.h"

namespace kral {

// From any thread. Only failing calls come here, so one lock serves all.
class LastErrors {
 public:
  // Replaces what this thread has noted on the handle. Where there is no memory, an older record makes room; the very
  // first one may be lost.
  void Note(KRAL_HANDLE handle, const KRAL_ERROR& error) noexcept;
  // This thread's record; where it has none, and the handle is not 0, the latest of any thread.
  bool Find(KRAL_HANDLE handle, KRAL_ERROR& error) const noexcept;
  // The handle's value stands for another connection from now on.
  void Forget(KRAL_HANDLE handle) noexcept;

 private:
  struct Entry {
    KRAL_HANDLE handle;
    uint32_t thread;
    uint64_t order;  // of the noting
    KRAL_ERROR error;
  };
  Entry& Place(KRAL_HANDLE handle, uint32_t thread) KRAL_REQUIRES(mutex_);

  mutable Mutex mutex_;
  uint64_t noted_ KRAL_GUARDED_BY(mutex_) = 0;
  std::vector<Entry> entries_ KRAL_GUARDED_BY(mutex_);
};

}  // namespace kral

#endif
