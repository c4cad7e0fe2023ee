// Writes what passes over a port into a pcapng file, or keeps the latest of it in memory until somebody wants it.
#ifndef KRAL_TRANSPORT_TRACE_TRACE_WRITER_H
#define KRAL_TRANSPORT_TRACE_TRACE_WRITER_H

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "transport/collection/batch_writer.h"
#include "transport/line/port_tap.h"
#include "transport/trace/traffic_splitter.h"

namespace kral {

class DataLogFileHandler;

struct TraceOrigin {
  std::string application;  // that writes the file
  std::string port;         // "COM7"
  std::string description;
};

struct TraceCounters {
  uint64_t frames = 0;      // written, bad ones included
  uint64_t bad = 0;         // of these
  uint64_t others = 0;      // runs of bytes that are no frame
  uint64_t lost = 0;        // frames, and reads and writes without frames, that are not in the file
  uint64_t lost_bytes = 0;  // that the disk was too slow for
};

// Makes the file of what the splitter gives.
class TraceFile {
 public:
  using Write = std::function<size_t(std::span<const uint8_t> bytes)>;

  TraceFile() : splitter_([this](const TrafficRecord& record) { Append(record); }) {}
  TraceFile(const TraceFile&) = delete;
  TraceFile& operator=(const TraceFile&) = delete;

  bool Begin(const TraceOrigin& origin, const Write& write);  // false when the file takes not even its beginning
  void Take(std::span<const uint8_t> pieces, const Write& write);
  void End(uint64_t microseconds, uint64_t lost_before, const Write& write);

  // What became of the last Take and End, which no lack of memory keeps from going on.
  struct Outcome {
    uint64_t frames = 0;
    uint64_t bad = 0;
    uint64_t others = 0;
    uint64_t cut = 0;        // frames of which a gap has left only the end
    uint64_t unwritten = 0;  // records that the file did not take
    uint64_t unmade = 0;     // frames and others that there was no memory for
  };
  Outcome TakeOutcome();

 private:
  struct Done {
    size_t end;  // of the block in the buffer
    TrafficRecord::Kind kind;
  };

  void Append(const TrafficRecord& record);
  void AppendBlock(const TrafficRecord& record);
  void AppendStatistics(uint64_t microseconds, uint64_t lost);
  void WriteOut(const Write& write);

  TrafficSplitter splitter_;
  std::vector<uint8_t> buffer_;
  std::vector<Done> done_;
  Outcome outcome_;
  uint64_t cut_told_ = 0;
  std::array<uint64_t, 2> received_{};  // records of each interface
  bool failed_ = false;
};

// Callable from any thread; the tap's functions from those that read and write.
class TraceWriter final : public BatchWriter, public PortTap {
 public:
  explicit TraceWriter(DataLogFileHandler& log, size_t room = kDefaultRoom) : BatchWriter(room), log_(log) {}
  ~TraceWriter() override;
  TraceWriter(const TraceWriter&) = delete;
  TraceWriter& operator=(const TraceWriter&) = delete;

  // As BatchWriter's, and false as well while the latest traffic is kept.
  bool Start(const TraceOrigin& origin, const std::function<CaptureSink()>& open, std::shared_ptr<void> owner);
  // True when everything that passed is in the file, or when what was kept is thrown away. After false, state() tells
  // whether there is more to wait for in another call.
  bool Stop(uint32_t time_out_ms = 1000);

  // Keeps that many bytes of what passes from now on, the latest. False while a trace runs.
  bool KeepLatest(size_t bytes);
  // Writes a file of what is kept; it goes on being kept. False when nothing is, and when the file cannot be written.
  bool Save(const TraceOrigin& origin, const std::function<CaptureSink()>& open);
  bool keeps() const { return mode_.load(std::memory_order_relaxed) == Mode::kLatest; }

  TraceCounters counters() const;  // over all traces of this object

  void OnOpened() noexcept override;
  void OnGivenUp() noexcept override;
  void OnBytes(PortDirection direction, PortContent content, std::span<const uint8_t> bytes) noexcept override;
  void OnShortWrite(size_t written, size_t count) noexcept override;

 private:
  enum class Mode : uint8_t { kOff, kFile, kLatest };

  // Of one direction, between two pieces that were taken.
  struct Gap {
    uint64_t bytes = 0;
    uint32_t frames = 0;
    bool in_frame = false;  // whether the last byte that passed, taken or not, leaves a frame unfinished
  };

  bool OnBegin() override;
  void OnBatch(const Batch& batch) override;
  void OnEnd() override;

  void Pass(TrafficPiece piece) noexcept;
  void PassToFile(const TrafficPiece& piece) KRAL_REQUIRES(tap_mutex_);
  void Keep(const TrafficPiece& piece) KRAL_REQUIRES(tap_mutex_);
  void Lose(const TrafficPiece& piece) KRAL_REQUIRES(tap_mutex_);
  bool CloseGap(const TrafficPiece& piece) KRAL_REQUIRES(tap_mutex_);
  TrafficPiece GapPiece(TrafficPiece piece) KRAL_REQUIRES(tap_mutex_);
  void Count(const TraceFile::Outcome& outcome);
  void TellLoss(const char* reason);

  DataLogFileHandler& log_;
  std::atomic<Mode> mode_{Mode::kOff};
  std::atomic<uint64_t> frames_{0};
  std::atomic<uint64_t> bad_{0};
  std::atomic<uint64_t> others_{0};
  std::atomic<uint64_t> lost_{0};
  std::atomic<uint64_t> lost_bytes_{0};
  std::atomic<uint64_t> lost_before_{0};  // this trace
  std::atomic<bool> loss_told_{false};    // in the text log, once for each trace

  Mutex control_mutex_;  // one start, stop or save at a time

  // Held for moments by both directions, so that times never step back in the file.
  Mutex tap_mutex_;
  std::array<Gap, 2> gaps_ KRAL_GUARDED_BY(tap_mutex_);
  std::deque<std::vector<uint8_t>> latest_ KRAL_GUARDED_BY(tap_mutex_);
  size_t latest_size_ KRAL_GUARDED_BY(tap_mutex_) = 0;
  size_t latest_room_ KRAL_GUARDED_BY(tap_mutex_) = 0;
  bool latest_cut_ KRAL_GUARDED_BY(tap_mutex_) = false;   // something was thrown out of it
  bool latest_open_ KRAL_GUARDED_BY(tap_mutex_) = false;  // ... the beginning of a frame that came

  TraceOrigin origin_;  // for OnBegin
  TraceFile file_;      // the writer's thread's while it runs
};

}  // namespace kral

#endif
