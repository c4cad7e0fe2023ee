// Data that handsets keep or send as zlib streams.
#ifndef KRAL_BASE_DEFLATE_H
#define KRAL_BASE_DEFLATE_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace kral {

std::vector<uint8_t> Compress(std::span<const uint8_t> bytes);

// What the stream at the beginning holds; what stands behind its end is padding. Nothing when the stream is damaged,
// unfinished, or holds more than `limit` bytes. `used`: how many bytes the stream itself takes.
std::optional<std::vector<uint8_t>> Decompress(std::span<const uint8_t> stream, size_t limit, size_t* used = nullptr);

}  // namespace kral

#endif
