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

// Packets come on the dispatcher thread, or on a phone server's threads; everything else from any thread.
class CKralEventListener : public PacketListener {
 public:
  CKralEventListener(PacketQueue& responses, PacketQueue& asynchronous, BoundedQueue<EventRecord>& events);

  void OnPacket(std::span<const uint8_t> packet) override;
  void TakePacket(Packet packet) override;

  PacketQueue& responses() { return responses_; }
  PacketQueue& asynchronous() { return asynchronous_; }
  BoundedQueue<EventRecord>& events() { return events_; }

  void SetLogger(DataLogFileHandler* log) { log_ = log; }
  // While collection is off, asynchronous packets are dropped.
  void SetCollection(bool on) { collecting_ = on; }
  bool collecting() const { return collecting_; }
  // A call that is under way when the callback is changed still ends on the former one.
  void SetRawPacketCallback(RawPacketCallback callback, uintptr_t value);
  // A handler is not called any more once it is removed.
  void AddEventHandler(EventHandler* handler);
  void RemoveEventHandler(EventHandler* handler);
  void AddLogHandler(LogHandler* handler);
  void RemoveLogHandler(LogHandler* handler);

  uint64_t dropped_not_collecting() const { return dropped_not_collecting_.load(std::memory_order_relaxed); }
  uint64_t dropped_by_size() const { return dropped_by_size_.load(std::memory_order_relaxed); }

 private:
  void CallRawPacketCallback(std::span<const uint8_t> packet);
  bool IsClaimed(std::span<const uint8_t> event_report);
  void OfferLog(std::span<const uint8_t> log_packet);
  void QueueResponse(Packet packet, const char* format);
  void QueueAsynchronous(Packet packet);
  void QueueEvents(std::span<const uint8_t> event_report);
  void LogPacket(uint32_t flag, const char* format, std::span<const uint8_t> packet);

  PacketQueue& responses_;
  PacketQueue& asynchronous_;
  BoundedQueue<EventRecord>& events_;

  std::atomic<DataLogFileHandler*> log_{nullptr};
  std::atomic<bool> collecting_{false};
  std::atomic<uint64_t> dropped_not_collecting_{0};
  std::atomic<uint64_t> dropped_by_size_{0};

  std::mutex callback_mutex_;
  RawPacketCallback callback_ = nullptr;
  uintptr_t callback_value_ = 0;

  // Held while handlers are called; recursive, because one may remove itself.
  std::recursive_mutex handlers_mutex_;
  std::vector<EventHandler*> event_handlers_;
  std::vector<LogHandler*> log_handlers_;
};

}  // namespace kral

#endif
