// The de-framer against the plain one: any stream, in chunks of any size, must give the same packets and counts. The
// first byte of an input chooses the chunks, and whether lines are logged.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <span>

#include "base/text_log.h"
#include "tests/support/plain_codec.h"
#include "transport/line/hdlc_deframer.h"

namespace {

struct Collector : kral::PacketListener {
  void OnPacket(std::span<const uint8_t> packet) override { packets.emplace_back(packet.begin(), packet.end()); }
  kral::test::Packets packets;
};

void Require(bool held, const char* what, size_t offset) {
  if (held) return;
  std::fprintf(stderr, "different %s behind the chunk at offset %zu\n", what, offset);
  std::abort();
}

// From single bytes, over sizes about that of a block, to more than a packet.
constexpr size_t kChunkSizes[] = {1, 2, 7, 15, 16, 17, 33, 61, 64, 129, 509, 4096, 5000, 40960, 3, 31};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  const size_t chunk_size = kChunkSizes[data[0] % std::size(kChunkSizes)];
  const std::span<const uint8_t> stream(data + 1, size - 1);

  Collector sink;
  kral::DataLogFileHandler log;
  log.SetFlags(data[0] >= 0x80 ? 0xFFFFFFFF : 0);
  kral::HdlcDeframer deframer(sink, log);
  kral::test::PlainDeframer plain;

  for (size_t at = 0; at < stream.size(); at += chunk_size) {
    const auto chunk = stream.subspan(at, std::min(chunk_size, stream.size() - at));
    // A copy of its own, so that the address sanitizer sees a read behind the chunk.
    const kral::test::Bytes copy(chunk.begin(), chunk.end());
    deframer.Feed(copy);
    plain.Feed(copy);
    Require(sink.packets.size() == plain.packets.size(), "number of packets", at);
    Require(deframer.bad_fcs() == plain.bad_fcs && deframer.oversized() == plain.oversized, "counts", at);
  }
  Require(sink.packets == plain.packets, "packets", stream.size());
  return 0;
}
