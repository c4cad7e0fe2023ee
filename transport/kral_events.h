// The packet dispatcher: an unbounded queue between the receive thread and the listeners, with a thread of its own.
#ifndef KRAL_TRANSPORT_KRAL_EVENTS_H
#define KRAL_TRANSPORT_KRAL_EVENTS_H

#include <cstdint>
#include <memory>
#include <span>

#include "transport/packet_listener.h"

namespace kral {

class PacketFilter {
 public:
  virtual ~PacketFilter() = default;
  virtual bool Accepts(std::span<const uint8_t> packet) const = 0;
};

class CKralEvents {
 public:
  CKralEvents();
  virtual ~CKralEvents();  // stops the thread if Stop was not called
  CKralEvents(const CKralEvents&) = delete;
  CKralEvents& operator=(const CKralEvents&) = delete;

  // Listeners are called on the dispatcher thread, in registration order; one with a filter only for what it accepts.
  // The first registration starts the thread; `owner` is kept alive by the thread until it ends.
  bool RegisterListener(PacketListener* listener, const PacketFilter* filter, std::shared_ptr<void> owner);
  void UnregisterListener(PacketListener* listener);  // the first pair with that listener

  // From the receive thread: pumps the calling thread's messages while the queue is busy.
  void Push(std::span<const uint8_t> packet);

  bool Stop(uint32_t time_out_ms = 1000);  // false when the thread did not end in time; it is then parked

 protected:
  virtual bool OnThreadStart() { return true; }  // false ends the thread at once
  virtual void OnThreadEnd() {}

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace kral

#endif
