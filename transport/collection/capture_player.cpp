// The pace of a playback. What packets mean is left to the dispatcher's listeners, as for those from a port.
#include "transport/collection/capture_player.h"

#include <functional>
#include <utility>

#include "base/at_exit.h"
#include "base/guarded_call.h"
#include "platform/forced_unwind.h"
#include "transport/collection/event_report.h"
#include "transport/collection/kral_event_listener.h"
#include "transport/engine/kral_events.h"

namespace kral {
namespace {

// Packets between two looks at the queue that is waited for, and the room they may need in it.
constexpr uint64_t kLogBatch = 256;
constexpr uint64_t kEventBatch = 1;  // a report may hold a thousand events

constexpr uint32_t kDispatchMs = 100;
constexpr uint32_t kLeaveMs = 1000;
constexpr std::chrono::milliseconds kLookAgain{1};

static_assert(kEventBatch * kMaximumPacket / kSmallestEvent + 1 < kQueueCapacity);

}  // namespace

CapturePlayer::~CapturePlayer() {
  Stop();
}

bool CapturePlayer::Start(CaptureSource source, PlayPace pace, CKralEvents& dispatcher, CKralEventListener& sorter,
                          std::shared_ptr<void> owner, CaptureStretch stretch) {
  const MutexLock control(control_mutex_);
  if (!source || state_ == PlayState::kPlaying) return false;
  // Its end is told a moment before the thread has left.
  if (thread_.running() && !ended_.WaitFor(kLeaveMs)) return false;
  thread_.Join();
  {
    const MutexLock lock(mutex_);
    stop_requested_ = false;
  }
  played_ = 0;
  skipped_ = 0;
  ended_.Reset();
  sorter.SetCollection(true);
  // What is left out between two packets may be long.
  const auto until_stopped = [this, source = std::move(source)](std::span<uint8_t> buffer) {
    return GoesOn() ? source(buffer) : std::nullopt;
  };
  std::function<void()> body = [this, reader = CaptureReader(until_stopped, stretch),
                                line = Line{pace, dispatcher, sorter}]() mutable { Play(reader, line); };
  state_ = PlayState::kPlaying;
  if (thread_.Start(std::move(body), std::move(owner))) return true;
  state_ = PlayState::kStopped;
  return false;
}

void CapturePlayer::RequestStop() {
  const MutexLock lock(mutex_);
  stop_requested_ = true;
  changed_.NotifyAll();
}

bool CapturePlayer::Stop(uint32_t time_out_ms) {
  if (thread_id_.load() == std::this_thread::get_id()) {
    RequestStop();  // whoever else starts or stops may be waiting for this thread
    return true;
  }
  const MutexLock control(control_mutex_);
  if (thread_.running()) {
    RequestStop();
    if (!ended_.WaitFor(time_out_ms)) return false;
  }
  thread_.Join();
  return true;
}

void CapturePlayer::Play(CaptureReader& reader, const Line& line) {
  PlayState state = PlayState::kStopped;
  thread_id_ = std::this_thread::get_id();
  const AtExit ended([&] {
    thread_id_ = std::thread::id();
    state_ = state;
    ended_.Set();
  });
  try {
    state = Run(std::move(reader), line);
  } catch (...) {
    PassForcedUnwind();
    state = PlayState::kCut;  // out of memory
  }
}

PlayState CapturePlayer::Run(CaptureReader reader, const Line& line) {
  const uint64_t batch = line.pace == PlayPace::kForEventReader ? kEventBatch : kLogBatch;
  CaptureRecord record;
  previous_microseconds_ = 0;
  for (uint64_t records = 0;; ++records) {
    if (records % batch == 0 && !AwaitRoom(line)) return PlayState::kStopped;
    switch (reader.Next(record)) {
      case CaptureReader::Outcome::kRecord:
        break;
      case CaptureReader::Outcome::kEnd:
        return AwaitListeners(line) ? PlayState::kDone : PlayState::kStopped;
      case CaptureReader::Outcome::kCut:
        return GoesOn() && AwaitListeners(line) ? PlayState::kCut : PlayState::kStopped;
      case CaptureReader::Outcome::kForeign:
        return PlayState::kForeign;
    }
    if (!IsAsynchronousCode(record.packet.front())) {
      ++skipped_;
      continue;
    }
    if (line.pace == PlayPace::kAsRecorded && !AwaitTurn(record.microseconds)) return PlayState::kStopped;
    CallBack(record);
    if (!GoesOn()) return PlayState::kStopped;
    line.dispatcher.Push(record.packet);
    ++played_;
    ++played_in_all_;
  }
}

void CapturePlayer::SetCallback(KRAL_PLAYBACK_CALLBACK callback, uintptr_t value) {
  const MutexLock lock(mutex_);
  callback_ = callback;
  callback_value_ = value;
}

void CapturePlayer::CallBack(const CaptureRecord& record) {
  KRAL_PLAYBACK_CALLBACK callback = nullptr;
  uintptr_t value = 0;
  {
    const MutexLock lock(mutex_);
    callback = callback_;
    value = callback_value_;
  }
  if (callback == nullptr) return;
  const auto size = static_cast<uint32_t>(record.packet.size());
  CallGuarded([&] { callback(record.microseconds, size, record.packet.data(), value); });
}

// Also keeps the dispatcher's own queue, which has no bound, from taking in the whole file.
bool CapturePlayer::AwaitRoom(const Line& line) {
  const auto has_room = [&line] {
    if (!line.dispatcher.WaitUntilDispatched(kDispatchMs)) return false;
    if (line.pace == PlayPace::kForLogReader) return line.sorter.asynchronous().size() + kLogBatch <= kQueueCapacity;
    if (line.pace == PlayPace::kForEventReader) {
      return line.sorter.events().size() + kEventBatch * kMaximumPacket / kSmallestEvent <= kQueueCapacity;
    }
    return true;
  };
  if (!GoesOn()) return false;
  while (!has_room()) {
    if (!Sleep(kLookAgain)) return false;
  }
  return true;
}

// What was played is where its readers look for it before the end is told.
bool CapturePlayer::AwaitListeners(const Line& line) {
  while (!line.dispatcher.WaitUntilDispatched(kDispatchMs)) {
    if (!GoesOn()) return false;
  }
  return true;
}

// Clocks may have been set back while the capture ran: such a step takes no time.
bool CapturePlayer::AwaitTurn(uint64_t microseconds) {
  const uint64_t before = std::exchange(previous_microseconds_, microseconds);
  const auto now = std::chrono::steady_clock::now();
  if (before == 0 || microseconds < before) {
    previous_due_ = now;
    return true;
  }
  // A gap of more than a day is a damaged stamp, or a station's clock put right.
  constexpr uint64_t kLongestGap = uint64_t{24} * 3600 * 1000000;
  const uint64_t gap = microseconds - before;
  previous_due_ += std::chrono::microseconds(gap > kLongestGap ? 0 : gap);
  return previous_due_ <= now || Sleep(std::chrono::duration_cast<std::chrono::microseconds>(previous_due_ - now));
}

bool CapturePlayer::GoesOn() {
  const MutexLock lock(mutex_);
  return !stop_requested_;
}

bool CapturePlayer::Sleep(std::chrono::microseconds time) {
  MutexLock lock(mutex_);
  return !changed_.WaitFor(lock, time, [this]() KRAL_REQUIRES(mutex_) { return stop_requested_; });
}

}  // namespace kral
