// Masks as handsets have them: bit i is bit (i mod 8) of byte (i / 8).
#ifndef KRAL_COMMANDS_LOGS_BIT_MASK_H
#define KRAL_COMMANDS_LOGS_BIT_MASK_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kral {

class BitMask {
 public:
  explicit BitMask(size_t bits) : bits_(bits), bytes_(BytesFor(bits)) {}
  // A handset may tell any number: rounded up without an addition that wraps where size_t has 32 bits.
  static constexpr size_t BytesFor(size_t bits) { return bits / 8 + (bits % 8 != 0 ? 1 : 0); }

  size_t bits() const { return bits_; }
  std::vector<uint8_t>& bytes() { return bytes_; }
  const std::vector<uint8_t>& bytes() const { return bytes_; }

  // The bit is below bits().
  bool Test(size_t bit) const { return (bytes_[bit / 8] >> (bit % 8) & 1) != 0; }
  void Set(size_t bit, bool on) {
    const auto flag = static_cast<uint8_t>(1U << (bit % 8));
    bytes_[bit / 8] = static_cast<uint8_t>(on ? bytes_[bit / 8] | flag : bytes_[bit / 8] & ~flag);
  }

 private:
  size_t bits_;
  std::vector<uint8_t> bytes_;
};

}  // namespace kral

#endif
