// The host's end of the cable for tests of the virtual handset itself: no library in between.
#ifndef KRAL_TESTS_SUPPORT_HANDSET_HOST_H
#define KRAL_TESTS_SUPPORT_HANDSET_HOST_H

#include "handset/line/frame_codec.h"
#include "handset/virtual_handset.h"
#include "tests/support/test.h"

namespace kral::test {

class HandsetHost {
 public:
  explicit HandsetHost(handset::VirtualHandset& handset) : handset_(handset) {}

  void Send(std::string_view request_hex) { handset_.FromHost(handset::EncodeFrame(handset::FromHex(request_hex))); }

  // One read of the port, as hex text.
  std::string Read() { return handset::HexText(ReadBytes()); }

  handset::Bytes ReadBytes() {
    std::array<uint8_t, 8192> buffer{};
    const size_t count = handset_.ToHost(buffer);
    return {buffer.begin(), buffer.begin() + static_cast<std::ptrdiff_t>(count)};
  }

  // The intact packets that can be read now, as hex texts.
  std::vector<std::string> Packets() {
    std::vector<std::string> packets;
    for (handset::Bytes chunk = ReadBytes(); !chunk.empty(); chunk = ReadBytes()) {
      std::optional<handset::Bytes> payload;
      for (handset::ByteView rest(chunk); !rest.empty();) {
        rest = rest.subspan(decoder_.Feed(rest, payload));
        if (payload) packets.push_back(handset::HexText(*payload));
      }
    }
    return packets;
  }

  // The one packet that answers the request; several stand beside each other, none is empty.
  std::string Ask(std::string_view request_hex) {
    Send(request_hex);
    std::string all;
    for (const auto& packet : Packets()) all += (all.empty() ? "" : " | ") + packet;
    return all;
  }

 private:
  handset::VirtualHandset& handset_;
  handset::FrameDecoder decoder_;
};

}  // namespace kral::test

#endif
