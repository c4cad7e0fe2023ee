// Halves the file again and again. Neither records nor blocks can be told from what a packet may hold, one by one. But
// of all chains that begin somewhere and go on to the end of a long piece one is the file's: where they are one, or
// come together, is a place in the file that nothing in a packet can feign.
#include "transport/collection/capture_seek.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <memory>
#include <optional>
#include <vector>

#include "base/little_endian.h"
#include "platform/file_util.h"
#include "transport/collection/capture_blocks.h"
#include "transport/collection/capture_format.h"
#include "transport/engine/bounded_queue.h"

namespace kral {
namespace {

// What the file is a chain of.
struct Links {
  size_t longest;
  size_t head;
  size_t time;                                        // where in the head
  size_t (*size_of)(std::span<const uint8_t> bytes);  // of the one that begins there; 0: none does
};

size_t SizeOfRecord(std::span<const uint8_t> bytes) {
  const auto length = LoadLe<uint16_t>(bytes, capture_record::kLength);
  const auto complement = LoadLe<uint16_t>(bytes, capture_record::kLengthComplement);
  if (!complement || *length != static_cast<uint16_t>(~*complement) || *length < capture_record::kShortestPacket ||
      *length > kMaximumPacket) {
    return 0;
  }
  return capture_record::kSize + *length;
}

size_t SizeOfBlock(std::span<const uint8_t> bytes) {
  const auto head = ReadCaptureBlockHead(bytes);
  return head ? capture_block::kSize + head->stream_size : 0;
}

constexpr Links kRecordLinks{capture_record::kSize + kMaximumPacket, capture_record::kSize,
                             capture_record::kMicroseconds, SizeOfRecord};
constexpr Links kBlockLinks{capture_block::kSize + capture_block::kLongestStream, capture_block::kSize,
                            capture_block::kMicroseconds, SizeOfBlock};

// Chains are followed for so many of the longest; and from here on all is read.
constexpr size_t kPieces = 3;
constexpr uint64_t kShortStretch = uint64_t{1} << 20;
static_assert(kPieces * kBlockLinks.longest < kShortStretch / 2, "a piece ends in front of the end of the file");

struct Place {
  uint64_t offset;
  uint64_t microseconds;
};

// All chains of a piece of the file. What a piece has only a part of may be anything.
class Chains {
 public:
  Chains(std::span<const uint8_t> piece, const Links& links) : next_(piece.size()), links_(links) {
    for (size_t at = piece.size(); at-- > 0;) {
      const size_t size = piece.size() - at < links.head ? links.longest : links.size_of(piece.subspan(at));
      const bool goes_on = size != 0 && (at + size >= piece.size() || next_[at + size] != 0);
      next_[at] = goes_on ? at + size : 0;
    }
  }

  bool none() const { return First() == limit(); }

  // The first place that all of them have; nothing when there is none.
  std::optional<size_t> Common() const {
    const size_t first = First();
    if (first == limit()) return std::nullopt;
    std::vector<bool> met(next_.size());  // by the first chain, and by those that were followed
    std::vector<bool> on_first(next_.size());
    for (size_t at = first; at < next_.size(); at = next_[at]) met[at] = on_first[at] = true;
    size_t common = first;
    for (size_t begin = first + 1; begin < limit(); ++begin) {
      if (next_[begin] == 0) continue;
      size_t at = begin;
      for (; at < next_.size() && !met[at]; at = next_[at]) met[at] = true;
      if (at >= next_.size()) return std::nullopt;
      if (on_first[at]) common = std::max(common, at);
    }
    if (next_.size() - common < links_.head) return std::nullopt;
    return common;
  }

 private:
  size_t limit() const { return std::min(next_.size(), links_.longest); }
  size_t First() const {
    size_t first = 0;
    while (first < limit() && next_[first] == 0) ++first;
    return first;
  }

