// Writes collected packets to a capture file, on a thread of its own: the thread that hands packets over never waits
// for a disk.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "base/event.h"
#include "base/mutex.h"
#include "base/worker_thread.h"

namespace kral {

class DataLogFileHandler;

// Takes bytes to where they are kept, and gives the number of those taken; fewer than given: it takes no more.
// Destroyed with the end of the capture.
using CaptureSink = std::function<size_t(std::span<const uint8_t> bytes)>;

// A file of that name, emptied first; an empty function when it cannot be opened, and when another capture writes it or
// it is played.
CaptureSink OpenCaptureFile(const std::string& path);

enum class CaptureState : uint8_t {
  kNone,
  kRunning,
  kEnding,  // takes no more packets, and has not written all of those it took
};

// Callable from any thread.
class CaptureWriter {
 public:
  // What waits for the disk at most; packets beyond are lost, and counted.
  static constexpr size_t kDefaultRoom = size_t{16} << 20;

  explicit CaptureWriter(DataLogFileHandler& log, size_t room = kDefaultRoom) : log_(log), room_(room) {}
  ~CaptureWriter();
  CaptureWriter(const CaptureWriter&) = delete;
  CaptureWriter& operator=(const CaptureWriter&) = delete;

  // False when nothing can be opened or the head not be written; and, with nothing opened, while another capture runs
  // or is ending: its file may be the same one. `owner` holds this object, and is kept alive by the thread until it
  // ends.
  bool Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner);
  void Append(std::span<const uint8_t> packet);
  // Waits at most so long for what is left to be written. True when every packet of the capture is in the file; after
  // false, state() tells whether there is more to wait for in another call.
  bool Stop(uint32_t time_out_ms = 1000);

  CaptureState state() const { return state_.load(std::memory_order_relaxed); }
  uint64_t pending() const { return pending_packets_.load(std::memory_order_relaxed); }  // not yet in either of these:
  // Over all captures of this object.
  uint64_t written() const { return written_.load(std::memory_order_relaxed); }
  uint64_t lost() const { return lost_.load(std::memory_order_relaxed); }

 private:
  struct Batch {
    std::vector<uint8_t> records;
    uint64_t packets = 0;
  };

  void Run();
  bool TakeBatch(Batch& batch);
  size_t WriteInSlices(std::span<const uint8_t> bytes);
  void WriteBatch(const Batch& batch, bool& failed);
  void Lose(uint64_t packets, const char* reason);

  DataLogFileHandler& log_;
  const size_t room_;
  std::atomic<CaptureState> state_{CaptureState::kNone};  // changed under control_mutex_
  std::atomic<uint64_t> pending_packets_{0};
  std::atomic<uint64_t> written_{0};
  std::atomic<uint64_t> lost_{0};
  std::atomic<bool> loss_told_{false};  // in the text log, once for each capture

  Mutex control_mutex_;  // one start or stop at a time
  uint64_t lost_before_ KRAL_GUARDED_BY(control_mutex_) = 0;

  Mutex mutex_;
  Condition changed_;
  Batch pending_ KRAL_GUARDED_BY(mutex_);
  bool stop_requested_ KRAL_GUARDED_BY(mutex_) = false;

  CaptureSink sink_;  // the thread's own while it runs
  ManualResetEvent ended_{"KRAL_CAPTURE_ENDED"};
  WorkerThread thread_;  // last: nothing above may be gone while it is parked
};

}  // namespace kral

#endif
