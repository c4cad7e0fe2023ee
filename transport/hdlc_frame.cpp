// Builds frames: FCS, stuffing, flags. Writing them to the port is CProtAHDLC's.
#include "transport/hdlc_frame.h"

#include <algorithm>

#include "transport/fcs16.h"

namespace kral {
namespace {

constexpr bool IsSpecial(uint8_t byte) {
  return byte == kFrameFlag || byte == kFrameEscape;
}

// Gives the end of what was written.
uint8_t* Stuff(std::span<const uint8_t> bytes, uint8_t* out) {
  for (const uint8_t byte : bytes) {
    if (IsSpecial(byte)) {
      *out++ = kFrameEscape;
      *out++ = byte ^ kEscapeBit;
    } else {
      *out++ = byte;
    }
  }
  return out;
}

// Whether an escape pair begins at or behind the limit: the last one tells, and only plain bytes follow it.
bool EscapesBehindLimit(std::span<const uint8_t> stuffed) {
  if (stuffed.size() <= kEscapePairLimit) return false;
  const auto tail = stuffed.subspan(kEscapePairLimit);
  return std::find(tail.begin(), tail.end(), kFrameEscape) != tail.end();
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
