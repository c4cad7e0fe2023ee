// Sorts packets into the queues by their first byte. How the queues are emptied is left to the engine and to the
// collection functions.
#include "transport/kral_event_listener.h"

#include <algorithm>
#include <utility>

#include "frame/base/hex_dump.h"
#include "frame/base/text_log.h"
#include "transport/event_report.h"

namespace kral {
namespace {

// First bytes of what a handset sends unasked, beside event reports.
constexpr uint8_t kLogCode = 16;
constexpr uint8_t kAsynchronousCodes[] = {kLogCode, 31, 121, 146};

constexpr size_t kSmallestPacket = 2;

// Until a table of event texts is loaded.
constexpr char kNoEventText[] = "no text";

bool IsAsynchronous(uint8_t code) {
  return std::find(std::begin(kAsynchronousCodes), std::end(kAsynchronousCodes), code) != std::end(kAsynchronousCodes);
}

void Increment(std::atomic<uint64_t>& counter) {
  counter.fetch_add(1, std::memory_order_relaxed);
}

}  // namespace

CKralEventListener::CKralEventListener(PacketQueue& responses, PacketQueue& asynchronous,
                                       BoundedQueue<EventRecord>& events)
    : responses_(responses), asynchronous_(asynchronous), events_(events) {}

void CKralEventListener::OnPacket(std::span<const uint8_t> packet) {
  TakePacket({packet.begin(), packet.end()});
}

void CKralEventListener::TakePacket(Packet packet) {
  if (packet.size() < kSmallestPacket || packet.size() > kMaximumPacket) {
    Increment(dropped_by_size_);
    return;
  }
  CallRawPacketCallback(packet);
  const uint8_t code = packet[0];
  if (code == kLogCode) OfferLog(packet);
  if (code == kEventReportCode && IsClaimed(packet)) {
    QueueResponse(std::move(packet), "ASYNC REC--listener--(%d bytes): %s");
  } else if (code == kEventReportCode || IsAsynchronous(code)) {
    QueueAsynchronous(std::move(packet));
  } else {
    QueueResponse(std::move(packet), "SYNC REC--listener--(%d bytes): %s");
  }
}

void CKralEventListener::QueueResponse(Packet packet, const char* format) {
  LogPacket(kLogIo, format, packet);
  responses_.Push(std::move(packet));
}

void CKralEventListener::QueueAsynchronous(Packet packet) {
  LogPacket(kLogAsync, "ASYNC REC (%d bytes): %s", packet);
  if (!collecting_) {
    Increment(dropped_not_collecting_);
    return;
  }
  if (packet[0] == kEventReportCode) QueueEvents(packet);
  asynchronous_.Push(std::move(packet));
}

void CKralEventListener::QueueEvents(std::span<const uint8_t> event_report) {
  DataLogFileHandler* const log = log_;
  const bool logging = log != nullptr && log->Wants(kLogAsync);
  EventReportReader reader(event_report);
  while (const auto event = reader.Next()) {
    if (logging) {
      log->WriteLine(kLogAsync, "Event ID: %d, %s", event->id, kNoEventText);
      log->WriteLine(kLogAsync, " Event payload data: %s", HexDump(event->payload).c_str());
    }
    events_.Push(event->record);
  }
}

void CKralEventListener::LogPacket(uint32_t flag, const char* format, std::span<const uint8_t> packet) {
  DataLogFileHandler* const log = log_;
  if (log == nullptr || !log->Wants(flag)) return;
  log->WriteLine(flag, format, static_cast<int>(packet.size()), HexDump(packet).c_str());
}

void CKralEventListener::SetRawPacketCallback(RawPacketCallback callback, uintptr_t value) {
  const std::lock_guard lock(callback_mutex_);
  callback_ = callback;
  callback_value_ = value;
}

void CKralEventListener::CallRawPacketCallback(std::span<const uint8_t> packet) {
  RawPacketCallback callback = nullptr;
  uintptr_t value = 0;
  {
    const std::lock_guard lock(callback_mutex_);
    callback = callback_;
    value = callback_value_;
  }
  if (callback != nullptr) callback(static_cast<uint32_t>(packet.size()), packet.data(), value);
}

void CKralEventListener::AddEventHandler(EventHandler* handler) {
  const std::lock_guard lock(handlers_mutex_);
  event_handlers_.push_back(handler);
}

void CKralEventListener::RemoveEventHandler(EventHandler* handler) {
  const std::lock_guard lock(handlers_mutex_);
  std::erase(event_handlers_, handler);
}

void CKralEventListener::AddLogHandler(LogHandler* handler) {
  const std::lock_guard lock(handlers_mutex_);
  log_handlers_.push_back(handler);
}

void CKralEventListener::RemoveLogHandler(LogHandler* handler) {
  const std::lock_guard lock(handlers_mutex_);
  std::erase(log_handlers_, handler);
}

// By index, because a handler may remove itself.
bool CKralEventListener::IsClaimed(std::span<const uint8_t> event_report) {
  const std::lock_guard lock(handlers_mutex_);
  for (size_t i = 0; i < event_handlers_.size(); ++i) {
    if (event_handlers_[i]->Claims(event_report)) return true;
  }
  return false;
}

void CKralEventListener::OfferLog(std::span<const uint8_t> log_packet) {
  const std::lock_guard lock(handlers_mutex_);
  for (size_t i = 0; i < log_handlers_.size(); ++i) log_handlers_[i]->OnLog(log_packet);
}

}  // namespace kral
