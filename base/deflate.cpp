// Data through zlib's deflate and inflate streams.
#include "base/deflate.h"

#include <zlib.h>

#include <new>

namespace kral {
namespace {

// zlib takes its input through a pointer that is not const and does not write through it.
Bytef* Input(std::span<const uint8_t> bytes) {
  return const_cast<Bytef*>(bytes.data());
}

}  // namespace

std::vector<uint8_t> Compress(std::span<const uint8_t> bytes, Effort effort) {
  z_stream stream{};
  if (deflateInit(&stream, effort == Effort::kFast ? Z_BEST_SPEED : Z_BEST_COMPRESSION) != Z_OK) throw std::bad_alloc();
  std::vector<uint8_t> compressed(deflateBound(&stream, static_cast<uLong>(bytes.size())));
  stream.next_in = Input(bytes);
  stream.avail_in = static_cast<uInt>(bytes.size());
  stream.next_out = compressed.data();
  stream.avail_out = static_cast<uInt>(compressed.size());
  deflate(&stream, Z_FINISH);  // ends at once: the bound leaves room
  compressed.resize(stream.total_out);
  deflateEnd(&stream);
  return compressed;
}

std::optional<std::vector<uint8_t>> Decompress(std::span<const uint8_t> bytes, size_t limit, size_t* used) {
  z_stream stream{};
  if (inflateInit(&stream) != Z_OK) throw std::bad_alloc();
  std::vector<uint8_t> plain(limit + 1);  // one more tells "too much" from "just enough"
  stream.next_in = Input(bytes);
  stream.avail_in = static_cast<uInt>(bytes.size());
  stream.next_out = plain.data();
  stream.avail_out = static_cast<uInt>(plain.size());
  const bool ended = inflate(&stream, Z_FINISH) == Z_STREAM_END;
  const size_t size = stream.total_out;
  if (used != nullptr) *used = stream.total_in;
  inflateEnd(&stream);
  if (!ended || size > limit) return std::nullopt;
  plain.resize(size);
  return plain;
}

std::vector<uint8_t> DecompressBeginning(std::span<const uint8_t> bytes, size_t limit) {
  z_stream stream{};
  if (inflateInit(&stream) != Z_OK) throw std::bad_alloc();
  std::vector<uint8_t> plain(limit);
  stream.next_in = Input(bytes);
  stream.avail_in = static_cast<uInt>(bytes.size());
  stream.next_out = plain.data();
  stream.avail_out = static_cast<uInt>(plain.size());
  inflate(&stream, Z_SYNC_FLUSH);
  plain.resize(stream.total_out);
  inflateEnd(&stream);
  return plain;
}

}  // namespace kral
