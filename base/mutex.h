// Mutexes that clang checks: a member says which one guards it (KRAL_GUARDED_BY), a function which one its caller holds
// (KRAL_REQUIRES), and -Wthread-safety refuses what reaches either without it. Other compilers see plain mutexes.
#ifndef KRAL_BASE_MUTEX_H
#define KRAL_BASE_MUTEX_H

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <utility>

#ifdef __clang__
#define KRAL_THREAD_SAFETY(attribute) __attribute__((attribute))
#else
#define KRAL_THREAD_SAFETY(attribute)
#endif
#define KRAL_GUARDED_BY(mutex) KRAL_THREAD_SAFETY(guarded_by(mutex))
#define KRAL_REQUIRES(mutex) KRAL_THREAD_SAFETY(requires_capability(mutex))

namespace kral {

template <class StdMutex>
class KRAL_THREAD_SAFETY(capability("mutex")) CheckedMutex {
 public:
  bool TryLock() KRAL_THREAD_SAFETY(try_acquire_capability(true)) { return mutex_.try_lock(); }

 private:
  template <class>
  friend class CheckedLock;
  StdMutex mutex_;
};

// Holds the mutex for its own lifetime.
template <class StdMutex>
class KRAL_THREAD_SAFETY(scoped_lockable) CheckedLock {
 public:
  explicit CheckedLock(CheckedMutex<StdMutex>& mutex) KRAL_THREAD_SAFETY(acquire_capability(mutex))
      : lock_(mutex.mutex_) {}
  CheckedLock(CheckedMutex<StdMutex>& mutex, std::adopt_lock_t adopt) KRAL_REQUIRES(mutex)
      : lock_(mutex.mutex_, adopt) {}
  ~CheckedLock() KRAL_THREAD_SAFETY(release_capability()) {}
  CheckedLock(const CheckedLock&) = delete;
  CheckedLock& operator=(const CheckedLock&) = delete;

 private:
  friend class Condition;
  std::unique_lock<StdMutex> lock_;
};

using Mutex = CheckedMutex<std::mutex>;
using MutexLock = CheckedLock<std::mutex>;
using RecursiveMutex = CheckedMutex<std::recursive_mutex>;
using RecursiveLock = CheckedLock<std::recursive_mutex>;

// A condition variable for them. What is waited for is read under the lock: such a lambda has a KRAL_REQUIRES too.
class Condition {
 public:
  template <class Holds>
  void Wait(MutexLock& lock, Holds holds) {
    changed_.wait(lock.lock_, std::move(holds));
  }
  // False when it still does not hold after that time.
  template <class Rep, class Period, class Holds>
  bool WaitFor(MutexLock& lock, std::chrono::duration<Rep, Period> time, Holds holds) {
    return changed_.wait_for(lock.lock_, time, std::move(holds));
  }
  void NotifyOne() { changed_.notify_one(); }
  void NotifyAll() { changed_.notify_all(); }

 private:
  std::condition_variable changed_;
};

}  // namespace kral

#endif
