// The packet sorter: command responses into the response queue, asynchronous packets into theirs.
#ifndef KRAL_TRANSPORT_KRAL_EVENT_LISTENER_H
#define KRAL_TRANSPORT_KRAL_EVENT_LISTENER_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <span>
#include <vector>

#include "transport/bounded_queue.h"
#include "transport/event_record.h"
#include "transport/kral_events.h"

namespace kral {

class DataLogFileHandler;

// Called with (length, bytes, caller's value) for every packet, before it is sorted.
using RawPacketCallback = void (*)(uint32_t length, const uint8_t* bytes, uintptr_t value);

// An internal handler that may claim an event report (first byte 96) as the answer to a command.
class EventHandler {
 public:
  virtual ~EventHandler() = default;
  virtual bool Claims(std::span<const uint8_t> event_report) = 0;
};

// Offered every log packet (first byte 16) before it is queued.
class LogHandler {
 public:
  virtual ~LogHandler() = default;
  virtual void OnLog(std::span<const uint8_t> log_packet) = 0;
};

class CKralEventListener : public PacketListener {
 public:
  CKralEventListener(PacketQueue& responses, PacketQueue& asynchronous, BoundedQueue<EventRecord>& events);

  void OnPacket(std::span<const uint8_t> packet) override;

  PacketQueue& responses() { return responses_; }
  PacketQueue& asynchronous() { return asynchronous_; }
  BoundedQueue<EventRecord>& events() { return events_; }

  void SetLogger(DataLogFileHandler* log);
  void SetCollection(bool on);
  bool collecting() const;
  void SetRawPacketCallback(RawPacketCallback callback, uintptr_t value);
  void AddEventHandler(EventHandler* handler);
  void RemoveEventHandler(EventHandler* handler);
  void AddLogHandler(LogHandler* handler);
  void RemoveLogHandler(LogHandler* handler);

 private:
  PacketQueue& responses_;
  PacketQueue& asynchronous_;
  BoundedQueue<EventRecord>& events_;
};

}  // namespace kral

#endif
