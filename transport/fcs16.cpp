// The frame check sequence, byte by byte through a table.
#include "transport/fcs16.h"

#include <array>
#include <cstddef>

namespace kral {
namespace {

constexpr uint16_t kPolynomial = 0x8408;  // 0x1021, bit-reversed: bits arrive least significant first

constexpr uint16_t ShiftBit(uint16_t fcs, unsigned bit) {
  const unsigned out = (fcs ^ bit) & 1U;
  return static_cast<uint16_t>((fcs >> 1) ^ (out != 0 ? kPolynomial : 0));
}

constexpr auto kByteTable = [] {
  std::array<uint16_t, 256> table{};
  for (unsigned byte = 0; byte < table.size(); ++byte) {
    uint16_t fcs = 0;
    for (unsigned bit = 0; bit < 8; ++bit) fcs = ShiftBit(fcs, byte >> bit);
    table[byte] = fcs;
  }
  return table;
}();
static_assert(kByteTable[1] == 0x1189 && kByteTable[2] == 0x2312 && kByteTable[3] == 0x329B);

}  // namespace

uint16_t ComputeFcs16(const uint8_t* data, uint16_t bit_count) {
  const size_t size = bit_count / 8U;
  uint16_t fcs = 0xFFFF;
  for (size_t i = 0; i < size; ++i) {
    fcs = static_cast<uint16_t>((fcs >> 8) ^ kByteTable[(fcs ^ data[i]) & 0xFFU]);
  }
  for (unsigned bit = 0; bit < bit_count % 8U; ++bit) fcs = ShiftBit(fcs, static_cast<unsigned>(data[size]) >> bit);
  return static_cast<uint16_t>(fcs ^ 0xFFFF);
}

}  // namespace kral
