// Sorts packets into the queues by their first byte, and hands them to callbacks and the capture on the way. How the
// queues are emptied is left to the engine and to the collection functions.
#include "transport/collection/kral_event_listener.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <utility>

#include "base/guarded_call.h"
#include "base/hex_dump.h"
#include "base/text_log.h"
#include "transport/collection/capture_writer.h"
#include "transport/collection/event_report.h"
#include "transport/collection/name_table.h"

namespace kral {
namespace {

static_assert(sizeof(KRAL_EVENT) == EventRecord::kSize);

constexpr size_t kSmallestPacket = 2;

// Where no table of event texts has one.
constexpr char kNoEventText[] = "no text";

void Increment(std::atomic<uint64_t>& counter) {
  counter.fetch_add(1, std::memory_order_relaxed);
}

}  // namespace

CKralEventListener::CKralEventListener(PacketQueue& responses, PacketQueue& asynchronous,
                                       BoundedQueue<EventRecord>& events, DataLogFileHandler& log)
    : responses_(responses), asynchronous_(asynchronous), events_(events), log_(log) {}

void CKralEventListener::OnPacket(std::span<const uint8_t> packet) {
  try {
    TakePacket({packet.begin(), packet.end()});
  } catch (const std::bad_alloc&) {  // of the copy: nothing behind it lets one out
    const bool is_answer = packet.empty() || !IsAsynchronousCode(packet[0]);
    (is_answer ? responses_ : asynchronous_).Lose();
  }
  OnBatchEnd();
}

void CKralEventListener::OnBatchEnd() {
  asynchronous_.WakeReaders();
  events_.WakeReaders();
}

void CKralEventListener::TakePacket(Packet packet) {
  if (packet.size() < kSmallestPacket || packet.size() > kMaximumPacket) {
    Increment(dropped_by_size_);
    return;
  }
  // Callbacks and text logs may take long: readers have what came before this packet meanwhile.
  if (IsWatched()) OnBatchEnd();
  CallRawPacketCallback(packet);
  const uint8_t code = packet[0];
  if (code == kLogCode) OfferLog(packet);
  if (code == kEventReportCode && IsClaimed(packet)) {
    QueueResponse(std::move(packet), "ASYNC REC--listener--(%d bytes): %s");
  } else if (IsAsynchronousCode(code)) {
    QueueAsynchronous(std::move(packet));
  } else {
    QueueResponse(std::move(packet), "SYNC REC--listener--(%d bytes): %s");
  }
}

void CKralEventListener::OnPortGone() {
  asynchronous_.Interrupt();
  events_.Interrupt();
}

void CKralEventListener::OnPortOpened() {
  asynchronous_.ForgetInterrupt();
  events_.ForgetInterrupt();
}

bool CKralEventListener::IsWatched() const {
  return has_callbacks_ || log_.Wants(kLogIo | kLogAsync);
}

void CKralEventListener::QueueResponse(Packet packet, const char* format) {
  log_.WriteBytes(kLogIo, format, packet);
  // Whoever has the answer finds what came before it.
  asynchronous_.Publish();
  events_.Publish();
  responses_.Push(std::move(packet));
}

void CKralEventListener::QueueAsynchronous(Packet packet) {
  log_.WriteBytes(kLogAsync, "ASYNC REC (%d bytes): %s", packet);
  if (!collecting_) {
    Increment(dropped_not_collecting_);
    return;
  }
  const CollectionCallbacks callbacks = collection_callbacks();
  if (callbacks.packet != nullptr) {
    CallGuarded([&] { callbacks.packet(static_cast<uint32_t>(packet.size()), packet.data(), callbacks.value); });
  }
  if (packet[0] == kEventReportCode) QueueEvents(packet, callbacks);
  if (capture_ != nullptr) capture_->Append(packet);
  asynchronous_.Stage(std::move(packet));
}

void CKralEventListener::QueueEvents(std::span<const uint8_t> event_report, const CollectionCallbacks& callbacks) {
  const bool logging = log_.Wants(kLogAsync);
  EventReportReader reader(event_report);
  while (const auto event = reader.Next()) {
    if (logging) LogEvent(*event);
    if (callbacks.event != nullptr) {
      KRAL_EVENT record;
      std::memcpy(&record, event->record.bytes.data(), sizeof(record));
      CallGuarded([&] { callbacks.event(&record, callbacks.value); });
    }
    events_.Stage(event->record);
  }
}

void CKralEventListener::LogEvent(const Event& event) {
  try {
    log_.WriteLine(kLogAsync, "Event ID: %d, %s", event.id, EventText(event.id).c_str());
    log_.WriteLine(kLogAsync, " Event payload data: %s", HexDump(event.payload).c_str());
  } catch (const std::bad_alloc&) {
    // The text log goes without it.
  }
}

std::string CKralEventListener::EventText(uint16_t id) const {
  if (names_ == nullptr) return kNoEventText;
  const auto texts = names_->Get(NameTableKind::kEventTexts);
  const std::string* const text = texts->Find(id);
  return text != nullptr ? *text : kNoEventText;
}

TrafficCounters CKralEventListener::counters() const {
  TrafficCounters counters;
  counters.collected = asynchronous_.pushed();
  counters.events = events_.pushed();
  counters.dropped_asynchronous = asynchronous_.dropped();
  counters.dropped_events = events_.dropped();
  counters.dropped_responses = responses_.dropped();
  counters.dropped_not_collecting = dropped_not_collecting();
  counters.oversized = dropped_by_size();
  return counters;
}

void CKralEventListener::SetRawPacketCallback(RawPacketCallback callback, uintptr_t value) {
  const MutexLock lock(callback_mutex_);
  callback_ = callback;
  callback_value_ = value;
  NoteCallbacks();
}

void CKralEventListener::SetCollectionCallbacks(const CollectionCallbacks& callbacks) {
  const MutexLock lock(callback_mutex_);
  collection_callbacks_ = callbacks;
  NoteCallbacks();
}

void CKralEventListener::NoteCallbacks() {
  has_callbacks_ =
      callback_ != nullptr || collection_callbacks_.packet != nullptr || collection_callbacks_.event != nullptr;
}

CollectionCallbacks CKralEventListener::collection_callbacks() {
  const MutexLock lock(callback_mutex_);
  return collection_callbacks_;
}

void CKralEventListener::CallRawPacketCallback(std::span<const uint8_t> packet) {
  RawPacketCallback callback = nullptr;
  uintptr_t value = 0;
  {
    const MutexLock lock(callback_mutex_);
    callback = callback_;
    value = callback_value_;
  }
  if (callback == nullptr) return;
  CallGuarded([&] { callback(static_cast<uint32_t>(packet.size()), packet.data(), value); });
}

void CKralEventListener::AddEventHandler(EventHandler* handler) {
  const RecursiveLock lock(handlers_mutex_);
  event_handlers_.push_back(handler);
}

void CKralEventListener::RemoveEventHandler(EventHandler* handler) {
  const RecursiveLock lock(handlers_mutex_);
  std::erase(event_handlers_, handler);
}

void CKralEventListener::AddLogHandler(LogHandler* handler) {
  const RecursiveLock lock(handlers_mutex_);
  log_handlers_.push_back(handler);
}

void CKralEventListener::RemoveLogHandler(LogHandler* handler) {
  const RecursiveLock lock(handlers_mutex_);
  std::erase(log_handlers_, handler);
}

// By index, because a handler may remove itself.
bool CKralEventListener::IsClaimed(std::span<const uint8_t> event_report) {
  const RecursiveLock lock(handlers_mutex_);
  for (size_t i = 0; i < event_handlers_.size(); ++i) {
    if (event_handlers_[i]->Claims(event_report)) return true;
  }
  return false;
}

void CKralEventListener::OfferLog(std::span<const uint8_t> log_packet) {
  const RecursiveLock lock(handlers_mutex_);
  for (size_t i = 0; i < log_handlers_.size(); ++i) log_handlers_[i]->OnLog(log_packet);
}

}  // namespace kral
