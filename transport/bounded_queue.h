// First-in-first-out queue of fixed capacity that drops its oldest record when full, in constant time.
// Records are kept at their own length: capacity counts records, memory follows content.
#ifndef KRAL_TRANSPORT_BOUNDED_QUEUE_H
#define KRAL_TRANSPORT_BOUNDED_QUEUE_H

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>
#include <optional>
#include <type_traits>
#include <utility>
#include <vector>

namespace kral {

inline constexpr size_t kQueueCapacity = 4096;
inline constexpr size_t kMaximumPacket = 4096;  // FCS bytes included
// A packet record whose length reads so is the fill of memory never written, not a packet: taken out, and absent.
inline constexpr size_t kUnwrittenLength = 0xCDCD;

using Packet = std::vector<uint8_t>;

template <class Record>
class BoundedQueue {
 public:
  explicit BoundedQueue(size_t capacity = kQueueCapacity) : capacity_(capacity) {}

  // False when the oldest record had to be dropped to make room.
  bool Push(Record record) {
    const bool kept_all = PushQuietly(std::move(record));
    not_empty_.notify_one();
    return kept_all;
  }

  // The same without waking a reader for each record: one switch of threads for every packet of a flood would cost more
  // than all the rest. Readers are woken by WakeReaders, which must follow, and before too many records wait.
  bool PushQuietly(Record record) {
    constexpr size_t kManyRecords = 64;
    bool kept_all = true;
    bool many = false;
    {
      const std::lock_guard lock(mutex_);
      if (records_.size() >= capacity_) {
        records_.pop_front();
        ++dropped_;
        kept_all = false;
      }
      records_.push_back(std::move(record));
      many = records_.size() % kManyRecords == 0;
    }
    if (many) WakeReaders();
    return kept_all;
  }
  void WakeReaders() { not_empty_.notify_all(); }

  std::optional<Record> Pop() {
    const std::lock_guard lock(mutex_);
    return TakeFront();
  }

  // The oldest record, or nothing after the time-out. 0 does not wait. Any record that is there counts, also one that
  // came before the call: no signal can be left over from a queue since cleared.
  std::optional<Record> PopWithin(std::chrono::milliseconds time_out) {
    std::unique_lock lock(mutex_);
    not_empty_.wait_for(lock, time_out, [this] { return closed_ || !records_.empty(); });
    return TakeFront();
  }

  // Nobody waits in this queue any more.
  void Close() {
    const std::lock_guard lock(mutex_);
    closed_ = true;
    not_empty_.notify_all();
  }

  void Clear() {
    std::deque<Record> doomed;
    const std::lock_guard lock(mutex_);
    doomed.swap(records_);
  }

  size_t size() const {
    const std::lock_guard lock(mutex_);
    return records_.size();
  }

  uint64_t dropped() const {
    const std::lock_guard lock(mutex_);
    return dropped_;
  }

 private:
  std::optional<Record> TakeFront() {
    if (records_.empty()) return std::nullopt;
    std::optional<Record> front(std::move(records_.front()));
    records_.pop_front();
    if constexpr (std::is_same_v<Record, Packet>) {
      if (front->size() == kUnwrittenLength) return std::nullopt;
    }
    return front;
  }

  const size_t capacity_;
  mutable std::mutex mutex_;
  std::condition_variable not_empty_;
  std::deque<Record> records_;
  uint64_t dropped_ = 0;
  bool closed_ = false;
};

using PacketQueue = BoundedQueue<Packet>;

}  // namespace kral

#endif
