// Takes capture files apart. Every length is checked before it is believed.
#include "transport/collection/capture_reader.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <memory>

#include "base/little_endian.h"
#include "platform/file_util.h"
#include "transport/collection/capture_blocks.h"
#include "transport/collection/capture_format.h"
#include "transport/engine/bounded_queue.h"

namespace kral {

CaptureSource OpenCaptureSource(const std::string& path) {
  const std::shared_ptr<std::FILE> file(OpenToRead(path), [](std::FILE* opened) {
    if (opened != nullptr) CloseStream(opened);
  });
  if (!file) return {};
  return [file](std::span<uint8_t> buffer) -> std::optional<size_t> {
    const size_t count = std::fread(buffer.data(), 1, buffer.size(), file.get());
    return std::ferror(file.get()) == 0 ? std::optional(count) : std::nullopt;
  };
}

CaptureReader::Outcome CaptureReader::Next(CaptureRecord& record) {
  if (last_ != Outcome::kRecord) return last_;
  if (!begun_) {
    begun_ = true;
    last_ = ReadHead();
    if (last_ != Outcome::kRecord) return last_;
  }
  do {
    last_ = ReadRecord(record);
  } while (last_ == Outcome::kRecord && (record.microseconds < stretch_.from || record.microseconds > stretch_.to));
  return last_;
}

std::optional<uint64_t> StepsBackOf(std::span<const uint8_t> head) {
  const uint32_t mark = LoadLe<uint32_t>(head, capture_head::kStepsBack).value_or(0);
  if (mark == 0 || mark == capture_head::kStepsUnknown) return std::nullopt;
  return (mark - uint64_t{1}) * 1000;
}

CaptureReader::Outcome CaptureReader::ReadHead() {
  std::array<uint8_t, capture_head::kSize> head{};
  if (!source_ || source_(head) != head.size()) return Outcome::kForeign;
  if (!std::equal(capture_head::kMagic.begin(), capture_head::kMagic.end(), head.begin())) return Outcome::kForeign;
  const auto version = *LoadLe<uint16_t>(head, capture_head::kVersion);
  if (version != capture_head::kRecords && version != capture_head::kBlocks) return Outcome::kForeign;
  const size_t size = *LoadLe<uint16_t>(head, capture_head::kHeadSize);
  if (size < head.size()) return Outcome::kForeign;
  std::vector<uint8_t> skipped(size - head.size());
  if (source_(skipped) != skipped.size()) return Outcome::kCut;
  const auto steps = StepsBackOf(head);
  if (steps && stretch_.to <= UINT64_MAX - *steps) last_time_ = stretch_.to + *steps;
  if (version == capture_head::kBlocks) source_ = UnpackCaptureBlocks(std::move(source_));
  return Outcome::kRecord;
}

CaptureReader::Outcome CaptureReader::ReadRecord(CaptureRecord& record) {
  std::array<uint8_t, capture_record::kSize> head{};
  const auto got = source_(head);
  if (got == 0) return Outcome::kEnd;
  if (got != head.size()) return Outcome::kCut;
  const uint16_t length = *LoadLe<uint16_t>(head, capture_record::kLength);
  const auto complement = static_cast<uint16_t>(~*LoadLe<uint16_t>(head, capture_record::kLengthComplement));
  if (length != complement || length < capture_record::kShortestPacket || length > kMaximumPacket) {
    return Outcome::kCut;
  }
  if (*LoadLe<uint64_t>(head, capture_record::kMicroseconds) > last_time_) return Outcome::kEnd;
  std::vector<uint8_t> packet(length);
  if (source_(packet) != packet.size()) return Outcome::kCut;
  record.microseconds = *LoadLe<uint64_t>(head, capture_record::kMicroseconds);
  record.packet = std::move(packet);
  return Outcome::kRecord;
}

}  // namespace kral
