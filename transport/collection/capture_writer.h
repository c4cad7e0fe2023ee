// Writes collected packets to a capture file.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H

#include <array>
#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <vector>

#include "transport/collection/batch_writer.h"
#include "transport/collection/capture_format.h"

namespace kral {

class DataLogFileHandler;

// The beginning of a capture file, and of a record in it.
std::array<uint8_t, capture_head::kSize> CaptureHead(uint16_t version = capture_head::kRecords);
std::array<uint8_t, capture_record::kSize> CaptureRecordHead(uint64_t microseconds, size_t length);

// How times go that should only grow.
class TimeSteps {
 public:
  void Add(uint64_t microseconds);
  uint64_t latest() const { return latest_; }
  uint32_t mark() const;  // capture_head::kStepsBack

 private:
  uint64_t latest_ = 0;
  uint64_t back_ = 0;
};

struct CaptureLayout {
  bool compressed = false;
  // The next file begins with the packet that would make this one longer, or that comes so long after its first.
  // 0: not for that. With either it also begins where the clock was set back.
  uint64_t file_bytes = 0;
  uint32_t file_seconds = 0;
};

// Packets that find no room while the disk is busy are lost, and counted.
class CaptureWriter final : public BatchWriter {
 public:
  explicit CaptureWriter(DataLogFileHandler& log, size_t room = kDefaultRoom) : BatchWriter(room), log_(log) {}
  ~CaptureWriter() override;
  CaptureWriter(const CaptureWriter&) = delete;
  CaptureWriter& operator=(const CaptureWriter&) = delete;

  // `open` is kept, and called again for each next file. Else as in the base.
  bool Start(const std::function<CaptureSink()>& open, std::shared_ptr<void> owner, CaptureLayout layout = {});
  void Append(std::span<const uint8_t> packet, uint64_t microseconds = MicrosecondsNow());
  // Waits at most so long for what is left to be written. True when every packet of the capture is in the file; after
  // false, state() tells whether there is more to wait for in another call.
  bool Stop(uint32_t time_out_ms = 1000);

  // Over all captures of this object. What is pending is in neither.
  uint64_t written() const { return written_.load(std::memory_order_relaxed); }
  uint64_t lost() const { return lost_.load(std::memory_order_relaxed); }
  uint64_t pending() const { return BatchWriter::pending() + in_block_.load(std::memory_order_relaxed); }

 private:
  // Of one batch, one behind the other.
  struct Records {
    std::span<const uint8_t> bytes;
    uint64_t count = 0;
  };

  bool OnBegin() override;
  bool BeginFile();
  void OnBatch(const Batch& batch) override;
  void OnEnd() override;
  bool BelongsToNextFile(std::span<const uint8_t> record, size_t before) const;
  void EndFile();
  void BeginNextFile();
  void Take(const Records& records);
  void WriteBlock();
  void WriteRecords(const Records& records);
  void Lose(uint64_t packets, const char* reason);

  DataLogFileHandler& log_;
  std::atomic<uint64_t> written_{0};
  std::atomic<uint64_t> lost_{0};
  std::atomic<uint64_t> lost_before_{0};  // this capture
  std::atomic<bool> loss_told_{false};    // in the text log, once for each capture

  // The writer's.
  bool failed_ = false;
  CaptureLayout layout_;
  std::function<CaptureSink()> open_;
  uint64_t file_size_ = 0;
  uint64_t file_begin_ = 0;  // the time of its first record; 0: it has none
  TimeSteps steps_;          // of what is in the file, or is to be
  std::vector<uint8_t> block_;
  std::chrono::steady_clock::time_point block_begin_;
  std::atomic<uint64_t> in_block_{0};  // records
};

}  // namespace kral

#endif
