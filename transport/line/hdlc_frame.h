// The frame format: payload and FCS with flag and escape bytes stuffed, between flags. Pure; I/O is CProtAHDLC's.
#ifndef KRAL_TRANSPORT_LINE_HDLC_FRAME_H
#define KRAL_TRANSPORT_LINE_HDLC_FRAME_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

#include "base/wire_codes.h"

namespace kral {

inline constexpr uint8_t kFrameFlag = 0x7E;
inline constexpr uint8_t kFrameEscape = 0x7D;
inline constexpr uint8_t kEscapeBit = 0x20;  // toggled in the byte behind an escape byte

inline constexpr size_t kMaximumPayload = 16381;
// No escape pair begins at or behind this offset of the stuffed body; plain bytes may.
inline constexpr size_t kEscapePairLimit = 16384;

// Room for a body of escape pairs only, and two flags. BuildFrame stuffs first and refuses afterwards.
using FrameBuffer = std::array<uint8_t, 2 * (kMaximumPayload + kFcsSize) + 2>;

// Writes the frame of a payload and gives its length; 0 when the payload, or its stuffed form, is too long.
size_t BuildFrame(std::span<const uint8_t> payload, bool leading_flag, FrameBuffer& frame);

}  // namespace kral

#endif
