// The packet buffer: its limits, which are one byte short, and its reading from the end.
#include "base/diag_packet.h"
#include "tests/support/test.h"

namespace kral {
namespace {

TEST(DiagPacket, ResetFillsBothAreas) {
  CDiagPacket packet;
  packet.Append32(1);
  packet.set_response_length(65535);
  EXPECT_EQ(packet.response_length(), CDiagPacket::kCapacity) << "cut";
  packet.set_response_length(3);
  packet.Reset();
  EXPECT_EQ(packet.request_length(), 0);
  EXPECT_EQ(packet.response_length(), 6144);
  const auto all = [](std::span<const uint8_t> bytes, uint8_t value) {
    return std::ranges::count(bytes, value) == 6144;
  };
  EXPECT_TRUE(all(packet.request_area(), 0xAA));
  EXPECT_TRUE(all(packet.response_area(), 0xBB));
}

TEST(DiagPacket, AppendsLittleEndian) {
  CDiagPacket packet;
  packet.Append8(0x01);
  packet.Append16(0x0302);
  packet.Append32(0x07060504);
  packet.AppendBlock(std::vector<uint8_t>{8, 9});
  EXPECT_TRUE(std::ranges::equal(packet.request(), std::vector<uint8_t>{1, 2, 3, 4, 5, 6, 7, 8, 9}));
}

TEST(DiagPacket, AppendThatWouldFillTheLastByteIsDropped) {
  const struct {
    size_t size;
    std::function<void(CDiagPacket&)> append;
  } kLimits[] = {{1, [](CDiagPacket& p) { p.Append8(0); }},
                 {2, [](CDiagPacket& p) { p.Append16(0); }},
                 {4, [](CDiagPacket& p) { p.Append32(0); }},
                 {100, [](CDiagPacket& p) { p.AppendBlock(std::vector<uint8_t>(100)); }}};
  for (const auto& limit : kLimits) {
    SCOPED_TRACE(limit.size);
    const size_t full = CDiagPacket::kCapacity - limit.size;  // the append would end exactly at the capacity
    CDiagPacket packet;
    packet.AppendBlock(std::vector<uint8_t>(full));
    limit.append(packet);
    EXPECT_EQ(packet.request_length(), full);

    packet.Reset();
    packet.AppendBlock(std::vector<uint8_t>(full - 1));
    limit.append(packet);
    EXPECT_EQ(packet.request_length(), CDiagPacket::kCapacity - 1);
    limit.append(packet);
    EXPECT_EQ(packet.request_length(), CDiagPacket::kCapacity - 1);
  }
  for (const size_t size : {6144u, 6145u, 65536u, 70000u}) {
    CDiagPacket packet;
    packet.AppendBlock(std::vector<uint8_t>(size));
    EXPECT_EQ(packet.request_length(), 0) << "a block larger than the buffer: " << size;
  }
}

class Answered : public testing::Test {
 protected:
  Answered() {
    for (uint8_t i = 0; i < 7; ++i) packet_.response_area()[i] = static_cast<uint8_t>(i + 1);
    packet_.set_response_length(7);
  }

  CDiagPacket packet_;
};

TEST_F(Answered, ReadsFromTheEndBackwardsBeginsThereAgainAfterTheFrontAndNeverReadsMoreThanRemains) {
  uint8_t byte = 0;
  uint16_t word = 0;
  uint32_t double_word = 0xDEADBEEF;
  EXPECT_TRUE(packet_.Read16(word) && packet_.Read16(word));
  EXPECT_EQ(word, 0x0504);
  EXPECT_FALSE(packet_.Read32(double_word));  // 3 bytes remain
  EXPECT_EQ(double_word, 0xDEADBEEF);
  std::vector<uint8_t> rest(3);
  EXPECT_TRUE(packet_.ReadBlock(rest));
  EXPECT_EQ(rest, (std::vector<uint8_t>{1, 2, 3}));
  EXPECT_TRUE(packet_.Read8(byte) && packet_.Read16(word) && packet_.Read32(double_word));
  EXPECT_EQ(byte, 7);
  EXPECT_EQ(word, 0x0605);
  EXPECT_EQ(double_word, 0x04030201u);
}

TEST_F(Answered, FieldsBeyondTheReceivedLengthAreRefused) {
  uint16_t word = 0x1111;
  EXPECT_TRUE(packet_.ResponseAt16(5, word));
  EXPECT_EQ(word, 0x0706);
  uint8_t byte = 0x22;
  uint32_t double_word = 0x33;
  EXPECT_FALSE(packet_.ResponseAt16(6, word));
  EXPECT_FALSE(packet_.ResponseAt8(7, byte));
  EXPECT_FALSE(packet_.ResponseAt32(4, double_word));
  EXPECT_FALSE(packet_.ResponseAt32(SIZE_MAX, double_word));
  EXPECT_EQ(word, 0x0706);
  EXPECT_EQ(byte, 0x22);
  EXPECT_EQ(double_word, 0x33u);
}

}  // namespace
}  // namespace kral
