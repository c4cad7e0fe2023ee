// Splits received bytes into packets and checks them. What a packet means is the sorter's.
#include "transport/hdlc_deframer.h"

#include <algorithm>
#include <bit>
#include <utility>

#include "frame/base/hex_dump.h"
#include "frame/base/text_log.h"
#include "transport/byte_block.h"
#include "transport/fcs16.h"
#include "transport/hdlc_frame.h"

namespace kral {
namespace {

// First bytes of packets that the handset sends unasked, and what becomes of them: required as they are.
constexpr std::array<uint8_t, 4> kUncheckedCodes = {16, 31, 96, 121};  // log, 31, event, extended message
constexpr uint8_t kIgnoredCode = 146;

bool IsUnchecked(uint8_t code) {
  return std::find(kUncheckedCodes.begin(), kUncheckedCodes.end(), code) != kUncheckedCodes.end();
}

void Increment(std::atomic<uint64_t>& counter) {
  counter.fetch_add(1, std::memory_order_relaxed);
}

void LogPacket(DataLogFileHandler* log, uint32_t flag, const char* format, std::span<const uint8_t> packet) {
  if (log == nullptr || !log->Wants(flag)) return;
  log->WriteLine(flag, format, static_cast<int>(packet.size()), HexDump(packet).c_str());
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
//
// Blocks are copied whole as long as they hold nothing special, and up to a flag. A lone escape byte is jumped over;
// where they stand close, the bytes go one by one without a branch.
const uint8_t* HdlcDeframer::Unstuff(const uint8_t* in, const uint8_t* end) {
  uint8_t* out = packet_.data() + length_;
  uint8_t* const full = packet_.data() + kMaximumLength;
  bool escape = escape_pending_;
  for (;;) {
    while (!escape && static_cast<size_t>(end - in) >= ByteBlock::kSize &&
           static_cast<size_t>(full - out) >= ByteBlock::kSize) {
      const ByteBlock block = ByteBlock::Load(in);
      block.Store(out);
      const uint32_t flags = block.Find(kFrameFlag);
      const uint32_t until_flag = flags != 0 ? static_cast<uint32_t>(std::countr_zero(flags)) : ByteBlock::kSize;
      const uint32_t escapes = block.Find(kFrameEscape) & ((1U << until_flag) - 1U);
      const uint32_t plain = static_cast<uint32_t>(std::countr_zero(escapes));
      if (escapes == 0) {
        in += until_flag;
        out += until_flag;
        if (flags != 0) break;
      } else if (std::has_single_bit(escapes) && plain + 1 < until_flag) {
        out[plain] = in[plain + 1] ^ kEscapeBit;
        in += plain + 2;
        out += plain + 1;
      } else {
        for (const uint8_t* const stop = in + until_flag; in != stop; ++in) {
          *out = escape ? *in ^ kEscapeBit : *in;
          escape = *in == kFrameEscape;
          out += escape ? 0 : 1;
        }
      }
    }
    if (in == end || *in == kFrameFlag) break;
    if (*in == kFrameEscape) {
      escape = true;
    } else {
      const bool was_escape = std::exchange(escape, false);
      if (out == full) break;
      *out++ = was_escape ? *in ^ kEscapeBit : *in;
    }
    ++in;
  }
  length_ = static_cast<size_t>(out - packet_.data());
  escape_pending_ = escape;
  return in;
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
    if (log_ != nullptr) {
      log_->WriteLine(kLogIo, "Maximum Packet Size reached, %d bytes, suspected invalid packet is skipped",
                      static_cast<int>(kMaximumLength));
    }
  } else if (ComputeFcs16(packet.data(), static_cast<uint16_t>(packet.size() * 8)) == FcsGoodValue) {
    sink_.OnPacket(packet);
    LogPacket(log_, kLogIo, "SYNC REC (%d bytes): %s", packet);
  } else {
    Increment(bad_fcs_);
    LogPacket(log_, kLogErr, "ERROR SYNC REC (%d bytes): %s", packet);
  }
}

void HdlcDeframer::DropOverrun() {
  Increment(oversized_);
  if (log_ != nullptr) {
    log_->WriteLine(kLogErr, "ERROR THREAD READ---NON-HDLC data (%d bytes), data is discarded",
                    static_cast<int>(kMaximumLength));
  }
  length_ = 0;
}

// A handset that starts up, or a line that idles low, sends zeros: an unfinished packet of nothing else is noise.
void HdlcDeframer::EraseZeroTail() {
  const auto is_zero = [](uint8_t byte) { return byte == 0; };
  if (length_ == 0 || !std::all_of(packet_.begin(), packet_.begin() + length_, is_zero)) return;
  if (log_ != nullptr) log_->WriteLine(kLogIo, "Packet is being erased because it is all zeros");
  length_ = 0;
}

}  // namespace kral
