// First-in-first-out queue of fixed capacity that drops its oldest record when full, in constant time.
// Records are kept at their own length: capacity counts records, memory follows content.
#ifndef KRAL_TRANSPORT_ENGINE_BOUNDED_QUEUE_H
#define KRAL_TRANSPORT_ENGINE_BOUNDED_QUEUE_H

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <new>
#include <optional>
#include <type_traits>
#include <utility>
#include <vector>

#include "base/mutex.h"
#include "transport/line/packet_listener.h"

namespace kral {

inline constexpr size_t kQueueCapacity = 4096;
// A packet record whose length reads so is the fill of memory never written, not a packet: taken out, and absent.
inline constexpr size_t kUnwrittenLength = 0xCDCD;

template <class Record>
class BoundedQueue {
 public:
  explicit BoundedQueue(size_t capacity = kQueueCapacity) : capacity_(capacity) {}

  void Push(Record record) {
    Stage(std::move(record));
    WakeReaders();
  }

  // Lays a record ready for Publish, which must follow soon: until then readers see nothing of it, and no counter has
  // it. In a flood, meeting a reader at the lock for every record, and waking it, would cost more than all the rest.
  void Stage(Record record) {
    constexpr size_t kManyRecords = 512;
    bool many = false;
    try {
      const MutexLock staging(staging_mutex_);
      staged_.push_back(std::move(record));
      many = staged_.size() >= kManyRecords;
    } catch (const std::bad_alloc&) {
      Lose();
    }
    if (many) WakeReaders();
  }
  // Counts a record that there is no memory for.
  void Lose() {
    const MutexLock lock(mutex_);
    ++pushed_;
    ++dropped_;
  }
  void Publish() {
    const MutexLock staging(staging_mutex_);
    if (staged_.empty()) return;
    {
      const MutexLock lock(mutex_);
      for (Record& record : staged_) Append(std::move(record));
    }
    staged_.clear();
  }
  // Publishes, and tells those who wait.
  void WakeReaders() {
    Publish();
    not_empty_.NotifyAll();
  }

  std::optional<Record> Pop() {
    const MutexLock lock(mutex_);
    return TakeFront();
  }

  // The oldest record, or nothing after the time-out, or once `abort` is set. 0 does not wait. Any record that is there
  // counts, also one that came before the call: no signal can be left over from a queue since cleared.
  std::optional<Record> PopWithin(std::chrono::milliseconds time_out, const std::atomic<bool>* abort = nullptr) {
    MutexLock lock(mutex_);
    const uint64_t known = told_interrupts_;
    not_empty_.WaitFor(lock, time_out, [this, known, abort]() KRAL_REQUIRES(mutex_) {
      return closed_ || interrupts_ != known || !records_.empty() || (abort != nullptr && abort->load());
    });
    if (records_.empty()) told_interrupts_ = interrupts_;
    return TakeFront();
  }
  // After an abort has been set.
  void EndWaits() {
    const MutexLock lock(mutex_);
    not_empty_.NotifyAll();
  }

  // Nobody waits in this queue until it is opened again; what is in it can be taken.
  void Close() {
    const MutexLock lock(mutex_);
    closed_ = true;
    not_empty_.NotifyAll();
  }
  void Reopen() {
    const MutexLock lock(mutex_);
    closed_ = false;
  }
  bool closed() const {
    const MutexLock lock(mutex_);
    return closed_;
  }

  // What fills the queue is gone. Ends the waits under way, and the next one that finds nothing: its reader may have
  // been busy with a record. Those behind it wait as ever, or a reader that tries again and again would never rest.
  void Interrupt() {
    const MutexLock lock(mutex_);
    ++interrupts_;
    not_empty_.NotifyAll();
  }
  // It is back: an interruption that nobody has been told of is none any more.
  void ForgetInterrupt() {
    const MutexLock lock(mutex_);
    told_interrupts_ = interrupts_;
  }

  std::deque<Record> TakeAll() {
    std::deque<Record> all;
    Publish();
    const MutexLock lock(mutex_);
    all.swap(records_);
    return all;
  }
  void Clear() { TakeAll(); }

  size_t size() const {
    const MutexLock lock(mutex_);
    return records_.size();
  }

  uint64_t pushed() const {
    const MutexLock lock(mutex_);
    return pushed_;
  }
  uint64_t dropped() const {
    const MutexLock lock(mutex_);
    return dropped_;
  }

 private:
  void Append(Record record) KRAL_REQUIRES(mutex_) {
    ++pushed_;
    try {
      records_.push_back(std::move(record));
    } catch (const std::bad_alloc&) {
      ++dropped_;
      return;
    }
    if (records_.size() <= capacity_) return;
    records_.pop_front();
    ++dropped_;
  }

  std::optional<Record> TakeFront() KRAL_REQUIRES(mutex_) {
    if (records_.empty()) return std::nullopt;
    std::optional<Record> front(std::move(records_.front()));
    records_.pop_front();
    if constexpr (std::is_same_v<Record, Packet>) {
      if (front->size() == kUnwrittenLength) return std::nullopt;
    }
    return front;
  }

  const size_t capacity_;
  Mutex staging_mutex_;  // locked before the other
  std::vector<Record> staged_ KRAL_GUARDED_BY(staging_mutex_);
  mutable Mutex mutex_;
  Condition not_empty_;
  std::deque<Record> records_ KRAL_GUARDED_BY(mutex_);
  uint64_t pushed_ KRAL_GUARDED_BY(mutex_) = 0;
  uint64_t dropped_ KRAL_GUARDED_BY(mutex_) = 0;
  bool closed_ KRAL_GUARDED_BY(mutex_) = false;
  uint64_t interrupts_ KRAL_GUARDED_BY(mutex_) = 0;
  uint64_t told_interrupts_ KRAL_GUARDED_BY(mutex_) = 0;
};

using PacketQueue = BoundedQueue<Packet>;

}  // namespace kral

#endif
