// The handset's codec against what RFC 1662 fixes, not against the library's codec.
#include "handset/frame_codec.h"

#include <gtest/gtest.h>

#include <array>
#include <random>

namespace kral::handset {
namespace {

std::vector<Bytes> Decode(FrameDecoder& decoder, ByteView wire, size_t chunk_size) {
  std::vector<Bytes> payloads;
  for (size_t begin = 0; begin < wire.size(); begin += chunk_size) {
    ByteView chunk = wire.subspan(begin, std::min(chunk_size, wire.size() - begin));
    while (!chunk.empty()) {
      std::optional<Bytes> payload;
      chunk = chunk.subspan(decoder.Feed(chunk, payload));
      if (payload) payloads.push_back(*payload);
    }
  }
  return payloads;
}

// Bit by bit, as the polynomial x^16 + x^12 + x^5 + 1 stands in the RFC.
uint16_t SlowCheck(ByteView bytes) {
  uint32_t check = 0xFFFF;
  for (const uint8_t byte : bytes) {
    for (int bit = 0; bit < 8; ++bit) {
      const bool one = ((check ^ byte >> bit) & 1) != 0;
      check = check >> 1 ^ (one ? 0x8408 : 0);
    }
  }
  return static_cast<uint16_t>(check ^ 0xFFFF);
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

TEST(HandsetFrameCodec, CheckCountsBitsInSixteenBits) {
  Bytes bytes(8192 + 5);
  std::mt19937 random(7);
  for (auto& byte : bytes) byte = static_cast<uint8_t>(random());
  EXPECT_EQ(FrameCheck(ByteView(bytes).first(8191)), SlowCheck(ByteView(bytes).first(8191)));
  EXPECT_EQ(FrameCheck(ByteView(bytes).first(8192)), SlowCheck({}));
  EXPECT_EQ(FrameCheck(bytes), SlowCheck(ByteView(bytes).first(5)));
}

TEST(HandsetFrameCodec, OnlyFlagAndEscapeAreStuffed) {
  const Bytes wire = EncodeFrame(FromHex("7E 7D 11 13 00"));
  EXPECT_EQ(HexText(ByteView(wire).first(7)), "7D 5E 7D 5D 11 13 00");
  EXPECT_EQ(wire.back(), kFlag);
}

TEST(HandsetFrameCodec, FramesSurviveEveryChunking) {
  const std::array<Bytes, 4> payloads{FromHex("00"), FromHex("7E 7E 7D 7D 5E"), Bytes(300, 0x7D), FromHex("4B 13 02")};
  Bytes wire = FromHex("7E 7E");  // leading and repeated flags deliver nothing
  for (const Bytes& payload : payloads) {
    const Bytes frame = EncodeFrame(payload);
    wire.insert(wire.end(), frame.begin(), frame.end());
    wire.push_back(kFlag);
  }
  for (const size_t chunk_size : {size_t{1}, size_t{2}, size_t{3}, size_t{7}, wire.size()}) {
    FrameDecoder decoder;
    EXPECT_EQ(Decode(decoder, wire, chunk_size), std::vector<Bytes>(payloads.begin(), payloads.end())) << chunk_size;
    EXPECT_EQ(decoder.damaged(), 0u);
  }
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
    EXPECT_EQ(Decode(decoder, wire, 4096), std::vector<Bytes>{FromHex("2F")});
    EXPECT_EQ(decoder.damaged(), 1u);
  }
}

}  // namespace
}  // namespace kral::handset
