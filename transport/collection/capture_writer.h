// Writes collected packets to a capture file.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_WRITER_H

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "transport/collection/batch_writer.h"
#include "transport/collection/capture_format.h"

namespace kral {

class DataLogFileHandler;

// The beginning of a capture file, and of a record in it.
std::array<uint8_t, capture_head::kSize> CaptureHead();
std::array<uint8_t, capture_record::kSize> CaptureRecordHead(uint64_t microseconds, size_t length);

// Packets that find no room while the disk is busy are lost, and counted.
class CaptureWriter final : public BatchWriter {
 public:
  explicit CaptureWriter(DataLogFileHandler& log, size_t room = kDefaultRoom) : BatchWriter(room), log_(log) {}
  ~CaptureWriter() override;
  CaptureWriter(const CaptureWriter&) = delete;
  CaptureWriter& operator=(const CaptureWriter&) = delete;

  void Append(std::span<const uint8_t> packet);
  // Waits at most so long for what is left to be written. True when every packet of the capture is in the file; after
  // false, state() tells whether there is more to wait for in another call.
  bool Stop(uint32_t time_out_ms = 1000);

  // Over all captures of this object. What is pending is in neither.
  uint64_t written() const { return written_.load(std::memory_order_relaxed); }
  uint64_t lost() const { return lost_.load(std::memory_order_relaxed); }

 private:
  bool OnBegin() override;
  void OnBatch(const Batch& batch) override;
  void Lose(uint64_t packets, const char* reason);

  DataLogFileHandler& log_;
  std::atomic<uint64_t> written_{0};
  std::atomic<uint64_t> lost_{0};
  std::atomic<uint64_t> lost_before_{0};  // this capture
  std::atomic<bool> loss_told_{false};    // in the text log, once for each capture
  bool failed_ = false;                   // the writer's
};

}  // namespace kral

#endif
