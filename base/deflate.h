// Data that handsets keep or send as zlib streams.
#ifndef KRAL_BASE_DEFLATE_H
#define KRAL_BASE_DEFLATE_H

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace kral {

enum class Effort { kSmall, kFast };
std::vector<uint8_t> Compress(std::span<const uint8_t> bytes, Effort effort = Effort::kSmall);

// What the stream at the beginning holds; what stands behind its end is padding. Nothing when the stream is damaged,
// unfinished, or holds more than `limit` bytes. `used`: how many bytes the stream itself takes.
std::optional<std::vector<uint8_t>> Decompress(std::span<const uint8_t> stream, size_t limit, size_t* used = nullptr);

// Of a stream whose end is missing: what its beginning holds, `limit` bytes at most.
std::vector<uint8_t> DecompressBeginning(std::span<const uint8_t> stream, size_t limit);

}  // namespace kral

#endif
