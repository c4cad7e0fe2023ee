// The packet dispatcher: an unbounded queue between the receive thread and the listeners, with a thread of its own.
#ifndef KRAL_TRANSPORT_ENGINE_KRAL_EVENTS_H
#define KRAL_TRANSPORT_ENGINE_KRAL_EVENTS_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "base/event.h"
#include "base/mutex.h"
#include "base/worker_thread.h"
#include "transport/engine/bounded_queue.h"
#include "transport/line/packet_listener.h"

namespace kral {

// For: a listener that takes only some packets. Kept; none of the library's own has one.
class PacketFilter {
 public:
  virtual ~PacketFilter() = default;
  virtual bool Accepts(std::span<const uint8_t> packet) const = 0;
};

class CKralEvents {
 public:
  CKralEvents() = default;
  virtual ~CKralEvents();  // stops the thread if Stop was not called
  CKralEvents(const CKralEvents&) = delete;
  CKralEvents& operator=(const CKralEvents&) = delete;

  // Listeners are called on the dispatcher thread, in registration order; one with a filter only for what it accepts.
  // The first registration starts the thread, and so does the first one after a stop; `owner` holds this object and
  // the listeners, and is kept alive by the thread until it ends. False where there is no thread to be had: the
  // listener is registered all the same, and EnsureThread may have more luck.
  bool RegisterListener(PacketListener* listener, const PacketFilter* filter, std::shared_ptr<void> owner);
  bool EnsureThread(std::shared_ptr<void> owner);  // true when it runs; never waits for a listener
  // The first pair with that listener. Waits for a call that is under way on the dispatcher thread, so a listener
  // that may block is taken out after Stop, or lives as long as the owner.
  void UnregisterListener(PacketListener* listener);

  // From the receive thread: pumps the calling thread's messages while the queue is busy. Without a running
  // dispatcher thread the packet is dropped.
  void Push(std::span<const uint8_t> packet);
  // The same for several at once, which are gone from the vector afterwards. A thread of the caller's must not have its
  // messages pumped.
  void PushAll(std::vector<Packet>& packets, bool may_pump = true);

  // Takes the packets through the listeners at once, on the calling thread, and empties the vector. False where that is
  // not done: packets that came before are still on their way, the packets are many, or a listener may take long.
  bool DispatchHere(std::vector<Packet>& packets);

  // What was pushed and has not been through its listeners, now and at its most.
  uint64_t backlog() const { return backlog_.load(std::memory_order_relaxed); }
  uint64_t greatest_backlog() const { return greatest_backlog_.load(std::memory_order_relaxed); }

  // Waits until every packet pushed before the call has been through its listeners; false when that takes longer.
  bool WaitUntilDispatched(uint32_t time_out_ms);

  // False when the thread, busy in a listener, did not end in time. It ends after that call and keeps its owner alive
  // until then. Packets not yet dispatched are dropped.
  bool Stop(uint32_t time_out_ms = 1000);

 protected:
  // For: a dispatcher whose listeners need something of their own on its thread. Kept; nothing overrides them.
  virtual bool OnThreadStart() { return true; }  // false ends the thread at once
  virtual void OnThreadEnd() {}

 private:
  struct Registration {
    PacketListener* listener;  // null: unregistered during a dispatch, to be removed after it
    const PacketFilter* filter;
  };

  bool BeginHere(size_t count);
  void EndHere(size_t count);
  bool StartThread(std::shared_ptr<void> owner) KRAL_REQUIRES(listeners_mutex_);
  void Run();
  bool TakeBatch(std::vector<Packet>& batch);
  template <class Call>
  void ForEachListener(Call call);
  void Dispatch(Packet packet);
  void EndBatch();
  void EndAccepting();

  Mutex queue_mutex_;
  Condition new_packet_;
  Condition batch_done_;
  std::vector<Packet> queue_ KRAL_GUARDED_BY(queue_mutex_);
  bool accepting_ KRAL_GUARDED_BY(queue_mutex_) = false;
  uint64_t pushed_ KRAL_GUARDED_BY(queue_mutex_) = 0;
  uint64_t dispatched_ KRAL_GUARDED_BY(queue_mutex_) = 0;
  std::atomic<uint64_t> backlog_{0};
  std::atomic<uint64_t> greatest_backlog_{0};  // changed under queue_mutex_
  std::atomic<bool> stop_requested_{false};

  // Recursive: a listener may register and unregister from its call.
  RecursiveMutex listeners_mutex_;
  std::vector<Registration> listeners_ KRAL_GUARDED_BY(listeners_mutex_);
  bool dispatching_ KRAL_GUARDED_BY(listeners_mutex_) = false;

  ManualResetEvent stopped_{"KRAL_EVENTS_STOPPED"};
  WorkerThread thread_;  // last: nothing above may be gone while it is parked
};

}  // namespace kral

#endif
