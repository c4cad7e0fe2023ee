// Plays a capture file into a connection: its packets go the way of those that come from a port.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_PLAYER_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_PLAYER_H

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <thread>

#include "base/event.h"
#include "base/mutex.h"
#include "base/worker_thread.h"
#include "kral/log.h"
#include "transport/collection/capture_reader.h"

namespace kral {

class CKralEvents;
class CKralEventListener;

enum class PlayPace : uint32_t {
  kForLogReader = 0,    // waits for room in the asynchronous queue: nothing is dropped from it
  kForEventReader = 1,  // the same for the event queue
  kAsRecorded = 2,      // with the time between packets as it was
  kAtOnce = 3,
};
inline constexpr uint32_t kPlayPaceCount = 4;

enum class PlayState : int32_t {
  kIdle = 0,  // nothing was played yet
  kPlaying = 1,
  kDone = 2,
  kCut = 3,      // played up to the last whole packet of a file that is cut
  kForeign = 4,  // not a capture file
  kStopped = 5,
};

// Callable from any thread.
class CapturePlayer {
 public:
  CapturePlayer() = default;
  ~CapturePlayer();
  CapturePlayer(const CapturePlayer&) = delete;
  CapturePlayer& operator=(const CapturePlayer&) = delete;

  // Turns collection on and plays on a thread of its own, which keeps `owner` alive: it holds this object, the
  // dispatcher and the sorter. False without a source, and while another file is played.
  bool Start(CaptureSource source, PlayPace pace, CKralEvents& dispatcher, CKralEventListener& sorter,
             std::shared_ptr<void> owner, CaptureStretch stretch = {});
  // False when the thread, held up in a listener, did not end in time. Called by the callback, it waits for nothing:
  // the playback ends in front of the packet that the callback was shown.
  bool Stop(uint32_t time_out_ms = 1000);

  // Called on the thread with every packet just before it is played. A call that is under way when it is changed ends.
  void SetCallback(KRAL_PLAYBACK_CALLBACK callback, uintptr_t value);

  PlayState state() const { return state_; }
  uint64_t played() const { return played_.load(std::memory_order_relaxed); }  // of the last file
  uint64_t played_in_all() const { return played_in_all_.load(std::memory_order_relaxed); }
  // Records that are no asynchronous packets. They are left out: one could be taken for the answer to a request.
  uint64_t skipped() const { return skipped_.load(std::memory_order_relaxed); }

 private:
  struct Line {
    PlayPace pace;
    CKralEvents& dispatcher;
    CKralEventListener& sorter;
  };

  void Play(CaptureReader& reader, const Line& line);
  PlayState Run(CaptureReader reader, const Line& line);  // the file is closed when it has ended
  void CallBack(const CaptureRecord& record);
  bool AwaitRoom(const Line& line);
  bool AwaitListeners(const Line& line);
  bool AwaitTurn(uint64_t microseconds);
  bool Sleep(std::chrono::microseconds time);  // false when it was told to stop
  bool GoesOn();                               // so does this
  void RequestStop();

  Mutex control_mutex_;  // one start or stop at a time
  Mutex mutex_;
  Condition changed_;
  bool stop_requested_ KRAL_GUARDED_BY(mutex_) = false;
  KRAL_PLAYBACK_CALLBACK callback_ KRAL_GUARDED_BY(mutex_) = nullptr;
  uintptr_t callback_value_ KRAL_GUARDED_BY(mutex_) = 0;

  std::atomic<PlayState> state_{PlayState::kIdle};
  std::atomic<uint64_t> played_{0};
  std::atomic<uint64_t> played_in_all_{0};
  std::atomic<uint64_t> skipped_{0};

  std::atomic<std::thread::id> thread_id_;  // of the thread that plays
  uint64_t previous_microseconds_ = 0;      // the thread's own
  std::chrono::steady_clock::time_point previous_due_;
  ManualResetEvent ended_{"KRAL_PLAYBACK_ENDED"};
  WorkerThread thread_;  // last: nothing above may be gone while it is parked
};

}  // namespace kral

#endif
