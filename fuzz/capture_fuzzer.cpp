// Anything as a capture file, through the reader and the sorter. What is read is what stands in the file, and nothing
// that follows a damaged place.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "base/little_endian.h"
#include "base/text_log.h"
#include "fuzz/support.h"
#include "transport/collection/capture_blocks.h"
#include "transport/collection/capture_format.h"
#include "transport/collection/capture_reader.h"
#include "transport/collection/capture_seek.h"
#include "transport/collection/kral_event_listener.h"

namespace {

using namespace kral;
using fuzz::ByteView;
using fuzz::Require;

// Through a file of two MiB, which goes round: shorter ones are read from the front.
void Seek(std::span<const uint8_t> file) {
  constexpr uint64_t kLength = uint64_t{2} << 20;
  if (file.size() < capture_head::kSize + sizeof(uint64_t)) return;
  const CaptureBytes bytes = [file](uint64_t offset, std::span<uint8_t> buffer) {
    const auto count = static_cast<size_t>(std::min<uint64_t>(buffer.size(), offset < kLength ? kLength - offset : 0));
    for (size_t done = 0; done < count;) {
      const auto rest = file.subspan(static_cast<size_t>((offset + done) % file.size()));
      const size_t more = std::min(rest.size(), count - done);
      std::copy_n(rest.begin(), more, buffer.subspan(done).begin());
      done += more;
    }
    return std::optional(count);
  };
  for (const auto find : {FindCaptureTime, FindCaptureBlock}) {
    const uint64_t found = find(bytes, capture_head::kSize, kLength, *LoadLe<uint64_t>(file, capture_head::kSize));
    Require(found >= capture_head::kSize && found <= kLength);
  }
}

struct Read {
  std::vector<fuzz::Bytes> packets;
  CaptureReader::Outcome outcome = CaptureReader::Outcome::kRecord;
};

Read ReadAll(ByteView file) {
  Read read;
  CaptureReader reader(fuzz::SourceOf(file));
  for (CaptureRecord record; (read.outcome = reader.Next(record)) == CaptureReader::Outcome::kRecord;) {
    read.packets.push_back(record.packet);
  }
  return read;
}

// What stands behind the head, compressed in two blocks: the same is read, and less of a file that is cut.
void Pack(ByteView file) {
  constexpr size_t kLeast = sizeof(uint64_t);  // the time of a block is that of its first record
  const ByteView records = file.subspan(std::min(file.size(), capture_head::kSize));
  if (records.size() < 2 * kLeast || LoadLe<uint16_t>(file, capture_head::kHeadSize) != capture_head::kSize ||
      LoadLe<uint16_t>(file, capture_head::kVersion) != capture_head::kRecords) {
    return;
  }
  const size_t middle = std::clamp(size_t{records[0]}, kLeast, records.size() - kLeast);
  fuzz::Bytes packed(file.begin(), file.begin() + capture_head::kSize);
  StoreLe(std::span(packed), capture_head::kVersion, capture_head::kBlocks);
  for (const ByteView part : {records.first(middle), records.subspan(middle)}) {
    const auto block = MakeCaptureBlock(part);
    packed.insert(packed.end(), block.begin(), block.end());
  }
  const Read plain = ReadAll(file);
  const Read same = ReadAll(packed);
  Require(same.packets == plain.packets && same.outcome == plain.outcome);
  const size_t cut = std::min(size_t{records[1]}, packed.size() - capture_head::kSize);
  const Read less = ReadAll(ByteView(packed).first(packed.size() - cut));
  Require(less.packets.size() <= plain.packets.size() &&
          std::equal(less.packets.begin(), less.packets.end(), plain.packets.begin()));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::span<const uint8_t> file(data, size);
  size_t at = 0;
  CaptureReader reader([&](std::span<uint8_t> buffer) {
    const size_t count = std::min(buffer.size(), file.size() - at);
    std::copy_n(file.begin() + static_cast<std::ptrdiff_t>(at), count, buffer.begin());
    at += count;
    return count;
  });
  PacketQueue responses;
  PacketQueue asynchronous;
  BoundedQueue<EventRecord> events;
  CKralEventListener sorter(responses, asynchronous, events, NullLog());
  sorter.SetCollection(true);

  CaptureRecord record;
  uint64_t packets = 0;
  CaptureReader::Outcome outcome = CaptureReader::Outcome::kRecord;
  while ((outcome = reader.Next(record)) == CaptureReader::Outcome::kRecord) {
    const size_t length = record.packet.size();
    Require(length >= capture_record::kShortestPacket && length <= kMaximumPacket);
    // Read again by hand, from where the reader has got to, where nothing is compressed.
    if (LoadLe<uint16_t>(file, capture_head::kVersion) == capture_head::kRecords) {
      const size_t begin = at - length - capture_record::kSize;
      Require(LoadLe<uint16_t>(file, begin + capture_record::kLength) == length);
      Require(LoadLe<uint64_t>(file, begin + capture_record::kMicroseconds) == record.microseconds);
      Require(std::equal(record.packet.begin(), record.packet.end(),
                         file.begin() + static_cast<std::ptrdiff_t>(at - length)));
    }
    sorter.TakePacket(record.packet);
    ++packets;
  }
  sorter.OnBatchEnd();
  if (outcome == CaptureReader::Outcome::kEnd) Require(at == size);
  if (outcome == CaptureReader::Outcome::kForeign) Require(packets == 0);
  const auto counters = sorter.counters();
  Require(counters.collected + responses.size() + responses.dropped() == packets && counters.oversized == 0);
  while (const auto event = events.Pop()) Require(*LoadLe<uint16_t>(event->bytes, EventRecord::kEventId) <= 0xFFF);
  Seek(file);
  Pack(file);
  return 0;
}
