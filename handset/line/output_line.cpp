// The line to the host as a queue in time. Frames may overtake each other, their bytes never mix.
#include "handset/line/output_line.h"

#include <algorithm>
#include <chrono>

namespace kral::handset {
namespace {

// Ticks wrap around after 49 days.
bool IsBefore(uint32_t tick, uint32_t other) {
  return static_cast<int32_t>(tick - other) < 0;
}

}  // namespace

void OutputLine::Queue(Outgoing outgoing) {
  const std::lock_guard lock(mutex_);
  if (queued_bytes_ + outgoing.bytes.size() > kCapacity) {
    ++dropped_;
    return;
  }
  queued_bytes_ += outgoing.bytes.size();
  switch (outgoing.hold) {
    case Outgoing::Hold::kUntilNextRequest:
      held_for_request_.push_back(std::move(outgoing));
      break;
    case Outgoing::Hold::kUntilNextReply:
      held_for_reply_.insert(held_for_reply_.end(), outgoing.bytes.begin(), outgoing.bytes.end());
      break;
    case Outgoing::Hold::kNone:
      if (!held_for_reply_.empty()) {
        outgoing.bytes.insert(outgoing.bytes.begin(), held_for_reply_.begin(), held_for_reply_.end());
        held_for_reply_.clear();
      }
      Insert(std::move(outgoing));
      Changed();
      break;
  }
}

void OutputLine::OnRequest() {
  const std::lock_guard lock(mutex_);
  if (held_for_request_.empty()) return;
  for (auto& outgoing : held_for_request_) Insert(std::move(outgoing));
  held_for_request_.clear();
  Changed();
}

size_t OutputLine::Take(std::span<uint8_t> buffer) {
  const std::lock_guard lock(mutex_);
  size_t count = 0;
  while (count < buffer.size() && !frames_.empty() && IsDue(frames_.front())) {
    Frame& frame = frames_.front();
    const size_t left = frame.bytes.size() - frame.taken;
    const size_t room = buffer.size() - count;
    // A frame is begun behind others only when it fits whole, so that reads end where frames end.
    if (count > 0 && (left > room || frame.piece != 0)) break;
    const size_t taken = std::min({left, room, frame.piece == 0 ? left : frame.piece});
    std::copy_n(frame.bytes.begin() + static_cast<std::ptrdiff_t>(frame.taken), taken,
                buffer.begin() + static_cast<std::ptrdiff_t>(count));
    count += taken;
    frame.taken += taken;
    const bool in_pieces = frame.piece != 0;
    if (frame.taken == frame.bytes.size()) {
      frames_.pop_front();
    } else {
      frame.due = clock_.TickMs() + frame.gap_ms;
    }
    if (in_pieces) break;
  }
  queued_bytes_ -= count;
  return count;
}

uint32_t OutputLine::MillisecondsToNext() const {
  const std::lock_guard lock(mutex_);
  return MillisecondsToNextLocked();
}

bool OutputLine::Wait(uint32_t milliseconds) {
  std::unique_lock lock(mutex_);
  const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(milliseconds);
  for (;;) {
    const uint32_t next = MillisecondsToNextLocked();
    if (next == 0) return true;
    if (woken_) break;
    const auto now = std::chrono::steady_clock::now();
    if (now >= end) break;
    changed_.wait_until(lock, next == kNever ? end : std::min(end, now + std::chrono::milliseconds(next)));
  }
  woken_ = false;
  return false;
}

void OutputLine::Wake() {
  const std::lock_guard lock(mutex_);
  woken_ = true;
  Changed();
}

void OutputLine::Clear() {
  const std::lock_guard lock(mutex_);
  frames_.clear();
  held_for_request_.clear();
  held_for_reply_.clear();
  queued_bytes_ = 0;
  Changed();
}

void OutputLine::SetListener(std::function<void()> listener) {
  const std::lock_guard lock(mutex_);
  listener_ = std::move(listener);
}

uint64_t OutputLine::dropped() const {
  const std::lock_guard lock(mutex_);
  return dropped_;
}

void OutputLine::Insert(Outgoing outgoing) {
  const uint32_t now = clock_.TickMs();
  lags_ = lags_ && IsBefore(now, busy_until_);
  uint32_t due = now + outgoing.delay_ms;
  if (outgoing.lag_ms > 0) due = (lags_ ? busy_until_ : now) + outgoing.lag_ms;
  if (lags_ && IsBefore(due, busy_until_)) due = busy_until_;
  if (outgoing.lag_ms > 0) {
    busy_until_ = due;
    lags_ = true;
  }
  // Nothing goes in front of a frame whose first bytes have left.
  const auto first = frames_.begin() + (!frames_.empty() && frames_.front().taken > 0 ? 1 : 0);
  auto place = frames_.end();
  while (place != first && IsBefore(due, std::prev(place)->due)) --place;
  frames_.insert(place, Frame{std::move(outgoing.bytes), due, outgoing.piece, outgoing.gap_ms, 0});
}

bool OutputLine::IsDue(const Frame& frame) const {
  return !IsBefore(clock_.TickMs(), frame.due);
}

uint32_t OutputLine::MillisecondsToNextLocked() const {
  if (frames_.empty()) return kNever;
  const uint32_t now = clock_.TickMs();
  return IsBefore(now, frames_.front().due) ? frames_.front().due - now : 0;
}

void OutputLine::Changed() {
  changed_.notify_all();
  if (listener_) listener_();
}

}  // namespace kral::handset
