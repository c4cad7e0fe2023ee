// What becomes of a stream: which frames are delivered, which are dropped, and what is said of them.
#include "transport/line/hdlc_deframer.h"

#include "tests/support/log_lines.h"
#include "tests/support/plain_codec.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;
using test::Packets;
using Lines = test::LogLines::Lines;

struct PacketCollector : PacketListener {
  void OnPacket(std::span<const uint8_t> packet) override { packets.emplace_back(packet.begin(), packet.end()); }
  Packets packets;
};

Bytes Joined(std::initializer_list<Bytes> parts) {
  Bytes joined;
  for (const Bytes& part : parts) joined.insert(joined.end(), part.begin(), part.end());
  return joined;
}

class HdlcDeframerTest : public testing::Test {
 protected:
  // What a chunk delivers.
  Packets Feed(const Bytes& chunk) {
    deframer_.Feed(chunk);
    return std::exchange(sink_.packets, {});
  }

  test::LogLines lines_;
  PacketCollector sink_;
  HdlcDeframer deframer_{sink_, *lines_.log()};
};

TEST_F(HdlcDeframerTest, IntactAnswerIsDeliveredWithItsFcsAndLogged) {
  EXPECT_EQ(Feed({0x7E, 0x7D, 0x5E, 0x7D, 0x5D, 0xF1, 0xCD, 0x7E}), (Packets{{0x7E, 0x7D, 0xF1, 0xCD}}));
  EXPECT_EQ(lines_.Take(), (Lines{"1 SYNC REC (4 bytes): 7E 7D F1 CD "}));
}

TEST_F(HdlcDeframerTest, FirstByteDecidesWhetherTheFcsIsChecked) {
  for (unsigned code = 0; code < 256; ++code) {
    const Bytes bad = {static_cast<uint8_t>(code), 0x01, 0x02, 0xAA, 0xBB};
    const Bytes frame = Joined({test::Stuffed(bad), {0x7E}});
    const bool unchecked = code == 16 || code == 31 || code == 96 || code == 121;
    EXPECT_EQ(Feed(frame), unchecked ? Packets{bad} : Packets{}) << code;
    const Lines lines = lines_.Take();
    EXPECT_EQ(lines.size(), unchecked || code == 146 ? 0U : 1U) << code;
    for (const auto& line : lines) EXPECT_TRUE(line.starts_with("16 ERROR SYNC REC (5 bytes): ")) << line;
  }
  EXPECT_TRUE(Feed(PlainFrame({146, 1, 2})).empty());
  EXPECT_EQ(deframer_.bad_fcs(), 251U);
}

TEST_F(HdlcDeframerTest, LongestAnswerHas4093BytesAndLongestLogPacket4094) {
  EXPECT_EQ(Feed(PlainFrame(Bytes(4091, 0x41))), Packets{WithFcs(Bytes(4091, 0x41))});
  lines_.Take();

  EXPECT_TRUE(Feed(PlainFrame(Bytes(4092, 0x41))).empty());
  EXPECT_EQ(lines_.Take(), (Lines{"1 Maximum Packet Size reached, 4094 bytes, suspected invalid packet is skipped"}));
  EXPECT_EQ(deframer_.oversized(), 1U);

  const Bytes log_packet(4094, 0x10);
  EXPECT_EQ(Feed(Joined({log_packet, {0x7E}})), Packets{log_packet});
  EXPECT_TRUE(lines_.Take().empty());
}

TEST_F(HdlcDeframerTest, Byte4095EmptiesThePacketAndIsLost) {
  const Bytes answer = PlainFrame({0x00, 0x22});
  // The byte that finds the packet full is dropped with it; the frame behind it is intact.
  EXPECT_EQ(Feed(Joined({Bytes(4094, 0x41), {0x55}, answer})), Packets{WithFcs({0x00, 0x22})});
  EXPECT_EQ(lines_.Take()[0], "16 ERROR THREAD READ---NON-HDLC data (4094 bytes), data is discarded");
  // Escaped or not, it counts as one byte, and the escape is used up.
  EXPECT_EQ(Feed(Joined({Bytes(4094, 0x41), {0x7D, 0x55}, answer})), Packets{WithFcs({0x00, 0x22})});
  EXPECT_TRUE(Feed(Bytes(3 * 4095, 0x41)).empty());
  EXPECT_EQ(deframer_.oversized(), 5U);
}

