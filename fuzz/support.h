// What the fuzz targets share.
#ifndef KRAL_FUZZ_SUPPORT_H
#define KRAL_FUZZ_SUPPORT_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <span>
#include <vector>

namespace kral::fuzz {

using Bytes = std::vector<uint8_t>;
using ByteView = std::span<const uint8_t>;

// What holds for every input.
inline void Require(bool held) {
  if (!held) std::abort();
}

// Reads bytes in memory as a file is read.
inline auto SourceOf(ByteView bytes) {
  return [bytes](std::span<uint8_t> buffer) mutable {
    const size_t count = std::min(buffer.size(), bytes.size());
    std::copy_n(bytes.begin(), count, buffer.begin());
    bytes = bytes.subspan(count);
    return std::optional(count);
  };
}

// A part of an input: a byte that says what the bytes are for, how many there are, and they. Bit 2 of the first counts
// in sixteens.
struct Part {
  uint8_t control;
  ByteView bytes;
};

class Parts {
 public:
  explicit Parts(ByteView input, int most = 300) : rest_(input), left_(most) {}

  // Nothing behind the last, and once there were too many.
  std::optional<Part> Next() {
    constexpr uint8_t kSixteens = 4;
    if (rest_.size() < 2 || left_-- <= 0) return std::nullopt;
    const uint8_t control = rest_[0];
    const size_t wanted = size_t{rest_[1]} * ((control & kSixteens) != 0 ? 16 : 1);
    const Part part{control, rest_.subspan(2, std::min(wanted, rest_.size() - 2))};
    rest_ = rest_.subspan(2 + part.bytes.size());
    return part;
  }

 private:
  ByteView rest_;
  int left_;
};

}  // namespace kral::fuzz

#endif
