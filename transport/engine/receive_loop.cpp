// The receive thread's loop, in both receive modes. Starting, pausing and stopping it is the connection's affair.
#include "transport/engine/receive_loop.h"

#include <chrono>

#include "base/at_exit.h"
#include "base/text_log.h"
#include "platform/forced_unwind.h"
#include "transport/engine/thread_control.h"
#include "transport/line/chunk_splitter.h"
#include "transport/line/hdlc_framer.h"
#include "transport/line/serial_port.h"

namespace kral {
namespace {

// What matters to an idle connection ends its wait: it costs no processor time at all.
constexpr uint32_t kUntilSomethingHappens = UINT32_MAX;

// Between two looks at a caller's transport that tells of nothing.
constexpr uint32_t kPollEveryMs = 1;

// How long the thread stands aside for a request that may follow: traffic that nobody asked for waits as long.
constexpr uint32_t kAsideMs = 5;

// More than a conversation leaves behind; a flood is the receive thread's.
constexpr int kFewReads = 4;

}  // namespace

void ReceiveLoop::Run() {
  // Also when its host ends the thread inside a function of its own.
  const AtExit left([this] { control_.AcknowledgeStop(); });
  thread_ = std::this_thread::get_id();
  acknowledged_pause_ = 0;
  sleep_counter_ = 0;
  turn_.Reset();
  while (!control_.stop_requested()) {
    const uint32_t changes_seen = control_.changes();
    const bool wake_on_data = mode_ == ReceiveMode::kWakeOnData;
    if (!wake_on_data) SleepByRule();
    if (IsPaused()) {
      if (wake_on_data) control_.WaitForChange(changes_seen, kUntilSomethingHappens);
      continue;
    }
    if (!wake_on_data) {
      ReadChunk();
    } else if (port_.user_defined()) {
      ReadFromCaller(changes_seen);
    } else if (WaitForBytes(changes_seen) && !ReadChunk()) {
      clock_.SleepMs(1);  // nothing came where something was promised
    }
    if (port_.CloseIfGone() && on_gone_) on_gone_();
    if (wake_on_data) StandAside(changes_seen);
  }
  log_.WriteLine(kLogFn, "THREAD: Stop thread request detected, setting stop ACK event");
}

// The counter moves only when the thread sleeps: with a divisor of 1 every turn sleeps, with a larger one only the
// first. Kept exactly.
void ReceiveLoop::SleepByRule() {
  if (sleep_counter_ % sleep_divisor_ != 0) return;
  clock_.SleepMs(1);
  ++sleep_counter_;
}

bool ReceiveLoop::IsPaused() {
  const uint32_t wanted = control_.pause_wanted();
  if (wanted == 0) return false;
  if (wanted != acknowledged_pause_) {
    acknowledged_pause_ = wanted;
    log_.WriteLine(kLogFn, "THREAD: Pause Detected, Pause ACK event set attempt");
    control_.AcknowledgePause();
    log_.WriteLine(kLogFn, "THREAD: Pause ACK event set complete");
  }
  return true;
}

// True when the port is to be read.
bool ReceiveLoop::WaitForBytes(uint32_t changes_seen) {
  if (port_.IsOpen() == 0) {
    control_.WaitForChange(changes_seen, kUntilSomethingHappens);
    return false;
  }
  return !port_.gone() && port_.WaitReadable(kUntilSomethingHappens);
}

// A caller's functions cannot be waited on, so the caller waits, tells of bytes, or is asked again and again. Bytes of
// which it tells while it is asked end the wait that follows.
void ReceiveLoop::ReadFromCaller(uint32_t changes_seen) {
  if (port_.IsOpen() == 0) return control_.WaitForChange(changes_seen, kUntilSomethingHappens);
  const uint32_t longest_wait = callers_wait_ms_;
  const uint32_t start = clock_.TickMs();
  if (ReadChunk()) return;
  const bool has_waited = longest_wait > 0 && clock_.TickMs() - start > 0;
  if (has_waited) return;
  const bool is_told = caller_notifies_ && longest_wait == 0;
  control_.WaitForChange(changes_seen, is_told ? kUntilSomethingHappens : kPollEveryMs);
}

// Whatever is asked of the thread meanwhile is a change.
void ReceiveLoop::StandAside(uint32_t changes_seen) {
  if (port_.user_defined() || !turn_.StandAside()) return;
  do {
    control_.WaitForChange(changes_seen, kAsideMs);
  } while (!turn_.Resume(control_.changes() != changes_seen));
}

bool ReceiveLoop::TakeTurn() {
  return mode_ == ReceiveMode::kWakeOnData && !port_.user_defined() && turn_.Take();
}

void ReceiveLoop::ReadHere(std::chrono::milliseconds time_out, const std::function<bool()>& done) {
  using std::chrono::steady_clock;
  if (!TakeTurn()) return;
  const auto end = steady_clock::now() + time_out;
  bool is_done = done();
  const AtExit given_back([&] {
    turn_.GiveBack();
    // A time-out, a device that is gone, or something that is asked of the thread: all of it is the thread's.
    if (!is_done) control_.Notify();
  });
  while (!is_done && turn_.is_quiet()) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - steady_clock::now()).count();
    if (left <= 0 || !port_.WaitReadable(static_cast<uint32_t>(left)) || !ReadChunk()) break;
    is_done = done();
  }
}

