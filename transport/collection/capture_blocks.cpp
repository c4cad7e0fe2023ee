// Makes blocks of records, and records of blocks. No length is believed that a block cannot have.
#include "transport/collection/capture_blocks.h"

#include <algorithm>
#include <array>
#include <utility>

#include "base/deflate.h"
#include "base/little_endian.h"
#include "transport/collection/capture_format.h"

namespace kral {
namespace {

namespace block = capture_block;

class BlockUnpacker {
 public:
  explicit BlockUnpacker(CaptureSource blocks) : blocks_(std::move(blocks)) {}

  std::optional<size_t> operator()(std::span<uint8_t> buffer) {
    size_t filled = 0;
    while (filled < buffer.size()) {
      if (at_ == records_.size() && !NextBlock()) break;
      const size_t count = std::min(buffer.size() - filled, records_.size() - at_);
      std::copy_n(records_.begin() + static_cast<std::ptrdiff_t>(at_), count,
                  buffer.begin() + static_cast<std::ptrdiff_t>(filled));
      at_ += count;
      filled += count;
    }
    return filled == 0 && broken_ && !buffer.empty() ? std::nullopt : std::optional(filled);
  }

 private:
  bool NextBlock() {
    records_.clear();
    at_ = 0;
    if (ended_) return false;
    std::array<uint8_t, block::kSize> bytes{};
    const auto got = blocks_(bytes);
    ended_ = got != bytes.size();
    broken_ = ended_ && got != size_t{0};
    if (ended_) return false;
    const auto head = ReadCaptureBlockHead(bytes);
    if (head) Unpack(*head);
    if (!head || records_.size() != head->records_size) ended_ = broken_ = true;
    return !records_.empty();
  }

  void Unpack(const CaptureBlockHead& head) {
    std::vector<uint8_t> stream(head.stream_size);
    const size_t got = blocks_(stream).value_or(0);
    if (got < stream.size()) {
      records_ = DecompressBeginning(std::span(stream).first(got), head.records_size);
      ended_ = broken_ = true;
    } else if (auto records = Decompress(stream, head.records_size)) {
      records_ = std::move(*records);
    }
  }

  CaptureSource blocks_;
  std::vector<uint8_t> records_;
  size_t at_ = 0;
  bool ended_ = false;
  bool broken_ = false;
};

}  // namespace

std::vector<uint8_t> MakeCaptureBlock(std::span<const uint8_t> records) {
  const auto stream = Compress(records, Effort::kFast);
  std::vector<uint8_t> bytes(block::kSize + stream.size());
  std::ranges::copy(block::kMark, bytes.begin());
  const auto size = static_cast<uint32_t>(stream.size());
  StoreLe(std::span(bytes), block::kStreamSize, size);
  StoreLe(std::span(bytes), block::kStreamSizeComplement, ~size);
  StoreLe(std::span(bytes), block::kRecordsSize, static_cast<uint32_t>(records.size()));
  StoreLe(std::span(bytes), block::kMicroseconds, *LoadLe<uint64_t>(records, capture_record::kMicroseconds));
  std::ranges::copy(stream, bytes.begin() + block::kSize);
  return bytes;
}

std::optional<CaptureBlockHead> ReadCaptureBlockHead(std::span<const uint8_t> bytes) {
  if (bytes.size() < block::kSize || !std::equal(block::kMark.begin(), block::kMark.end(), bytes.begin()))
    return std::nullopt;
  const CaptureBlockHead head{.stream_size = *LoadLe<uint32_t>(bytes, block::kStreamSize),
                              .records_size = *LoadLe<uint32_t>(bytes, block::kRecordsSize),
                              .microseconds = *LoadLe<uint64_t>(bytes, block::kMicroseconds)};
  const bool fits = head.stream_size == ~*LoadLe<uint32_t>(bytes, block::kStreamSizeComplement) &&
                    head.stream_size != 0 && head.stream_size <= block::kLongestStream && head.records_size != 0 &&
                    head.records_size <= block::kMostRecords;
  return fits ? std::optional(head) : std::nullopt;
}

CaptureSource UnpackCaptureBlocks(CaptureSource blocks) {
  return BlockUnpacker(std::move(blocks));
}

}  // namespace kral
