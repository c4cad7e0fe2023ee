// Makes a handset talk: logs, event reports and messages at given rates, of what the host has switched on.
#ifndef KRAL_HANDSET_LOG_GENERATOR_H
#define KRAL_HANDSET_LOG_GENERATOR_H

#include <array>
#include <atomic>
#include <cstdint>
#include <thread>
#include <vector>

#include "handset/line/bytes.h"
#include "platform/clock.h"

namespace kral::handset {

class VirtualHandset;

// Packets per second of each kind. They come in bursts of so many at a time; the rate stays the same.
struct LogTraffic {
  double logs = 0;
  double reports = 0;
  double messages = 0;
  uint32_t burst = 1;
  size_t log_size = 64;      // bytes of a log packet, FCS not counted, at least 16
  size_t report_events = 8;  // events of a report: one of each form
};

// Of packets sent. A kind of which nothing is on is not sent, and does not pile up.
struct LogTrafficCount {
  uint64_t logs = 0;
  uint64_t reports = 0;
  uint64_t events = 0;
  uint64_t messages = 0;
  uint64_t packets() const { return logs + reports + messages; }
};

// The packets follow from the traffic and the masks alone: the same on every platform.
class LogGenerator {
 public:
  LogGenerator(VirtualHandset& handset, const LogTraffic& traffic) : handset_(handset), traffic_(traffic) {}

  // Sends what is due in so much time.
  void Advance(uint32_t milliseconds);
  const LogTrafficCount& sent() const { return sent_; }

  // --- Single packets, whatever the masks say ---
  static Bytes MakeLog(uint16_t code, uint64_t stamp, size_t size);
  // Forms 0 to 7: payloads of none, one, two and several bytes behind a full time stamp, then behind a truncated one.
  static void AddEvent(ByteWriter& events, uint16_t id, unsigned form, uint64_t stamp);
  static Bytes MakeReport(ByteView events);
  static Bytes MakeMessage(uint16_t category, uint64_t stamp);

 private:
  enum Kind { kLog, kReport, kMessage, kKinds };

  void LookAtMasks();
  void Send(Kind kind);
  uint16_t NextOf(Kind kind);

  VirtualHandset& handset_;
  const LogTraffic traffic_;
  uint64_t changes_seen_ = UINT64_MAX;
  std::array<std::vector<uint16_t>, kKinds> ids_;
  std::array<size_t, kKinds> next_{};
  std::array<double, kKinds> due_{};
  uint64_t stamp_ = 0;
  LogTrafficCount sent_;
};

// A generator that runs by the clock for as long as this lives.
class LiveTraffic {
 public:
  LiveTraffic(VirtualHandset& handset, const LogTraffic& traffic, Clock& clock = SystemClock());
  ~LiveTraffic();
  LiveTraffic(const LiveTraffic&) = delete;
  LiveTraffic& operator=(const LiveTraffic&) = delete;

  LogTrafficCount Stop();  // what was sent in all

 private:
  LogGenerator generator_;
  std::atomic<bool> stop_{false};
  std::thread thread_;
};

}  // namespace kral::handset

#endif
