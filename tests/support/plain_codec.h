// The async-HDLC codec once more, bit by bit and byte by byte and sharing nothing with transport/: what the fast code
// is compared with.
#ifndef KRAL_TESTS_SUPPORT_PLAIN_CODEC_H
#define KRAL_TESTS_SUPPORT_PLAIN_CODEC_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <random>
#include <utility>
#include <vector>

namespace kral::test {

using Bytes = std::vector<uint8_t>;
using Packets = std::vector<Bytes>;

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

// The splitter once more, one byte after the other, with what it would count.
class PlainDeframer {
 public:
  void Feed(const Bytes& chunk) {
    for (const uint8_t byte : chunk) Take(byte);
    const bool zeros = std::ranges::all_of(packet_, [](uint8_t byte) { return byte == 0; });
    if (zeros) packet_.clear();
  }

  Packets packets;
  uint64_t bad_fcs = 0;
  uint64_t oversized = 0;

 private:
  void Take(uint8_t byte) {
    if (byte == 0x7D) {
      escape_ = true;
    } else if (byte == 0x7E) {
      if (!packet_.empty()) End();
      packet_.clear();
    } else {
      if (std::exchange(escape_, false)) byte ^= 0x20;
      if (packet_.size() == 4094) {
        ++oversized;
        packet_.clear();
      } else {
        packet_.push_back(byte);
      }
    }
  }

  void End() {
    const uint8_t code = packet_[0];
    if (code == 0x92) return;
    const bool unchecked = code == 0x10 || code == 0x1F || code == 0x60 || code == 0x79;
    if (!unchecked && packet_.size() >= 4094) {
      ++oversized;
    } else if (!unchecked && PlainFcs(packet_.data(), packet_.size() * 8) != 0x0F47) {
      ++bad_fcs;
    } else {
      packets.push_back(packet_);
    }
  }

  Bytes packet_;
  bool escape_ = false;
};

// Random bytes of which about one in `one_special_in` is a flag or an escape byte.
inline Bytes RandomBytes(std::mt19937& random, size_t size, unsigned one_special_in) {
  Bytes bytes(size);
  for (uint8_t& byte : bytes) {
    byte = random() % one_special_in == 0 ? static_cast<uint8_t>(0x7D + random() % 2) : static_cast<uint8_t>(random());
  }
  return bytes;
}

}  // namespace kral::test

namespace kral {

using test::PlainFcs;
using test::PlainFrame;
using test::WithFcs;

}  // namespace kral

#endif
