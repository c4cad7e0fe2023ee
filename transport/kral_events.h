// The packet dispatcher: an unbounded queue between the receive thread and the listeners, with a thread of its own.
#ifndef KRAL_TRANSPORT_KRAL_EVENTS_H
#define KRAL_TRANSPORT_KRAL_EVENTS_H

#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <memory>
#include <mutex>
#include <span>
#include <vector>

#include "transport/bounded_queue.h"
#include "transport/manual_reset_event.h"
#include "transport/packet_listener.h"
#include "transport/worker_thread.h"

namespace kral {

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
  // the listeners, and is kept alive by the thread until it ends.
  bool RegisterListener(PacketListener* listener, const PacketFilter* filter, std::shared_ptr<void> owner);
  // The first pair with that listener. Waits for a call that is under way on the dispatcher thread, so a listener
  // that may block is taken out after Stop, or lives as long as the owner.
  void UnregisterListener(PacketListener* listener);

  // From the receive thread: pumps the calling thread's messages while the queue is busy. Without a running
  // dispatcher thread the packet is dropped.
  void Push(std::span<const uint8_t> packet);

  // Waits until every packet pushed before the call has been through its listeners; false when that takes longer.
  bool WaitUntilDispatched(uint32_t time_out_ms);

  // False when the thread, busy in a listener, did not end in time. It ends after that call and keeps its owner alive
  // until then. Packets not yet dispatched are dropped.
  bool Stop(uint32_t time_out_ms = 1000);

 protected:
  virtual bool OnThreadStart() { return true; }  // false ends the thread at once
  virtual void OnThreadEnd() {}

 private:
  struct Registration {
    PacketListener* listener;  // null: unregistered during a dispatch, to be removed after it
    const PacketFilter* filter;
  };

  bool StartThread(std::shared_ptr<void> owner);  // listeners locked
  void Run();
  bool TakeBatch(std::deque<Packet>& batch);
  void Dispatch(Packet packet);
  void EndBatch();
  void EndAccepting();

  std::mutex queue_mutex_;
  std::condition_variable new_packet_;
  std::condition_variable batch_done_;
  std::deque<Packet> queue_;
  bool accepting_ = false;
  uint64_t pushed_ = 0;
  uint64_t dispatched_ = 0;
  std::atomic<bool> stop_requested_{false};

  // Recursive: a listener may register and unregister from its call.
  std::recursive_mutex listeners_mutex_;
  std::vector<Registration> listeners_;
  bool dispatching_ = false;

  ManualResetEvent started_{"KRAL_EVENTS_STARTED"};
  ManualResetEvent stopped_{"KRAL_EVENTS_STOPPED"};
  WorkerThread thread_;  // last: nothing above may be gone while it is parked
};

}  // namespace kral

#endif