TEST_F(HdlcDeframerTest, UnfinishedPacketOfZerosIsErasedAtTheEndOfItsChunk) {
  const Bytes answer = PlainFrame({0x29, 0x02});
  EXPECT_TRUE(Feed(Bytes(300, 0x00)).empty());
  EXPECT_EQ(lines_.Take(), (Lines{"1 Packet is being erased because it is all zeros"}));
  EXPECT_EQ(Feed(answer), Packets{WithFcs({0x29, 0x02})});
  lines_.Take();

  // The same zeros in one chunk with what follows belong to the packet.
  EXPECT_TRUE(Feed(Joined({{0x00}, answer})).empty());
  EXPECT_EQ(deframer_.bad_fcs(), 1U);
  // An answer to request 0 loses a first byte that arrives alone.
  EXPECT_TRUE(Feed({0x00}).empty());
  lines_.Take();
  EXPECT_TRUE(Feed({0x00, 0x01}).empty());
  EXPECT_TRUE(lines_.Take().empty()) << "a byte other than zero keeps it";
}

TEST_F(HdlcDeframerTest, DroppedPartialTakesAPendingEscapeWithIt) {
  EXPECT_TRUE(Feed({0x41, 0x42, 0x7D}).empty());
  deframer_.DropPartial();
  EXPECT_EQ(Feed(PlainFrame({0x0C})), Packets{WithFcs({0x0C})});
}

// Streams of frames and of rubbish in chunks of any size, against the plain splitter after every chunk.
TEST_F(HdlcDeframerTest, AgreesWithPlainCodeOnAnyStreamInAnyChunks) {
  lines_.log()->SetFlags(0);
  std::mt19937 random(50);
  test::PlainDeframer plain;
  uint64_t delivered = 0;
  for (int round = 0; round < 1000; ++round) {
    Bytes stream;
    const unsigned one_special_in = 1U << (random() % 9);
    for (size_t part = random() % 6; part > 0; --part) {
      const size_t size = random() % 8 == 0 ? random() % 4400 : random() % 100;
      const Bytes bytes = test::RandomBytes(random, size, one_special_in);
      stream = Joined({stream, random() % 3 == 0 ? bytes : PlainFrame(bytes, random() % 2 == 0)});
      if (random() % 10 == 0) stream.insert(stream.end(), random() % 50, random() % 2 == 0 ? 0x00 : 0x7E);
      if (random() % 10 == 0) {  // an escape byte in front of a flag reaches into the next frame
        Bytes next = PlainFrame({0x4B, 0x01});
        next[0] ^= 0x20;
        stream = Joined({stream, WithFcs({0x0C}), {0x7D, 0x7E}, next});
      }
    }
    const size_t largest = size_t{1} << (random() % 13);
    for (size_t at = 0; at < stream.size();) {
      const size_t size = std::min(stream.size() - at, 1 + random() % largest);
      const auto from = stream.begin() + static_cast<ptrdiff_t>(at);
      const Bytes chunk(from, from + static_cast<ptrdiff_t>(size));
      plain.Feed(chunk);
      ASSERT_EQ(Feed(chunk), plain.packets) << "round " << round << ", " << size << " bytes at " << at;
      ASSERT_EQ(deframer_.bad_fcs(), plain.bad_fcs);
      ASSERT_EQ(deframer_.oversized(), plain.oversized);
      delivered += std::exchange(plain.packets, {}).size();
      at += size;
    }
  }
  EXPECT_GT(delivered, 1000U);
  EXPECT_GT(plain.bad_fcs, 300U);
  EXPECT_GT(plain.oversized, 7U);
}

}  // namespace
}  // namespace kral
