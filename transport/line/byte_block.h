// A block of neighbouring bytes, loaded, stored and searched at once: 16 where SSE2 or NEON is part of the machine, as
// it is of every machine that the library is built for, else 8.
#ifndef KRAL_TRANSPORT_LINE_BYTE_BLOCK_H
#define KRAL_TRANSPORT_LINE_BYTE_BLOCK_H

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

#ifdef __SSE2__
#include <emmintrin.h>
#elif defined(__aarch64__)
#include <arm_neon.h>
#endif

namespace kral {

// std::has_single_bit counts all bits, with a call where the machine cannot.
constexpr bool HasSingleBit(uint32_t mask) {
  return mask != 0 && (mask & (mask - 1)) == 0;
}

// Eight bytes in a machine word.
class WordBlock {
 public:
  static constexpr size_t kSize = 8;

  static WordBlock Load(const uint8_t* bytes) {
    WordBlock block;
    std::memcpy(&block.word_, bytes, kSize);
    return block;
  }
  void Store(uint8_t* bytes) const { std::memcpy(bytes, &word_, kSize); }

  // One bit per byte, bit 0 for the first, set where the byte has this value.
  uint32_t Find(uint8_t value) const {
    static_assert(std::endian::native == std::endian::little, "the first byte is the lowest");
    constexpr uint64_t kOnes = 0x0101010101010101;
    constexpr uint64_t kLowBits = 0x7F * kOnes;
    const uint64_t difference = word_ ^ (value * kOnes);
    // The top bit of every byte that is not zero; adding to seven bits carries into no neighbour.
    const uint64_t unequal = ((difference & kLowBits) + kLowBits) | difference;
    const uint64_t equal = (~unequal & ~kLowBits) >> 7;
    // Byte k has its bit at 8k; the factor's term 2^(56 - 7k) brings it to bit 56 + k, and no two terms meet there.
    return static_cast<uint32_t>((equal * 0x0102040810204080) >> 56);
  }

 private:
  uint64_t word_ = 0;
};

#ifdef __SSE2__

// Sixteen bytes in an SSE2 register.
class Sse2Block {
 public:
  static constexpr size_t kSize = 16;

  static Sse2Block Load(const uint8_t* bytes) {
    Sse2Block block;
    std::memcpy(&block.bytes_, bytes, kSize);
    return block;
  }
  void Store(uint8_t* bytes) const { std::memcpy(bytes, &bytes_, kSize); }

  uint32_t Find(uint8_t value) const {
    const __m128i equal = _mm_cmpeq_epi8(bytes_, _mm_set1_epi8(static_cast<char>(value)));
    return static_cast<uint32_t>(_mm_movemask_epi8(equal));
  }

 private:
  __m128i bytes_ = {};
};

using ByteBlock = Sse2Block;

#elif defined(__aarch64__)

// Sixteen bytes in a NEON register.
class NeonBlock {
 public:
  static constexpr size_t kSize = 16;

  static NeonBlock Load(const uint8_t* bytes) {
    NeonBlock block;
    block.bytes_ = vld1q_u8(bytes);
    return block;
  }
  void Store(uint8_t* bytes) const { vst1q_u8(bytes, bytes_); }

  // No instruction takes a bit of each byte: each keeps one of its own, and neighbours are added three times.
  uint32_t Find(uint8_t value) const {
    constexpr uint8x16_t kBits = {1, 2, 4, 8, 16, 32, 64, 128, 1, 2, 4, 8, 16, 32, 64, 128};
    const uint8x16_t equal = vandq_u8(vceqq_u8(bytes_, vdupq_n_u8(value)), kBits);
    const uint8x16_t pairs = vpaddq_u8(equal, equal);
    const uint8x16_t fours = vpaddq_u8(pairs, pairs);
    return vgetq_lane_u16(vreinterpretq_u16_u8(vpaddq_u8(fours, fours)), 0);
  }

 private:
  uint8x16_t bytes_ = {};
};

using ByteBlock = NeonBlock;

#else

using ByteBlock = WordBlock;

#endif

}  // namespace kral

#endif
