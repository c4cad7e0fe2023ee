// Builds frames: FCS, stuffing, flags. Writing them to the port is CProtAHDLC's.
#include "transport/line/hdlc_frame.h"

#include <algorithm>
#include <array>
#include <bit>

#include "transport/line/byte_block.h"
#include "transport/line/fcs16.h"

namespace kral {
namespace {

// What each byte becomes: the first byte in the lower half, and in the upper half the second one, or 0.
constexpr auto kStuffed = [] {
  std::array<uint16_t, 256> stuffed{};
  for (unsigned byte = 0; byte < stuffed.size(); ++byte) {
    const bool special = byte == kFrameFlag || byte == kFrameEscape;
    stuffed[byte] = static_cast<uint16_t>(special ? kFrameEscape | (byte ^ kEscapeBit) << 8 : byte);
  }
  return stuffed;
}();
static_assert(((kFrameFlag ^ kEscapeBit) >> 6) == 1 && ((kFrameEscape ^ kEscapeBit) >> 6) == 1);

// One byte without a branch, which a processor could not guess, and the compiler would make of a comparison: a plain
// byte's second write is overwritten by what comes next, the closing flag at last.
uint8_t* StuffByte(uint8_t byte, uint8_t* out) {
  const uint16_t stuffed = kStuffed[byte];
  out[0] = static_cast<uint8_t>(stuffed);
  out[1] = static_cast<uint8_t>(stuffed >> 8);
  return out + 1 + (stuffed >> 14);
}

// Gives the end of what was written; the byte behind it may have been written too.
//
// Blocks are copied whole as long as they hold nothing special. Behind a lone special byte the search goes on; where
// they stand close, jumping from one to the next would cost more than going byte by byte.
uint8_t* Stuff(std::span<const uint8_t> bytes, uint8_t* out) {
  const uint8_t* in = bytes.data();
  const uint8_t* const end = in + bytes.size();
  while (static_cast<size_t>(end - in) >= ByteBlock::kSize) {
    const ByteBlock block = ByteBlock::Load(in);
    block.Store(out);
    const uint32_t special = block.Find(kFrameFlag) | block.Find(kFrameEscape);
    if (special == 0) {
      in += ByteBlock::kSize;
      out += ByteBlock::kSize;
    } else if (HasSingleBit(special)) {
      const int before = std::countr_zero(special);
      out = StuffByte(in[before], out + before);
      in += before + 1;
    } else {
      for (const uint8_t* const block_end = in + ByteBlock::kSize; in != block_end; ++in) out = StuffByte(*in, out);
    }
  }
  for (; in != end; ++in) out = StuffByte(*in, out);
  return out;
}

// Whether an escape pair begins at or behind the limit: the last one tells, and only plain bytes follow it.
bool EscapesBehindLimit(std::span<const uint8_t> stuffed) {
  if (stuffed.size() <= kEscapePairLimit) return false;
  const auto tail = stuffed.subspan(kEscapePairLimit);
  return std::ranges::find(tail, kFrameEscape) != tail.end();
}

}  // namespace

size_t BuildFrame(std::span<const uint8_t> payload, bool leading_flag, FrameBuffer& frame) {
  if (payload.size() > kMaximumPayload) return 0;
  // 16 bits on purpose: from 8,192 bytes on, the FCS covers (8 x size) mod 65,536 bits only.
  const uint16_t fcs = ComputeFcs16(payload.data(), static_cast<uint16_t>(payload.size() * 8));
  const std::array<uint8_t, kFcsSize> trailer = {static_cast<uint8_t>(fcs), static_cast<uint8_t>(fcs >> 8)};

  uint8_t* const begin = frame.data() + (leading_flag ? 1 : 0);
  uint8_t* const end = Stuff(trailer, Stuff(payload, begin));
  if (EscapesBehindLimit({begin, end})) return 0;

  if (leading_flag) frame[0] = kFrameFlag;
  *end = kFrameFlag;
  return static_cast<size_t>(end - frame.data()) + 1;
}

}  // namespace kral
