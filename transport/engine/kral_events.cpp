// The dispatcher's queue, thread and listener list. What packets mean is left to the listeners.
#include "transport/engine/kral_events.h"

#include <algorithm>
#include <chrono>
#include <iterator>
#include <thread>
#include <utility>

#include "base/at_exit.h"
#include "platform/forced_unwind.h"
#include "platform/message_pump.h"

namespace kral {

CKralEvents::~CKralEvents() {
  Stop();
}

bool CKralEvents::RegisterListener(PacketListener* listener, const PacketFilter* filter, std::shared_ptr<void> owner) {
  if (listener == nullptr) return false;
  const RecursiveLock lock(listeners_mutex_);
  listeners_.push_back({listener, filter});
  return EnsureThread(std::move(owner));
}

bool CKralEvents::EnsureThread(std::shared_ptr<void> owner) {
  // In front of the lock, which a running thread holds for as long as a callback takes.
  if (thread_.running()) return true;
  const RecursiveLock lock(listeners_mutex_);
  return StartThread(std::move(owner));
}

bool CKralEvents::StartThread(std::shared_ptr<void> owner) {
  {
    const MutexLock lock(queue_mutex_);
    accepting_ = true;
    stop_requested_ = false;
    pushed_ = 0;
    dispatched_ = 0;
    backlog_ = 0;
  }
  stopped_.Reset();
  // How soon it is given a processor does not matter: what is pushed meanwhile waits.
  if (thread_.Start([this] { Run(); }, std::move(owner))) return true;
  EndAccepting();
  return false;
}

void CKralEvents::UnregisterListener(PacketListener* listener) {
  const RecursiveLock lock(listeners_mutex_);
  const auto found =
      std::ranges::find_if(listeners_, [listener](const Registration& entry) { return entry.listener == listener; });
  if (found == listeners_.end()) return;
  if (dispatching_) {
    found->listener = nullptr;
  } else {
    listeners_.erase(found);
  }
}

void CKralEvents::Push(std::span<const uint8_t> packet) {
  std::vector<Packet> one;
  one.emplace_back(packet.begin(), packet.end());
  PushAll(one);
}

void CKralEvents::PushAll(std::vector<Packet>& packets, bool may_pump) {
  // The queue is locked for moments only. The receive thread may be one that shows windows for the caller's
  // transport, whose messages must not wait even so.
  while (!queue_mutex_.TryLock()) {
    if (may_pump) PumpPendingMessages();
    std::this_thread::yield();
  }
  bool was_empty = false;
  {
    const MutexLock lock(queue_mutex_, std::adopt_lock);
    was_empty = queue_.empty();
    if (accepting_) {
      queue_.insert(queue_.end(), std::make_move_iterator(packets.begin()), std::make_move_iterator(packets.end()));
      pushed_ += packets.size();
      const uint64_t backlog = backlog_.fetch_add(packets.size(), std::memory_order_relaxed) + packets.size();
      greatest_backlog_ = std::max(greatest_backlog(), backlog);
    }
  }
  packets.clear();
  // The dispatcher takes the whole queue at a time and waits only for an empty one.
  if (was_empty) new_packet_.NotifyOne();
}

// A packet that goes to the dispatcher's thread costs its reader a change of threads, and a packet that overtakes
// another its order: this is for what comes when nothing is under way, such as the reply that a request waits for.
bool CKralEvents::DispatchHere(std::vector<Packet>& packets) {
  constexpr size_t kFewPackets = 16;  // of more than that reading should go on meanwhile
  const size_t count = packets.size();
  if (count > kFewPackets || !listeners_mutex_.TryLock()) return false;
  const RecursiveLock lock(listeners_mutex_, std::adopt_lock);
  const auto takes_long = [](const Registration& entry) {
    return entry.listener != nullptr && !entry.listener->IsPrompt();
  };
  if (std::ranges::any_of(listeners_, takes_long) || !BeginHere(count)) return false;
  const AtExit ended([this, count] { EndHere(count); });
  for (Packet& packet : packets) Dispatch(std::move(packet));
  EndBatch();
  packets.clear();
  return true;
}

bool CKralEvents::BeginHere(size_t count) {
  if (!queue_mutex_.TryLock()) return false;
  const MutexLock lock(queue_mutex_, std::adopt_lock);
  if (!accepting_ || pushed_ != dispatched_) return false;
  pushed_ += count;
  const uint64_t backlog = backlog_.fetch_add(count, std::memory_order_relaxed) + count;
  greatest_backlog_ = std::max(greatest_backlog(), backlog);
  return true;
}

// The lock is for moments only, as in PushAll: others hold it for no longer.
void CKralEvents::EndHere(size_t count) {
  backlog_.fetch_sub(count, std::memory_order_relaxed);
  const MutexLock lock(queue_mutex_);
  dispatched_ += count;
  batch_done_.NotifyAll();
}

bool CKralEvents::WaitUntilDispatched(uint32_t time_out_ms) {
  MutexLock lock(queue_mutex_);
  return batch_done_.WaitFor(lock, std::chrono::milliseconds(time_out_ms),
                             [this, last = pushed_]()
                                 KRAL_REQUIRES(queue_mutex_) { return dispatched_ >= last || !accepting_; });
}

bool CKralEvents::Stop(uint32_t time_out_ms) {
  EndAccepting();
  if (thread_.running() && !stopped_.WaitFor(time_out_ms)) return false;
  thread_.Join();
  const RecursiveLock none_here(listeners_mutex_);  // listeners that are called on another thread are prompt
  return true;
}

// A notification under the lock: the thread may be the last to need this object.
void CKralEvents::EndAccepting() {
  const MutexLock lock(queue_mutex_);
  accepting_ = false;
  stop_requested_ = true;
  backlog_.fetch_sub(queue_.size(), std::memory_order_relaxed);
  queue_.clear();
  new_packet_.NotifyOne();
  batch_done_.NotifyAll();
}

void CKralEvents::Run() {
  // Also when a host ends the thread inside a callback: nothing more is taken, and a stop need not wait.
  const AtExit ended([this] {
    EndAccepting();
    stopped_.Set();
  });
  if (!OnThreadStart()) return;
  std::vector<Packet> batch;
  while (TakeBatch(batch)) {
    for (Packet& packet : batch) {
      if (stop_requested_) break;
      Dispatch(std::move(packet));
      backlog_.fetch_sub(1, std::memory_order_relaxed);
    }
    EndBatch();
  }
  OnThreadEnd();
}

bool CKralEvents::TakeBatch(std::vector<Packet>& batch) {
  MutexLock lock(queue_mutex_);
  if (!batch.empty()) {
    dispatched_ += batch.size();
    batch.clear();
    batch_done_.NotifyAll();
  }
  new_packet_.Wait(lock, [this]() KRAL_REQUIRES(queue_mutex_) { return stop_requested_ || !queue_.empty(); });
  if (stop_requested_) return false;
  batch.swap(queue_);
  return true;
}

// By index: a listener may register another one, whose turn comes with the next call, and unregister any.
template <class Call>
void CKralEvents::ForEachListener(Call call) {
  const RecursiveLock lock(listeners_mutex_);
  dispatching_ = true;
  const size_t count = listeners_.size();
  for (size_t i = 0; i < count; ++i) {
    try {
      const Registration entry = listeners_[i];  // a copy: the list may grow meanwhile
      if (entry.listener != nullptr) call(entry, i + 1 == count);
    } catch (...) {
      PassForcedUnwind();
      // A listener's failure costs it this packet, not the others theirs.
    }
  }
  dispatching_ = false;
  std::erase_if(listeners_, [](const Registration& entry) { return entry.listener == nullptr; });
}

void CKralEvents::EndBatch() {
  ForEachListener([](const Registration& entry, bool) { entry.listener->OnBatchEnd(); });
}

void CKralEvents::Dispatch(Packet packet) {
  ForEachListener([&packet](const Registration& entry, bool is_last) {
    if (entry.filter != nullptr && !entry.filter->Accepts(packet)) return;
    if (is_last) {
      entry.listener->TakePacket(std::move(packet));
    } else {
      entry.listener->OnPacket(packet);
    }
  });
}

}  // namespace kral
