// Which requests a fault strikes, and the faults that are more than one reply's; the others show in what the library
// makes of them.
#include "handset/line/faults.h"

#include <bitset>

#include "handset/line/frame_codec.h"
#include "tests/support/fake_clock.h"
#include "tests/support/handset_host.h"
#include "tests/support/test.h"

namespace kral::handset {
namespace {

class HandsetFaults : public testing::Test {
 protected:
  std::string Ask() { return host_.Ask("2F"); }

  const std::string reply_ = "2F 34 12";
  const std::string wire_ = HexText(EncodeFrame(FromHex("2F 34 12")));

  test::FakeClock clock_;
  VirtualHandset handset_{Identity{}, clock_};
  test::HandsetHost host_{handset_};
};

TEST_F(HandsetFaults, LateReplyComesInFrontOfTheNext) {
  handset_.faults().Add(AfterNextRequest(), When::Nth(1));
  EXPECT_EQ(Ask(), "");
  EXPECT_EQ(host_.Ask("7B 01"), reply_ + " | 7B 01");
}

TEST_F(HandsetFaults, HungUpDeviceIsDeafAndDumbUntilPluggedIn) {
  handset_.faults().Add(HangUp(), When::Nth(2));
  EXPECT_EQ(Ask(), reply_);
  EXPECT_EQ(Ask(), "");
  EXPECT_TRUE(handset_.vanished());
  EXPECT_FALSE(handset_.FromHost(FromHex("7E")));
  handset_.SendPacket(FromHex("60 00"));
  handset_.PlugIn();
  EXPECT_EQ(Ask(), reply_);
}

TEST_F(HandsetFaults, SelectionCountsMatchingRequestsFromOne) {
  handset_.faults().Add(Lose(), When::Every(3));
  handset_.faults().Add(Refuse(Refusal::kBadLength), When::Nth(2).Of("7B 0A"));
  std::string fates;
  for (int i = 0; i < 7; ++i) fates += Ask().empty() ? 'x' : '.';
  EXPECT_EQ(fates, "..x..x.");
  EXPECT_EQ(host_.Ask("7B 0B"), "7B 0B");
  handset_.faults().Clear();
  handset_.faults().Add(Refuse(Refusal::kBadLength), When::Nth(2).Of("7B 0A"));
  EXPECT_EQ(host_.Ask("7B 0A"), "7B 0A");
  EXPECT_EQ(host_.Ask("7B 0B"), "7B 0B");
  EXPECT_EQ(host_.Ask("7B 0A"), "15 7B 0A");
  handset_.faults().Add(Ignore(), When::From(2));
  fates.clear();
  for (int i = 0; i < 4; ++i) fates += Ask().empty() ? 'x' : '.';
  EXPECT_EQ(fates, ".xxx");
}

// The same on every platform and in every run, so that a failure seen once can be seen again.
TEST_F(HandsetFaults, ChanceAndBitErrorsFollowTheSeed) {
  const auto run = [this](uint64_t seed) {
    handset_.faults().Clear();
    handset_.faults().SetSeed(seed);
    handset_.faults().Add(Lose(), When::Chance(0.25));
    handset_.faults().SetBitErrorRate(0.01);
    Bytes heard;
    for (int i = 0; i < 400; ++i) {
      host_.Send("2F");
      const Bytes chunk = host_.ReadBytes();
      heard.insert(heard.end(), chunk.begin(), chunk.end());
    }
    return heard;
  };
  const Bytes first = run(3);
  EXPECT_EQ(run(3), first);
  EXPECT_NE(run(4), first);

  const size_t frame = FromHex(wire_).size();
  EXPECT_NEAR(static_cast<double>(first.size()) / static_cast<double>(frame), 300, 40);  // a quarter is lost
  const Bytes intact = FromHex(wire_);
  size_t flipped = 0;
  for (size_t i = 0; i < first.size(); ++i) flipped += std::bitset<8>(first[i] ^ intact[i % frame]).count();
  EXPECT_NEAR(static_cast<double>(flipped) / static_cast<double>(first.size() * 8), 0.01, 0.003);
}

TEST_F(HandsetFaults, UnsolicitedPacketsKnowBitErrorsOnly) {
  handset_.faults().Add(Lose(), When::Always());
  handset_.SendPacket(FromHex("60 00"));
  EXPECT_EQ(host_.Packets(), std::vector<std::string>{"60 00"});
  handset_.faults().SetBitErrorRate(1);
  handset_.SendUnframed(FromHex("0F F0"));
  EXPECT_EQ(host_.Read(), "F0 0F");
}

// --- The codec: what damage costs ------------------------------------------------------------------------------------

std::vector<Bytes> Decode(FrameDecoder& decoder, ByteView wire) {
  std::vector<Bytes> payloads;
  while (!wire.empty()) {
    std::optional<Bytes> payload;
    wire = wire.subspan(decoder.Feed(wire, payload));
    if (payload) payloads.push_back(*payload);
  }
  return payloads;
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
