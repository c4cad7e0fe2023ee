// Builds the packets that a handset sends unasked. Which ones it may send is the log service's.
#include "handset/log_generator.h"

#include <algorithm>
#include <string_view>

#include "handset/services/log_service.h"
#include "handset/virtual_handset.h"

namespace kral::handset {
namespace {

constexpr uint8_t kLogCode = 16;
constexpr uint8_t kReportCode = 96;
constexpr uint8_t kMessageCode = 121;
constexpr size_t kLogHeader = 16;
constexpr unsigned kForms = 8;
constexpr std::string_view kMessageText = "reading %d";
constexpr std::string_view kMessageFile = "radio.c";

// A generator that could not run for long does not make up for all of it.
constexpr uint32_t kLongestStepMs = 1000;

void AddStamp(ByteWriter& writer, uint64_t stamp) {
  writer.U32(static_cast<uint32_t>(stamp)).U32(static_cast<uint32_t>(stamp >> 32));
}

}  // namespace

// 16, zero, the length of the rest (u16) twice, the code (u16), time stamp (8 bytes), payload.
Bytes LogGenerator::MakeLog(uint16_t code, uint64_t stamp, size_t size) {
  size = std::max(size, kLogHeader);
  const auto length = static_cast<uint32_t>(size - 4);
  ByteWriter log;
  log.U8(kLogCode).U8(0).U16(length).U16(length).U16(code);
  AddStamp(log, stamp);
  for (size_t i = kLogHeader; i < size; ++i) log.U8(static_cast<uint32_t>((stamp + i * 37) & 0xFF));
  return log.Take();
}

void LogGenerator::AddEvent(ByteWriter& events, uint16_t id, unsigned form, uint64_t stamp) {
  const unsigned payload_form = form % 4;
  const bool truncated = form % kForms >= 4;
  events.U16((id & 0x0FFFU) | payload_form << 13 | (truncated ? 0x8000U : 0U));
  if (truncated) {
    events.U16(static_cast<uint32_t>(stamp & 0xFFFF));
  } else {
    AddStamp(events, stamp);
  }
  const uint32_t length = payload_form == 3 ? static_cast<uint32_t>(stamp % 12) : payload_form;
  if (payload_form == 3) events.U8(length);
  for (uint32_t i = 0; i < length; ++i) events.U8(static_cast<uint32_t>((stamp + i) & 0xFF));
}

Bytes LogGenerator::MakeReport(ByteView events) {
  return ByteWriter().U8(kReportCode).U16(static_cast<uint32_t>(events.size())).Raw(events).Take();
}

// 121, kind of time stamp, number of arguments, messages dropped, time stamp, line (u16), category (u16), level (u32),
// the arguments (u32 each), text and file name.
Bytes LogGenerator::MakeMessage(uint16_t category, uint64_t stamp) {
  ByteWriter message;
  message.U8(kMessageCode).U8(0).U8(1).U8(0);
  AddStamp(message, stamp);
  message.U16(100).U16(category).U32(1).U32(static_cast<uint32_t>(stamp));
  return message.Terminated(kMessageText).Terminated(kMessageFile).Take();
}

void LogGenerator::Advance(uint32_t milliseconds) {
  LookAtMasks();
  const double seconds = std::min(milliseconds, kLongestStepMs) / 1000.0;
  const std::array<double, kKinds> rates = {traffic_.logs, traffic_.reports, traffic_.messages};
  const double burst = std::max(traffic_.burst, 1U);
  for (const Kind kind : {kLog, kReport, kMessage}) {
    if (ids_[kind].empty()) continue;
    due_[kind] += rates[kind] * seconds;
    for (; due_[kind] >= burst; due_[kind] -= burst) {
      for (uint32_t i = 0; i < std::max(traffic_.burst, 1U); ++i) Send(kind);
    }
  }
}

void LogGenerator::LookAtMasks() {
  LogService& service = handset_.logs();
  const uint64_t changes = service.changes();
  if (changes == changes_seen_) return;
  changes_seen_ = changes;
  ids_ = {service.logs(), service.events(), service.categories()};
}

uint16_t LogGenerator::NextOf(Kind kind) {
  return ids_[kind][next_[kind]++ % ids_[kind].size()];
}

void LogGenerator::Send(Kind kind) {
  ++stamp_;
  switch (kind) {
    case kLog:
      handset_.SendPacket(MakeLog(NextOf(kLog), stamp_, traffic_.log_size));
      ++sent_.logs;
      break;
    case kReport: {
      ByteWriter events;
      for (size_t i = 0; i < traffic_.report_events; ++i) {
        AddEvent(events, NextOf(kReport), static_cast<unsigned>(sent_.events++ % kForms), stamp_);
      }
      handset_.SendPacket(MakeReport(events.Take()));
      ++sent_.reports;
      break;
    }
    case kMessage:
      handset_.SendPacket(MakeMessage(NextOf(kMessage), stamp_));
      ++sent_.messages;
      break;
    case kKinds:
      break;
  }
}

LiveTraffic::LiveTraffic(VirtualHandset& handset, const LogTraffic& traffic, Clock& clock)
    : generator_(handset, traffic), thread_([this, &clock] {
        uint32_t last = clock.TickMs();
        while (!stop_) {
          clock.SleepMs(1);
          const uint32_t now = clock.TickMs();
          generator_.Advance(now - last);
          last = now;
        }
      }) {}

LiveTraffic::~LiveTraffic() {
  Stop();
}

LogTrafficCount LiveTraffic::Stop() {
  stop_ = true;
  if (thread_.joinable()) thread_.join();
  return generator_.sent();
}

}  // namespace kral::handset
