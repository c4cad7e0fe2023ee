// The packet sorter: command responses into the response queue, asynchronous packets into theirs.
#ifndef KRAL_TRANSPORT_COLLECTION_KRAL_EVENT_LISTENER_H
#define KRAL_TRANSPORT_COLLECTION_KRAL_EVENT_LISTENER_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "kral/log.h"
#include "transport/collection/event_record.h"
#include "transport/engine/bounded_queue.h"
#include "transport/engine/kral_events.h"
#include "transport/engine/port_watcher.h"
#include "transport/engine/traffic_counters.h"

namespace kral {

class CaptureWriter;
class DataLogFileHandler;
class NameTables;

// Called with (length, bytes, caller's value) for every packet, before it is sorted.
using RawPacketCallback = void (*)(uint32_t length, const uint8_t* bytes, uintptr_t value);

// What takes collected traffic as it is queued. Each is called with the value, on the thread that brings the packet.
struct Event;

struct CollectionCallbacks {
  KRAL_RAW_PACKET_CALLBACK packet = nullptr;
  KRAL_EVENT_CALLBACK event = nullptr;
  uintptr_t value = 0;
};

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
class CKralEventListener : public PacketListener, public PortWatcher {
 public:
  CKralEventListener(PacketQueue& responses, PacketQueue& asynchronous, BoundedQueue<EventRecord>& events,
                     DataLogFileHandler& log);

  void OnPacket(std::span<const uint8_t> packet) override;
  void TakePacket(Packet packet) override;
  void OnBatchEnd() override;
  bool IsPrompt() const override { return !IsWatched(); }

  PacketQueue& responses() { return responses_; }
  PacketQueue& asynchronous() { return asynchronous_; }
  BoundedQueue<EventRecord>& events() { return events_; }

  // Before the first packet; both outlive the sorter. The texts of events, and where collected packets go as well.
  void SetNames(const NameTables* names) { names_ = names; }
  void SetCapture(CaptureWriter* capture) { capture_ = capture; }
  // One wait for what nobody asked for ends at once: nothing comes any more.
  void OnPortGone() override;
  void OnPortOpened() override;
  // While collection is off, asynchronous packets are dropped.
  void SetCollection(bool on) { collecting_ = on; }
  bool collecting() const { return collecting_; }
  // A call that is under way when the callback is changed still ends on the former one.
  void SetRawPacketCallback(RawPacketCallback callback, uintptr_t value);
  void SetCollectionCallbacks(const CollectionCallbacks& callbacks);
  // For: a family that is answered by an event report, or follows logs. Kept; no family here adds a handler. One is not
  // called any more once it is removed.
  void AddEventHandler(EventHandler* handler);
  void RemoveEventHandler(EventHandler* handler);
  void AddLogHandler(LogHandler* handler);
  void RemoveLogHandler(LogHandler* handler);

  uint64_t dropped_not_collecting() const { return dropped_not_collecting_.load(std::memory_order_relaxed); }
  uint64_t dropped_by_size() const { return dropped_by_size_.load(std::memory_order_relaxed); }
  TrafficCounters counters() const;  // as far as the sorter knows them

 private:
  bool IsWatched() const;
  void CallRawPacketCallback(std::span<const uint8_t> packet);
  bool IsClaimed(std::span<const uint8_t> event_report);
  void OfferLog(std::span<const uint8_t> log_packet);
  void QueueResponse(Packet packet, const char* format);
  void QueueAsynchronous(Packet packet);
  void QueueEvents(std::span<const uint8_t> event_report, const CollectionCallbacks& callbacks);
  void LogEvent(const Event& event);
  CollectionCallbacks collection_callbacks();
  void NoteCallbacks() KRAL_REQUIRES(callback_mutex_);
  std::string EventText(uint16_t id) const;

  PacketQueue& responses_;
  PacketQueue& asynchronous_;
  BoundedQueue<EventRecord>& events_;
  DataLogFileHandler& log_;

  std::atomic<bool> collecting_{false};
  const NameTables* names_ = nullptr;
  CaptureWriter* capture_ = nullptr;
  std::atomic<uint64_t> dropped_not_collecting_{0};
  std::atomic<uint64_t> dropped_by_size_{0};

  std::atomic<bool> has_callbacks_{false};
  Mutex callback_mutex_;
  RawPacketCallback callback_ KRAL_GUARDED_BY(callback_mutex_) = nullptr;
  uintptr_t callback_value_ KRAL_GUARDED_BY(callback_mutex_) = 0;
  CollectionCallbacks collection_callbacks_ KRAL_GUARDED_BY(callback_mutex_);

  // Held while handlers are called; recursive, because one may remove itself.
  RecursiveMutex handlers_mutex_;
  std::vector<EventHandler*> event_handlers_ KRAL_GUARDED_BY(handlers_mutex_);
  std::vector<LogHandler*> log_handlers_ KRAL_GUARDED_BY(handlers_mutex_);
};

}  // namespace kral

#endif
