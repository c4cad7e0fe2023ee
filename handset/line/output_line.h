// What is on its way to the host: whole frames, in the order and at the time they are due, handed out piece by piece.
#ifndef KRAL_HANDSET_LINE_OUTPUT_LINE_H
#define KRAL_HANDSET_LINE_OUTPUT_LINE_H

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>

#include "handset/line/bytes.h"
#include "platform/clock.h"

namespace kral::handset {

struct Outgoing {
  enum class Hold { kNone, kUntilNextRequest, kUntilNextReply };

  Bytes bytes;
  uint32_t delay_ms = 0;
  uint32_t lag_ms = 0;  // of work, one answer after the other
  size_t piece = 0;     // bytes handed out per read; 0: as many as fit
  uint32_t gap_ms = 0;  // between two pieces
  Hold hold = Hold::kNone;
};

// Thread-safe.
class OutputLine {
 public:
  static constexpr uint32_t kNever = UINT32_MAX;
  // What a host that never reads can pile up; whole frames beyond are dropped.
  static constexpr size_t kCapacity = size_t{16} << 20;

  explicit OutputLine(Clock& clock) : clock_(clock) {}

  void Queue(Outgoing outgoing);
  void OnRequest();  // lets go what was held back for it

  // Hands out what is due, several whole frames where they fit; never waits.
  size_t Take(std::span<uint8_t> buffer);
  uint32_t MillisecondsToNext() const;  // 0: something is due now; kNever: nothing is on its way
  // True when something is due; false after the time-out or a Wake, which is not lost when it comes first.
  bool Wait(uint32_t milliseconds);
  void Wake();
  void Clear();

  // Called after every change, with the line locked: it must not call back. Null takes it away.
  void SetListener(std::function<void()> listener);
  uint64_t dropped() const;

 private:
  struct Frame {
    Bytes bytes;
    uint32_t due = 0;  // tick
    size_t piece = 0;
    uint32_t gap_ms = 0;
    size_t taken = 0;
  };

  void Insert(Outgoing outgoing);
  bool IsDue(const Frame& frame) const;
  uint32_t MillisecondsToNextLocked() const;
  void Changed();

  Clock& clock_;
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::function<void()> listener_;
  std::deque<Frame> frames_;
  std::deque<Outgoing> held_for_request_;
  uint32_t busy_until_ = 0;  // tick; with work that lags
  bool lags_ = false;
  Bytes held_for_reply_;
  size_t queued_bytes_ = 0;
  uint64_t dropped_ = 0;
  bool woken_ = false;
};

}  // namespace kral::handset

#endif
