// What a capture file is made of, and what is lost of it. Which packets are captured is the sorter's affair.
#include "transport/collection/capture_writer.h"

#include <algorithm>

#include "base/little_endian.h"
#include "base/text_log.h"
#include "transport/engine/bounded_queue.h"

namespace kral {
namespace {

// Of records that may be cut at the end.
uint64_t CountWholeRecords(std::span<const uint8_t> bytes) {
  uint64_t count = 0;
  while (bytes.size() >= capture_record::kSize) {
    const size_t size = capture_record::kSize + *LoadLe<uint16_t>(bytes, capture_record::kLength);
    if (bytes.size() < size) break;
    bytes = bytes.subspan(size);
    ++count;
  }
  return count;
}

}  // namespace

std::array<uint8_t, capture_head::kSize> CaptureHead() {
  std::array<uint8_t, capture_head::kSize> head{};
  std::ranges::copy(capture_head::kMagic, head.begin());
  StoreLe(std::span<uint8_t>(head), capture_head::kVersion, capture_head::kThisVersion);
  StoreLe(std::span<uint8_t>(head), capture_head::kHeadSize, static_cast<uint16_t>(capture_head::kSize));
  return head;
}

std::array<uint8_t, capture_record::kSize> CaptureRecordHead(uint64_t microseconds, size_t length) {
  std::array<uint8_t, capture_record::kSize> head{};
  const auto length16 = static_cast<uint16_t>(length);
  StoreLe(std::span<uint8_t>(head), capture_record::kMicroseconds, microseconds);
  StoreLe(std::span<uint8_t>(head), capture_record::kLength, length16);
  StoreLe(std::span<uint8_t>(head), capture_record::kLengthComplement, static_cast<uint16_t>(~length16));
  return head;
}

CaptureWriter::~CaptureWriter() {
  Stop();
}

bool CaptureWriter::OnBegin() {
  lost_before_ = lost();
  loss_told_ = false;
  failed_ = false;
  const auto head = CaptureHead();
  return Write(head) == head.size();
}

void CaptureWriter::Append(std::span<const uint8_t> packet) {
  if (state() != CaptureState::kRunning || packet.size() < capture_record::kShortestPacket ||
      packet.size() > kMaximumPacket) {
    return;
  }
  if (Add(CaptureRecordHead(MicrosecondsNow(), packet.size()), packet) == Added::kNoRoom)
    Lose(1, "the disk is too slow");
}

bool CaptureWriter::Stop(uint32_t time_out_ms) {
  const Ended ended = End(time_out_ms);
  if (ended == Ended::kNotYet) {
    log_.WriteLine(kLogErr, "Capture file: %u packets still wait for the disk", static_cast<unsigned>(pending()));
  }
  return ended == Ended::kDone && lost() == lost_before_;
}

// Behind a record that is cut nothing more can be read: a file that took no more stays as it is.
void CaptureWriter::OnBatch(const Batch& batch) {
  const std::span<const uint8_t> records(batch.bytes);
  const size_t taken = failed_ ? 0 : Write(records);
  failed_ = failed_ || taken < records.size();
  const uint64_t whole = failed_ ? CountWholeRecords(records.first(taken)) : batch.records;
  written_.fetch_add(whole, std::memory_order_relaxed);
  if (whole < batch.records) Lose(batch.records - whole, "the file cannot be written any more");
}

void CaptureWriter::Lose(uint64_t packets, const char* reason) {
  lost_.fetch_add(packets, std::memory_order_relaxed);
  if (!loss_told_.exchange(true)) log_.WriteLine(kLogErr, "Capture file: packets are lost, %s", reason);
}

}  // namespace kral
