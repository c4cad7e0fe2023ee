// The packet modes of the receive thread. The framed mode is the de-framer's; what a packet means is the sorter's.
#include "transport/line/chunk_splitter.h"

#include <string_view>
#include <utility>

#include "base/text_log.h"

namespace kral {
namespace {

// A length-prefixed packet: its whole length in bytes 1 and 2, and, in the first one, the largest length of those to
// come in bytes 5 and 6; both big-endian.
constexpr size_t kLengthOffset = 1;
constexpr size_t kLengthEnd = 3;
constexpr size_t kLimitOffset = 5;
constexpr size_t kLimitEnd = 7;

size_t LoadBigEndian16(std::span<const uint8_t> bytes, size_t offset) {
  return static_cast<size_t>(bytes[offset]) << 8 | bytes[offset + 1];
}

// Only the chunk is looked at: a terminator torn apart by two reads does not end a reply.
bool EndsReply(std::span<const uint8_t> chunk_so_far) {
  const std::string_view text(reinterpret_cast<const char*>(chunk_so_far.data()), chunk_so_far.size());
  return text.ends_with("OK") || text.ends_with("ERROR");
}

}  // namespace

void ChunkSplitter::Feed(std::span<const uint8_t> chunk) {
  const PacketMode mode = mode_;
  if (mode != entered_mode_) EnterMode(mode);
  if (flush_pending_.exchange(false)) DropPartialNow();
  FeedByMode(mode, chunk);
  sink_.OnBatchEnd();
}

void ChunkSplitter::FeedByMode(PacketMode mode, std::span<const uint8_t> chunk) {
  switch (mode) {
    case PacketMode::kFramed:
      deframer_.Feed(chunk);
      break;
    case PacketMode::kUnframed1:
    case PacketMode::kUnframed2:
      if (at_reply_mode_) {
        FeedAtReply(chunk);
      } else {
        sink_.OnPacket(chunk);  // whole, whatever its size: the sorter knows what it takes
      }
      break;
    case PacketMode::kLengthPrefixed:
      FeedLengthPrefixed(chunk);
      break;
  }
}

void ChunkSplitter::EnterMode(PacketMode mode) {
  entered_mode_ = mode;
  packet_limit_ = kMaximumPacket;
  header_limit_pending_ = mode == PacketMode::kLengthPrefixed;
  DropPartialNow();
}

void ChunkSplitter::DropPartialNow() {
  deframer_.DropPartial();
  packet_.clear();
}

void ChunkSplitter::FeedAtReply(std::span<const uint8_t> chunk) {
  bool ended = false;
  for (size_t i = 0; i < chunk.size(); ++i) {
    // Behind the end of a reply the chunk is dropped except for these two letters, which go on to be kept.
    if (ended && chunk[i] != 'K' && chunk[i] != 'R') continue;
    packet_.push_back(chunk[i]);
    if (EndsReply(chunk.first(i + 1))) {
      HandOnReceived();
      ended = true;
    } else if (packet_.size() >= kMaximumPacket) {
      HandOnOverrun();
    }
  }
}

void ChunkSplitter::FeedLengthPrefixed(std::span<const uint8_t> chunk) {
  for (const uint8_t byte : chunk) {
    if (packet_.size() >= packet_limit_) HandOnOverrun();
    packet_.push_back(byte);
    if (packet_.size() == kLimitEnd && header_limit_pending_) ReadPacketLimit();
    if (!HoldsWholePacket()) continue;
    header_limit_pending_ = false;
    HandOnReceived();
  }
}

// A limit that does not hold a header, or goes beyond what the queues take, is not believed.
void ChunkSplitter::ReadPacketLimit() {
  header_limit_pending_ = false;
  const size_t limit = LoadBigEndian16(packet_, kLimitOffset);
  if (limit >= kLimitEnd && limit <= kMaximumPacket) packet_limit_ = limit;
}

bool ChunkSplitter::HoldsWholePacket() const {
  return packet_.size() >= kLengthEnd && packet_.size() >= LoadBigEndian16(packet_, kLengthOffset);
}

void ChunkSplitter::HandOnReceived() {
  log_.WriteBytes(kLogIo, "RAW REC (%d bytes): %s", packet_);
  HandOn();
}

void ChunkSplitter::HandOnOverrun() {
  log_.WriteLine(kLogErr, "ERROR THREAD READ---NON-HDLC data (%d bytes)", static_cast<int>(packet_.size()));
  HandOn();
}

void ChunkSplitter::HandOn() {
  sink_.OnPacket(packet_);
  packet_.clear();
}

}  // namespace kral
