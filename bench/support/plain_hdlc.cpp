// Plain on purpose, but no slower than that: nothing is copied twice and the table is made by the compiler.
#include "bench/support/plain_hdlc.h"

namespace kral::bench {
namespace {

constexpr auto kTable = [] {
  std::array<uint16_t, 256> table{};
  for (unsigned i = 0; i < 256; ++i) {
    unsigned value = i;
    for (int bit = 0; bit < 8; ++bit) value = (value & 1U) != 0 ? (value >> 1) ^ 0x8408U : value >> 1;
    table[i] = static_cast<uint16_t>(value);
  }
  return table;
}();

uint8_t* PutStuffed(uint8_t byte, uint8_t* out) {
  if (byte == 0x7E || byte == 0x7D) {
    *out++ = 0x7D;
    byte ^= 0x20;
  }
  *out++ = byte;
  return out;
}

}  // namespace

uint16_t PlainFcs(const uint8_t* data, size_t size) {
  unsigned fcs = 0xFFFF;
  for (size_t i = 0; i < size; ++i) fcs = (fcs >> 8) ^ kTable[(fcs ^ data[i]) & 0xFFU];
  return static_cast<uint16_t>(~fcs);
}

size_t PlainFrame(const uint8_t* payload, size_t size, uint8_t* frame) {
  const unsigned fcs = PlainFcs(payload, size);
  uint8_t* out = frame;
  for (size_t i = 0; i < size; ++i) out = PutStuffed(payload[i], out);
  out = PutStuffed(static_cast<uint8_t>(fcs & 0xFFU), out);
  out = PutStuffed(static_cast<uint8_t>(fcs >> 8), out);
  *out++ = 0x7E;
  return static_cast<size_t>(out - frame);
}

void PlainDeframer::Feed(const uint8_t* chunk, size_t size) {
  for (size_t i = 0; i < size; ++i) {
    uint8_t byte = chunk[i];
    if (byte == 0x7D) {
      escape_ = true;
    } else if (byte == 0x7E) {
      if (length_ != 0 && PlainFcs(packet_.data(), length_) == 0x0F47) sink_(context_, packet_.data(), length_);
      length_ = 0;
    } else {
      if (escape_) byte ^= 0x20;
      escape_ = false;
      if (length_ == 4094) length_ = 0;
      packet_[length_++] = byte;
    }
  }
}

}  // namespace kral::bench
