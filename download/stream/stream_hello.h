// The handshake with a flash programmer.
#ifndef KRAL_DOWNLOAD_STREAM_STREAM_HELLO_H
#define KRAL_DOWNLOAD_STREAM_STREAM_HELLO_H

#include <cstdint>
#include <optional>
#include <span>

#include "download/link/download_connection.h"
#include "download/stream/image_open.h"

namespace kral::stream {

struct HelloReply {
  uint32_t block_size = 0;  // the largest the handset takes
  uint16_t window = 0;      // as announced
};

inline constexpr uint32_t kHelloVariant = 1;

// Tries up to settings.hello_tries times. Variant 2 is a hook that always fails, as every other number does.
std::optional<HelloReply> Hello(download::DownloadConnection& connection, const download::Settings& settings,
                                uint32_t variant);

// What the reply says, if it is one. Every length in it is checked first.
std::optional<HelloReply> ParseHelloReply(std::span<const uint8_t> reply);

// What the writer is given: one less than announced, in 16 bits, so that 0 becomes 65,535. Required.
constexpr uint32_t WriterWindow(uint16_t announced) {
  return static_cast<uint16_t>(announced + 0xFFFFu);
}

}  // namespace kral::stream

#endif
