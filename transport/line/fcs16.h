// The HDLC frame check sequence of RFC 1662 (CRC-16/X-25).
#ifndef KRAL_TRANSPORT_LINE_FCS16_H
#define KRAL_TRANSPORT_LINE_FCS16_H

#include <cstdint>

namespace kral {

// What ComputeFcs16 gives over an intact body, FCS included (the complement of the residue 0xF0B8).
inline constexpr uint16_t FcsGoodValue = 0x0F47;

// The FCS of bit_count bits, least significant bit first. The count is 16 bits wide on purpose: callers pass
// 8 x bytes, so 8,192 bytes and more are checked over (8 x bytes) mod 65,536 bits only, and handsets expect that.
uint16_t ComputeFcs16(const uint8_t* data, uint16_t bit_count);

}  // namespace kral

#endif
