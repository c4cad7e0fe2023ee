// The handset's codec against what RFC 1662 fixes, not against the library's codec.
#include "handset/line/frame_codec.h"

#include <gtest/gtest.h>

namespace kral::handset {
namespace {

std::vector<Bytes> Decode(FrameDecoder& decoder, ByteView wire) {
  std::vector<Bytes> payloads;
  while (!wire.empty()) {
    std::optional<Bytes> payload;
    wire = wire.subspan(decoder.Feed(wire, payload));
    if (payload) payloads.push_back(*payload);
  }
  return payloads;
}

TEST(HandsetFrameCodec, CheckHasTheCatalogueValueAndTheGoodResidue) {
  const std::string digits = "123456789";
  Bytes bytes(digits.begin(), digits.end());
  EXPECT_EQ(FrameCheck(bytes), 0x906E);
  EXPECT_EQ(FrameCheck({}), 0x0000);

  bytes.push_back(0x6E);
  bytes.push_back(0x90);
  EXPECT_EQ(FrameCheck(bytes) ^ 0xFFFF, 0xF0B8);
}

TEST(HandsetFrameCodec, OnlyFlagAndEscapeAreStuffed) {
  const Bytes wire = EncodeFrame(FromHex("7E 7D 11 13 00"));
  EXPECT_EQ(HexText(ByteView(wire).first(7)), "7D 5E 7D 5D 11 13 00");
  EXPECT_EQ(wire.back(), kFlag);
}

TEST(HandsetFrameCodec, DamagedFrameCostsOnlyItself) {
  const Bytes good = EncodeFrame(FromHex("2F"));
  Bytes endless(FrameDecoder::kLongestBody + 100, 0x55);
  endless.push_back(kFlag);
  Bytes flipped = good;
  flipped[0] ^= 0x01;
  const Bytes aborted = FromHex("01 02 7D 7E");
  const Bytes check_only = FromHex("00 00 7E");
  for (const Bytes& bad : {endless, flipped, aborted, check_only, EncodeCorruptFrame(FromHex("2F"))}) {
    Bytes wire = bad;
    wire.insert(wire.end(), good.begin(), good.end());
    FrameDecoder decoder;
    EXPECT_EQ(Decode(decoder, wire), std::vector<Bytes>{FromHex("2F")});
    EXPECT_EQ(decoder.damaged(), 1u);
  }
}

}  // namespace
}  // namespace kral::handset
