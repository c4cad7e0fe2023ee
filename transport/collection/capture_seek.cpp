// Halves the file again and again. Records have no mark in front of them: one is recognized by its length, which stands
// there twice, and by those that follow it. Blocks of compressed records have a mark.
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

constexpr size_t kLongestRecord = capture_record::kSize + kMaximumPacket;
// So many in a row are no accident; fewer only at the end of the file.
constexpr int kChain = 16;
constexpr size_t kWindow = (kChain + 1) * kLongestRecord;
// From here on it is read record by record.
constexpr uint64_t kShortStretch = uint64_t{1} << 20;

// The size of the record that begins there; nothing where none does.
std::optional<size_t> SizeOfRecord(std::span<const uint8_t> bytes) {
  const auto length = LoadLe<uint16_t>(bytes, capture_record::kLength);
  const auto complement = LoadLe<uint16_t>(bytes, capture_record::kLengthComplement);
  if (!complement || *length != static_cast<uint16_t>(~*complement) || *length < capture_record::kShortestPacket ||
      *length > kMaximumPacket) {
    return std::nullopt;
  }
  return capture_record::kSize + *length;
}

bool BeginsChain(std::span<const uint8_t> bytes, bool reaches_end) {
  for (int i = 0; i < kChain; ++i) {
    const auto size = SizeOfRecord(bytes);
    if (!size) return reaches_end && i > 0 && bytes.empty();
    if (*size > bytes.size()) return reaches_end && i > 0;  // a record that a crash has cut
    bytes = bytes.subspan(*size);
  }
  return true;
}

struct Place {
  uint64_t offset;
  uint64_t microseconds;
};

// The first record at or behind an offset.
std::optional<Place> FindRecord(const CaptureBytes& bytes, uint64_t offset) {
  std::vector<uint8_t> window(kWindow);
  const size_t count = bytes(offset, window).value_or(0);
  const std::span<const uint8_t> read = std::span(window).first(count);
  for (size_t at = 0; at < std::min(count, kLongestRecord); ++at) {
    if (!BeginsChain(read.subspan(at), count < kWindow)) continue;
    return Place{offset + at, *LoadLe<uint64_t>(read, at + capture_record::kMicroseconds)};
  }
  return std::nullopt;
}

// The first block at or behind an offset.
std::optional<Place> FindBlock(const CaptureBytes& bytes, uint64_t offset) {
  constexpr size_t kLongestBlock = capture_block::kSize + capture_block::kLongestStream;
  std::vector<uint8_t> window(kLongestBlock + capture_block::kSize);
  const size_t count = bytes(offset, window).value_or(0);
  const std::span<const uint8_t> read = std::span(window).first(count);
  for (size_t at = 0; at + capture_block::kSize <= count; ++at) {
    if (const auto head = ReadCaptureBlockHead(read.subspan(at))) return Place{offset + at, head->microseconds};
  }
  return std::nullopt;
}

// A place in front of which all is earlier, and which is not far from the one that is sought.
template <class Find>
uint64_t Halve(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds, Find find) {
  while (end - begin > kShortStretch) {
    const uint64_t middle = begin + (end - begin) / 2;
    const std::optional<Place> place = find(bytes, middle);
    if (place && place->offset < end && place->microseconds < microseconds) {
      begin = place->offset;
    } else {
      end = middle;
    }
  }
  return begin;
}

}  // namespace

uint64_t FindCaptureTime(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds) {
  const uint64_t whole = end;
  begin = Halve(bytes, begin, end, microseconds, FindRecord);
  // The one that is sought may be the next behind the end.
  for (std::array<uint8_t, capture_record::kSize> head{};;) {
    if (bytes(begin, head) != head.size()) return begin;
    const auto size = SizeOfRecord(head);
    if (!size || begin + *size > whole) return begin;  // what is cut or damaged is the reader's to tell
    if (*LoadLe<uint64_t>(head, capture_record::kMicroseconds) >= microseconds) return begin;
    begin += *size;
  }
}

uint64_t FindCaptureBlock(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds) {
  begin = Halve(bytes, begin, end, microseconds, FindBlock);
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

CaptureSource OpenCaptureSourceAt(const std::string& path, uint64_t microseconds) {
  // The stream keeps writers away; the reader goes to any place.
  const std::shared_ptr<std::FILE> lock(OpenToRead(path), [](std::FILE* opened) {
    if (opened != nullptr) CloseStream(opened);
  });
  const auto file = std::make_shared<FileReader>();
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
  const auto find =
      *LoadLe<uint16_t>(head, capture_head::kVersion) == capture_head::kBlocks ? FindCaptureBlock : FindCaptureTime;
  const uint64_t begin = is_capture ? find(bytes, records, file->size(), microseconds) : records;
  return [lock, bytes, records, begin, at = uint64_t{0}](std::span<uint8_t> buffer) mutable -> std::optional<size_t> {
    const auto from_head = static_cast<size_t>(std::min<uint64_t>(buffer.size(), at < records ? records - at : 0));
    const auto head_bytes = from_head == 0 ? std::optional(size_t{0}) : bytes(at, buffer.first(from_head));
    if (!head_bytes) return std::nullopt;
    at += *head_bytes;
    if (*head_bytes < from_head || *head_bytes == buffer.size()) return head_bytes;
    const auto more = bytes(begin + (at - records), buffer.subspan(*head_bytes));
    if (!more) return std::nullopt;
    at += *more;
    return *head_bytes + *more;
  };
}

}  // namespace kral
