// The async-HDLC codec once more, bit by bit and byte by byte and sharing nothing with transport/: what the fast code
// is compared with.
#ifndef KRAL_TESTS_SUPPORT_PLAIN_CODEC_H
#define KRAL_TESTS_SUPPORT_PLAIN_CODEC_H

#include <cstddef>
#include <cstdint>
#include <random>
#include <vector>

namespace kral::test {

using Bytes = std::vector<uint8_t>;

// A shift register fed one bit at a time.
inline uint16_t PlainFcs(const uint8_t* data, size_t bits) {
  uint32_t shift_register = 0xFFFF;
  for (size_t i = 0; i < bits; ++i) {
    const unsigned in = static_cast<unsigned>(data[i / 8]) >> (i % 8);
    const bool out = ((shift_register ^ in) & 1U) != 0;
    shift_register >>= 1;
    if (out) shift_register ^= 0x8408;
  }
  return static_cast<uint16_t>(~shift_register);
}

inline Bytes WithFcs(Bytes body) {
  const unsigned fcs = PlainFcs(body.data(), (body.size() * 8) & 0xFFFFU);
  body.push_back(static_cast<uint8_t>(fcs & 0xFFU));
  body.push_back(static_cast<uint8_t>(fcs >> 8));
  return body;
}

inline Bytes Stuffed(const Bytes& body) {
  Bytes stuffed;
  for (const uint8_t byte : body) {
    if (byte == 0x7D || byte == 0x7E) stuffed.push_back(0x7D);
    stuffed.push_back(byte == 0x7D ? 0x5D : byte == 0x7E ? 0x5E : byte);
  }
  return stuffed;
}

inline Bytes PlainFrame(const Bytes& payload, bool leading_flag = false) {
  Bytes frame = Stuffed(WithFcs(payload));
  if (leading_flag) frame.insert(frame.begin(), 0x7E);
  frame.push_back(0x7E);
  return frame;
}

// Random bytes of which about one in `one_special_in` is a flag or an escape byte.
inline Bytes RandomBytes(std::mt19937& random, size_t size, unsigned one_special_in) {
  Bytes bytes(size);
  for (uint8_t& byte : bytes) {
    byte = random() % one_special_in == 0 ? static_cast<uint8_t>(0x7D + random() % 2) : static_cast<uint8_t>(random());
  }
  return bytes;
}

}  // namespace kral::test

#endif
