// Splits received bytes into packets and checks them. What a packet means is the sorter's.
#include "transport/line/hdlc_deframer.h"

#include <algorithm>
#include <bit>

#include "base/text_log.h"
#include "base/wire_codes.h"
#include "transport/line/byte_block.h"
#include "transport/line/fcs16.h"
#include "transport/line/hdlc_frame.h"

namespace kral {
namespace {

// First bytes of packets that the handset sends unasked, and what becomes of them: required as they are.
constexpr std::array<uint8_t, 4> kUncheckedCodes = {kLogCode, kUnasked31, kEventReportCode, kExtendedMessageCode};
constexpr uint8_t kIgnoredCode = kUnasked146;

bool IsUnchecked(uint8_t code) {
  return std::ranges::find(kUncheckedCodes, code) != kUncheckedCodes.end();
}

void Increment(std::atomic<uint64_t>& counter) {
  counter.fetch_add(1, std::memory_order_relaxed);
}

// Where unstuffing is; whole in registers.
struct Cursor {
  const uint8_t* in;
  uint8_t* out;
  bool escape;
};

// One byte that is not a flag, without a branch: behind an escape byte `out` stays and is written again.
void TakeByte(Cursor& at) {
  const uint8_t byte = *at.in++;
  *at.out = at.escape ? byte ^ kEscapeBit : byte;
  at.escape = byte == kFrameEscape;
  at.out += at.escape ? 0 : 1;
}

// Takes whole blocks of up to `room` bytes, and ends with the first that holds a flag or an escape byte; true when a
// flag is next. No escape is pending at the start, and there is room for a block.
//
// Blocks are copied whole and what should not have been is written again. A lone escape byte is jumped over; where they
// stand close, jumping from one to the next would cost more than going byte by byte.
bool TakeBlocks(Cursor& at, size_t room) {
  uint32_t flags = 0;
  uint32_t escapes = 0;
  for (;; at.in += ByteBlock::kSize, at.out += ByteBlock::kSize, room -= ByteBlock::kSize) {
    if (room < ByteBlock::kSize) return false;
    const ByteBlock block = ByteBlock::Load(at.in);
    block.Store(at.out);
    flags = block.Find(kFrameFlag);
    escapes = block.Find(kFrameEscape);
    if ((flags | escapes) != 0) break;
  }
  const uint32_t until_flag = flags != 0 ? static_cast<uint32_t>(std::countr_zero(flags)) : ByteBlock::kSize;
  escapes &= (1U << until_flag) - 1U;
  const uint32_t before = escapes != 0 ? static_cast<uint32_t>(std::countr_zero(escapes)) : until_flag;
  if (HasSingleBit(escapes) && before + 1 < until_flag) {
    at.in += before + 1;
    at.out += before;
    *at.out++ = *at.in++ ^ kEscapeBit;
    return false;
  }
  at.in += before;
  at.out += before;
  for (uint32_t i = before; i < until_flag; ++i) TakeByte(at);
  return flags != 0;
}

}  // namespace

void HdlcDeframer::Feed(std::span<const uint8_t> chunk) {
  const uint8_t* in = chunk.data();
  const uint8_t* const end = in + chunk.size();
  while (in != end) {
    in = Unstuff(in, end);
    if (in == end) break;
    if (*in == kFrameFlag) {
      // An escape pending here stays pending: it un-escapes the first byte of the next packet. Required.
      FinishPacket({packet_.data(), length_});
      length_ = 0;
      do ++in;
      while (in != end && *in == kFrameFlag);
    } else {
      DropOverrun();
      ++in;
    }
  }
  EraseZeroTail();
}

// Appends bytes to the packet up to the next flag, or the byte that finds the packet full, or the end of the chunk.
// Gives where it stopped.
const uint8_t* HdlcDeframer::Unstuff(const uint8_t* in, const uint8_t* end) {
  Cursor at{in, packet_.data() + length_, escape_pending_};
  uint8_t* const full = packet_.data() + kMaximumLength;
  for (;;) {
    while (!at.escape) {
      const size_t room = static_cast<size_t>(std::min(end - at.in, full - at.out));
      if (room < ByteBlock::kSize || TakeBlocks(at, room)) break;
    }
    if (at.in == end || *at.in == kFrameFlag) break;
    if (*at.in == kFrameEscape) {
      at.escape = true;
      ++at.in;
    } else {
      if (at.out == full) break;
      TakeByte(at);
    }
  }
  length_ = static_cast<size_t>(at.out - packet_.data());
  escape_pending_ = at.escape;
  return at.in;
}

void HdlcDeframer::DropPartial() {
  length_ = 0;
  escape_pending_ = false;
}

void HdlcDeframer::FinishPacket(std::span<const uint8_t> packet) {
  if (packet.empty() || packet[0] == kIgnoredCode) return;
  if (IsUnchecked(packet[0])) {
    sink_.OnPacket(packet);
  } else {
    DeliverChecked(packet);
  }
}

void HdlcDeframer::DeliverChecked(std::span<const uint8_t> packet) {
  if (packet.size() >= kMaximumLength) {
    Increment(oversized_);
    log_.WriteLine(kLogIo, "Maximum Packet Size reached, %d bytes, suspected invalid packet is skipped",
                   static_cast<int>(kMaximumLength));
  } else if (ComputeFcs16(packet.data(), static_cast<uint16_t>(packet.size() * 8)) == FcsGoodValue) {
    sink_.OnPacket(packet);
    log_.WriteBytes(kLogIo, "SYNC REC (%d bytes): %s", packet);
  } else {
    Increment(bad_fcs_);
    log_.WriteBytes(kLogErr, "ERROR SYNC REC (%d bytes): %s", packet);
  }
}

void HdlcDeframer::DropOverrun() {
  Increment(oversized_);
  log_.WriteLine(kLogErr, "ERROR THREAD READ---NON-HDLC data (%d bytes), data is discarded",
                 static_cast<int>(kMaximumLength));
  length_ = 0;
  escape_pending_ = false;  // it belonged to the byte that is lost
}

// A handset that starts up, or a line that idles low, sends zeros: an unfinished packet of nothing else is noise.
void HdlcDeframer::EraseZeroTail() {
  const auto is_zero = [](uint8_t byte) { return byte == 0; };
  if (length_ == 0 || !std::all_of(packet_.begin(), packet_.begin() + length_, is_zero)) return;
  log_.WriteLine(kLogIo, "Packet is being erased because it is all zeros");
  length_ = 0;
}

}  // namespace kral