  std::vector<size_t> next_;  // 0: no chain that goes on to the end
  const Links& links_;
};

enum class Found { kPlace, kNothing, kDoubtful };

// The first record or block at or behind an offset that is surely one.
Found FindLink(const CaptureBytes& bytes, uint64_t offset, const Links& links, Place& place) {
  std::vector<uint8_t> piece(kPieces * links.longest);
  piece.resize(bytes(offset, piece).value_or(0));
  const Chains chains(piece, links);
  if (chains.none()) return Found::kNothing;
  const auto common = chains.Common();
  if (!common) return Found::kDoubtful;
  place = {offset + *common, *LoadLe<uint64_t>(piece, *common + links.time)};
  return Found::kPlace;
}

// A place in front of which all is earlier, and which is not far from the one that is sought; the beginning where that
// is in doubt.
uint64_t Halve(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds, const Links& links) {
  const uint64_t first = begin;
  while (end - begin > kShortStretch) {
    const uint64_t middle = begin + (end - begin) / 2;
    Place place{};
    const Found found = FindLink(bytes, middle, links, place);
    if (found == Found::kDoubtful) return first;
    if (found == Found::kPlace && place.offset < end && place.microseconds < microseconds) {
      begin = place.offset;
    } else {
      end = middle;
    }
  }
  return begin;
}

}  // namespace

uint64_t FindCaptureTime(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds) {
  const uint64_t whole = end;
  begin = Halve(bytes, begin, end, microseconds, kRecordLinks);
  // The one that is sought may be the next behind the end.
  for (std::array<uint8_t, capture_record::kSize> head{};;) {
    if (bytes(begin, head) != head.size()) return begin;
    const size_t size = SizeOfRecord(head);
    if (size == 0 || begin + size > whole) return begin;  // what is cut or damaged is the reader's to tell
    if (*LoadLe<uint64_t>(head, capture_record::kMicroseconds) >= microseconds) return begin;
    begin += size;
  }
}

uint64_t FindCaptureBlock(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds) {
  begin = Halve(bytes, begin, end, microseconds, kBlockLinks);
  std::array<uint8_t, capture_block::kSize> bytes_of_head{};
  const auto head_at = [&](uint64_t offset) {
    return bytes(offset, bytes_of_head) == bytes_of_head.size() ? ReadCaptureBlockHead(bytes_of_head) : std::nullopt;
  };
  for (auto head = head_at(begin); head;) {
    const uint64_t next = begin + capture_block::kSize + head->stream_size;
    head = head_at(next);
    if (!head || head->microseconds >= microseconds) return begin;
    begin = next;
  }
  return begin;
}

namespace {

// Reads large pieces: what is asked for are heads and packets.
class BufferedBytes {
 public:
  BufferedBytes(CaptureBytes bytes, uint64_t at) : bytes_(std::move(bytes)), at_(at) {}

  void Seek(uint64_t at) {
    at_ = at;
    rest_ = {};
  }
  std::optional<size_t> Read(std::span<uint8_t> buffer) {
    size_t filled = 0;
    while (filled < buffer.size()) {
      if (rest_.empty()) {
        piece_.resize(kPiece);
        const auto got = bytes_(at_, piece_);
        if (!got) return std::nullopt;
        at_ += *got;
        rest_ = std::span(piece_).first(*got);
        if (rest_.empty()) break;
      }
      const size_t count = std::min(buffer.size() - filled, rest_.size());
      std::copy_n(rest_.begin(), count, buffer.subspan(filled).begin());
      rest_ = rest_.subspan(count);
      filled += count;
    }
    return filled;
  }

 private:
  static constexpr size_t kPiece = size_t{256} << 10;

  CaptureBytes bytes_;
  uint64_t at_;
  std::vector<uint8_t> piece_;
  std::span<const uint8_t> rest_;
};

}  // namespace

CaptureSource OpenCaptureSourceAt(const std::string& path, uint64_t microseconds, bool* is_sought) {
  // The stream keeps writers away; the reader goes to any place.
  const std::shared_ptr<std::FILE> lock(OpenToRead(path), [](std::FILE* opened) {
    if (opened != nullptr) CloseStream(opened);
  });
  const auto file = std::make_shared<FileReader>();
  if (is_sought != nullptr) *is_sought = false;
  if (!lock || file->Open(path)) return {};
  const CaptureBytes bytes = [file](uint64_t offset, std::span<uint8_t> buffer) -> std::optional<size_t> {
    size_t count = 0;
    if (file->Seek(offset) || file->Read(buffer, count)) return std::nullopt;
    return count;
  };
  std::array<uint8_t, capture_head::kSize> head{};
  uint64_t records = 0;
  if (bytes(0, head) == head.size()) records = *LoadLe<uint16_t>(head, capture_head::kHeadSize);
  // What is no capture is the reader's to tell.
  const bool is_capture = records >= head.size() && std::ranges::equal(capture_head::kMagic, std::span(head).first(8));
  uint64_t begin = records;
  if (const auto steps = StepsBackOf(head); is_capture && steps) {
    const auto find =
        *LoadLe<uint16_t>(head, capture_head::kVersion) == capture_head::kBlocks ? FindCaptureBlock : FindCaptureTime;
    begin = find(bytes, records, file->size(), microseconds - std::min(microseconds, *steps));
    if (is_sought != nullptr) *is_sought = true;
  }
  const auto buffered = std::make_shared<BufferedBytes>(bytes, 0);
  return [lock, buffered, records, begin, at = uint64_t{0}](std::span<uint8_t> buffer) mutable {
    const auto from_head = static_cast<size_t>(std::min<uint64_t>(buffer.size(), at < records ? records - at : 0));
    const auto head_bytes = buffered->Read(buffer.first(from_head));
    if (!head_bytes) return head_bytes;
    at += *head_bytes;
    if (*head_bytes < from_head || from_head == buffer.size()) return head_bytes;
    if (at == records) buffered->Seek(begin);
    const auto more = buffered->Read(buffer.subspan(from_head));
    at += more.value_or(0);
    return more ? std::optional(from_head + *more) : std::nullopt;
  };
}

}  // namespace kral
