// The codec as one would first write it, byte after byte with a byte table: what the library's is measured against.
#ifndef KRAL_BENCH_SUPPORT_PLAIN_HDLC_H
#define KRAL_BENCH_SUPPORT_PLAIN_HDLC_H

#include <array>
#include <cstddef>
#include <cstdint>

namespace kral::bench {

uint16_t PlainFcs(const uint8_t* data, size_t size);

// Gives the length of the frame; the caller has room for twice the payload and six bytes.
size_t PlainFrame(const uint8_t* payload, size_t size, uint8_t* frame);

class PlainDeframer {
 public:
  using Sink = void (*)(void* context, const uint8_t* packet, size_t size);

  PlainDeframer(Sink sink, void* context) : sink_(sink), context_(context) {}
  void Feed(const uint8_t* chunk, size_t size);

 private:
  Sink sink_;
  void* context_;
  std::array<uint8_t, 4096> packet_{};
  size_t length_ = 0;
  bool escape_ = false;
};

}  // namespace kral::bench

#endif