void ReceiveLoop::ReadWaiting() {
  if (!TakeTurn()) return;
  bool is_empty = false;
  const AtExit given_back([&] {
    turn_.GiveBack();
    if (!is_empty) control_.Notify();
  });
  for (int i = 0; i < kFewReads && turn_.is_quiet() && !is_empty; ++i) {
    is_empty = !port_.HasInput() || !ReadChunk();
  }
}

void ReceiveLoop::TakeBack() {
  if (turn_.is_aside()) control_.Notify();
}

void ReceiveLoop::ForgetCaller() {
  callers_wait_ms_ = 0;
  caller_notifies_ = false;
}

void ReceiveLoop::NotifyReceived() {
  // In the receive function itself it tells nothing: what brings bytes is asked again anyway, and what brings none and
  // tells of some would be asked for ever.
  if (on_thread()) return;
  caller_notifies_ = true;
  control_.Notify();
}

bool ReceiveLoop::ReadChunk() {
  uint32_t count = static_cast<uint32_t>(buffer_.size());
  if (framer_.ReceiveRaw(buffer_.data(), count, read_time_out_ms_) == 0 || count == 0) return false;
  // A caller's function may come back long after the stop: nobody waits for these bytes any more.
  if (control_.stop_requested()) return true;
  SetSplitting(true);
  bytes_received_.fetch_add(count, std::memory_order_relaxed);
  try {
    Split(count);
  } catch (...) {
    PassForcedUnwind();
    // Out of memory: the chunk is lost, and the thread must not be.
    splitter_.DropPartialPacket();
  }
  SetSplitting(false);
  return true;
}

void ReceiveLoop::SetSplitting(bool splitting) {
  const MutexLock lock(chunk_mutex_);
  splitting_ = splitting;
  if (splitting) return;
  ++chunks_;
  chunk_done_.NotifyAll();
}

bool ReceiveLoop::WaitForChunk(uint32_t time_out_ms) {
  MutexLock lock(chunk_mutex_);
  return chunk_done_.WaitFor(lock, std::chrono::milliseconds(time_out_ms),
                             [this, chunk = chunks_]()
                                 KRAL_REQUIRES(chunk_mutex_) { return !splitting_ || chunks_ != chunk; });
}

void ReceiveLoop::Split(uint32_t count) {
  const std::span<const uint8_t> chunk(buffer_.data(), count);
  log_.WriteBytes(kLogIo, "THREAD READ (%d bytes): %s ", chunk);
  splitter_.Feed(chunk);
}

}  // namespace kral
