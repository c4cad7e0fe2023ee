// Anything a port may give, through every packet mode and the sorter. What comes in is in a queue, or counted as
// dropped; what is in a queue belongs there.
//
// Byte 0: packet mode (bits 0..1), AT reply mode (2), collection (3), logging (4). Byte 1: the size of the chunks; with
// its highest bit the mode changes with every chunk.
#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "base/little_endian.h"
#include "base/text_log.h"
#include "fuzz/support.h"
#include "transport/collection/kral_event_listener.h"
#include "transport/line/chunk_splitter.h"

namespace {

using namespace kral;
using fuzz::Require;

constexpr size_t kChunkSizes[] = {1, 2, 3, 5, 16, 200, 4095, 4096, 4097, 40960};

class Counter final : public PacketListener {
 public:
  explicit Counter(PacketListener& next) : next_(next) {}
  void OnPacket(std::span<const uint8_t> packet) override {
    ++packets;
    // A copy of its own, so that the address sanitizer sees a read behind the packet.
    next_.TakePacket({packet.begin(), packet.end()});
  }
  void OnBatchEnd() override { next_.OnBatchEnd(); }
  uint64_t packets = 0;

 private:
  PacketListener& next_;
};

bool IsAsynchronous(uint8_t code) {
  return code == 16 || code == 31 || code == 96 || code == 121 || code == 146;
}

uint64_t CheckPackets(PacketQueue& queue, bool asynchronous) {
  uint64_t count = queue.dropped();
  while (const auto packet = queue.Pop()) {
    Require(packet->size() >= 2 && packet->size() <= kMaximumPacket);
    Require(IsAsynchronous(packet->front()) == asynchronous);
    ++count;
  }
  return count;
}

void CheckEvents(BoundedQueue<EventRecord>& events) {
  while (const auto event = events.Pop()) {
    const auto& bytes = event->bytes;
    Require(bytes[EventRecord::kTimeStampLength] == 2 || bytes[EventRecord::kTimeStampLength] == 8);
    Require(*LoadLe<uint16_t>(bytes, EventRecord::kEventId) <= 0xFFF);
    Require(bytes[EventRecord::kSize - 1] == 0);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 2) return 0;
  const uint8_t options = data[0];
  const size_t chunk_size = kChunkSizes[(data[1] & 0x7F) % std::size(kChunkSizes)];
  const bool changing = (data[1] & 0x80) != 0;
  const std::span<const uint8_t> stream(data + 2, size - 2);

  DataLogFileHandler log;
  log.SetFlags((options & 0x10) != 0 ? 0xFFFFFFFF : 0);
  PacketQueue responses;
  PacketQueue asynchronous;
  BoundedQueue<EventRecord> events;
  CKralEventListener sorter(responses, asynchronous, events, log);
  sorter.SetCollection((options & 0x08) != 0);
  Counter counter(sorter);
  ChunkSplitter splitter(counter, log);
  splitter.SetAtReplyMode((options & 0x04) != 0);

  uint8_t mode = options & 0x03;
  for (size_t at = 0; at < stream.size(); at += chunk_size) {
    splitter.SetMode(static_cast<PacketMode>(mode));
    if (changing) mode = (mode + 1) & 0x03;
    splitter.Feed(stream.subspan(at, std::min(chunk_size, stream.size() - at)));
  }

  const uint64_t queued = CheckPackets(responses, false) + CheckPackets(asynchronous, true);
  Require(queued + sorter.dropped_not_collecting() + sorter.dropped_by_size() == counter.packets);
  if (!sorter.collecting()) Require(events.size() == 0 && asynchronous.dropped() == 0);
  CheckEvents(events);
  return 0;
}
