// Brings records into a file on a thread of its own: whoever hands them over never waits for a disk. What a record
// looks like is the derived class's affair.
#ifndef KRAL_TRANSPORT_COLLECTION_BATCH_WRITER_H
#define KRAL_TRANSPORT_COLLECTION_BATCH_WRITER_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "base/event.h"
#include "base/mutex.h"
#include "base/worker_thread.h"

namespace kral {

// Where bytes are kept. Destroyed with the end of the file.
class CaptureSink {
 public:
  // Gives the number of the bytes taken; fewer than given: it takes no more.
  using Append = std::function<size_t(std::span<const uint8_t> bytes)>;
  // Of what was taken before. Nothing is appended behind it.
  using Rewrite = std::function<void(size_t offset, std::span<const uint8_t> bytes)>;

  CaptureSink() = default;
  explicit CaptureSink(Append append, Rewrite rewrite = {})
      : append_(std::move(append)), rewrite_(std::move(rewrite)) {}

  explicit operator bool() const { return static_cast<bool>(append_); }
  size_t operator()(std::span<const uint8_t> bytes) const { return append_(bytes); }
  void RewriteAt(size_t offset, std::span<const uint8_t> bytes) const {
    if (rewrite_) rewrite_(offset, bytes);
  }

 private:
  Append append_;
  Rewrite rewrite_;
};

// A file of that name, emptied first; an empty function when it cannot be opened, and when somebody else writes or
// plays it.
CaptureSink OpenCaptureFile(const std::string& path);
// The same of a name that nothing has yet; std::errc::file_exists where something has.
std::error_code MakeCaptureFile(const std::string& path, CaptureSink& sink);

enum class CaptureState : uint8_t {
  kNone,
  kRunning,
  kEnding,  // takes no more records, and has not written all of those it took
};

// Since 1970 UTC, by the clock of this machine.
uint64_t MicrosecondsNow();

// Callable from any thread. The destructor of the derived class ends the thread: it still needs the class's functions.
class BatchWriter {
 public:
  // What waits for the disk at most.
  static constexpr size_t kDefaultRoom = size_t{16} << 20;

  explicit BatchWriter(size_t room) : room_(room) {}
  virtual ~BatchWriter() = default;
  BatchWriter(const BatchWriter&) = delete;
  BatchWriter& operator=(const BatchWriter&) = delete;

  // False when nothing can be opened or begun; and, with nothing opened, while another file runs or is ending: it may
  // be the same one. `owner` holds this object, and is kept alive by the thread until it ends.
  bool Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner);

  CaptureState state() const { return state_.load(std::memory_order_relaxed); }
  uint64_t pending() const { return pending_records_.load(std::memory_order_relaxed); }  // not yet through WriteBatch

 protected:
  struct Batch {
    std::vector<uint8_t> bytes;
    uint64_t records = 0;
  };

  enum class Added : uint8_t { kKept, kNoRoom, kEnded };
  enum class Ended : uint8_t { kNone, kNotYet, kDone };  // kNone: nothing was running

  // A record is its head and its body.
  Added Add(std::span<const uint8_t> head, std::span<const uint8_t> body);
  // Takes no more records, and waits at most so long for what is left.
  Ended End(uint32_t time_out_ms);

  // Of the file just opened, on the thread that starts it; false when it takes not even its beginning.
  virtual bool OnBegin() = 0;
  // On the writer's thread, which an exception would end. The records of a batch count as pending until it comes back.
  virtual void OnBatch(const Batch& batch) = 0;
  virtual void OnEnd() {}  // behind the last batch, on the same thread

  // For these three. Gives the number of bytes taken.
  size_t Write(std::span<const uint8_t> bytes);
  // What stands there in the file, which ends with it.
  void RewriteAt(size_t offset, std::span<const uint8_t> bytes) { sink_.RewriteAt(offset, bytes); }
  // Closes the file, and goes on in another. False when that cannot be opened: then nothing more may be written.
  bool GoOnIn(const std::function<CaptureSink()>& open);

 private:
  void Run();
  bool TakeBatch(Batch& batch);

  const size_t room_;
  std::atomic<CaptureState> state_{CaptureState::kNone};  // changed under control_mutex_
  std::atomic<uint64_t> pending_records_{0};

  Mutex control_mutex_;  // one start or stop at a time

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
