// Frames as they are built: byte stuffing, the FCS, and what is too long to be sent.
#include "transport/line/hdlc_frame.h"

#include "tests/support/plain_codec.h"
#include "tests/support/test.h"
#include "transport/line/byte_block.h"
#include "transport/line/fcs16.h"

namespace kral {
namespace {

using handset::Bytes;

class HdlcFrame : public testing::Test {
 protected:
  // The frame, or nothing when it was refused.
  Bytes Build(const Bytes& payload, bool leading_flag = false) {
    const size_t length = BuildFrame(payload, leading_flag, *buffer_);
    return Bytes(buffer_->begin(), buffer_->begin() + static_cast<ptrdiff_t>(length));
  }

  // Exactly on the heap, so that the address sanitizer sees a byte written too far.
  std::unique_ptr<FrameBuffer> buffer_ = std::make_unique<FrameBuffer>();
};

TEST_F(HdlcFrame, FlagAndEscapeBytesArriveEscaped) {
  EXPECT_EQ(Build({0x7E, 0x7D}), (Bytes{0x7D, 0x5E, 0x7D, 0x5D, 0xF1, 0xCD, 0x7E}));
  EXPECT_EQ(Build({}), (Bytes{0x00, 0x00, 0x7E}));
  EXPECT_EQ(Build({0x7B, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9}), (Bytes{0x7B, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 0x9D, 0x5F, 0x7E}));
}

TEST_F(HdlcFrame, AgreesWithPlainCodeAtEveryDensityOfSpecialBytes) {
  std::mt19937 random(30);
  for (const unsigned one_special_in : {1U, 2U, 3U, 8U, 20U, 128U, 100000U}) {
    for (size_t size = 0; size < 600; ++size) {
      const Bytes payload = test::RandomBytes(random, size, one_special_in);
      ASSERT_EQ(Build(payload), PlainFrame(payload)) << size << " bytes, special one in " << one_special_in;
    }
    const Bytes longest = test::RandomBytes(random, 8000, one_special_in);
    ASSERT_EQ(Build(longest), PlainFrame(longest)) << "special one in " << one_special_in;
  }
}

TEST_F(HdlcFrame, LongPayloadsCarryTheFcsOfTheTruncatedBitCount) {
  for (const size_t size : {8191U, 8192U, 8193U, 12000U, 16380U, 16381U}) {
    Bytes payload(size, 0x31);
    const Bytes frame = Build(payload);
    ASSERT_EQ(frame, PlainFrame(payload)) << size << " bytes";
    payload[size - 1] = 0x32;
    const bool covered = size < 8192;
    EXPECT_EQ(std::equal(frame.end() - 3, frame.end(), Build(payload).end() - 3), !covered) << size << " bytes";
  }
}

TEST_F(HdlcFrame, PayloadOver16381BytesIsRefused) {
  EXPECT_EQ(Build(Bytes(16381, 0x31), true).size(), 16385U);
  EXPECT_TRUE(Build(Bytes(16382, 0x31), true).empty());
}

// What decides is where an escape pair begins, not how long the frame becomes.
TEST_F(HdlcFrame, EscapePairsBehindTheLimitAreRefusedAndPlainBytesAreNot) {
  const struct {
    size_t flags;
    size_t plain;
    size_t flags_behind;
    bool accepted;
  } cases[] = {
      {8192, 0, 0, true},     // the last pair begins at 16382
      {8193, 0, 0, false},    // ... at 16384
      {8191, 1, 1, true},     // ... at 16383
      {8191, 2, 1, false},    // ... at 16384
      {8192, 8189, 0, true},  // the longest frame there is
      {8192, 8188, 1, false}, {16381, 0, 0, false}, {0, 16380, 1, true},
  };
  for (const auto& row : cases) {
    Bytes payload(row.flags, 0x7E);
    payload.insert(payload.end(), row.plain, 0x31);
    payload.insert(payload.end(), row.flags_behind, 0x7E);
    for (const bool leading_flag : {false, true}) {
      const Bytes frame = Build(payload, leading_flag);
      if (row.accepted) {
        EXPECT_EQ(frame, PlainFrame(payload, leading_flag)) << row.flags << " + " << row.plain;
      } else {
        EXPECT_TRUE(frame.empty()) << row.flags << " + " << row.plain;
      }
    }
  }
}

// --- The frame check -------------------------------------------------------------------------------------------------

uint16_t FcsOf(const Bytes& bytes) {
  return ComputeFcs16(bytes.data(), static_cast<uint16_t>(bytes.size() * 8));
}

TEST(Fcs16, AgreesWithPublishedVectors) {
  const std::string_view digits = "123456789";
  EXPECT_EQ(FcsOf(Bytes(digits.begin(), digits.end())), 0x906E);
  EXPECT_EQ(FcsOf({}), 0x0000);
  // The loopback frame that a port may write when it opens.
  EXPECT_EQ(FcsOf({0x7B, 0, 1, 2, 3, 4, 5, 6, 7, 8, 9}), 0x5F9D);
}

TEST(Fcs16, AgreesWithShiftRegisterForEveryLengthAndAlignment) {
  std::mt19937 random(20);
  const Bytes bytes = test::RandomBytes(random, 8191 + 16, 128);
  for (size_t size = 0; size <= 700; ++size) {
    for (size_t offset = 0; offset < 16; ++offset) {
      const uint8_t* const data = bytes.data() + offset;
      ASSERT_EQ(ComputeFcs16(data, static_cast<uint16_t>(size * 8)), PlainFcs(data, size * 8))
          << size << " bytes at offset " << offset;
    }
  }
  for (size_t size = 701; size <= 8191; size += 1 + random() % 40) {
    const uint8_t* const data = bytes.data() + random() % 16;
    ASSERT_EQ(ComputeFcs16(data, static_cast<uint16_t>(size * 8)), PlainFcs(data, size * 8)) << size << " bytes";
  }
}

TEST(Fcs16, BitsBehindTheLastWholeByteCountOneByOne) {
  std::mt19937 random(21);
  const Bytes bytes = test::RandomBytes(random, 400, 128);
  for (uint16_t bits = 0; bits < 3200; ++bits) {
    ASSERT_EQ(ComputeFcs16(bytes.data(), bits), PlainFcs(bytes.data(), bits)) << bits << " bits";
  }
  const Bytes longest = test::RandomBytes(random, 8192, 128);
  EXPECT_EQ(ComputeFcs16(longest.data(), 65535), PlainFcs(longest.data(), 65535));
}

// --- Blocks of bytes that are searched at once, one by one ----------------------------------------------------------

template <class Block>
class ByteBlocks : public testing::Test {};

using Kinds = testing::Types<WordBlock, ByteBlock>;
TYPED_TEST_SUITE(ByteBlocks, Kinds);

TYPED_TEST(ByteBlocks, FindMarksExactlyTheBytesOfTheValue) {
  std::mt19937 random(40);
  // Neighbours of the value are what a search with carries would take for it.
  const std::array<uint8_t, 8> values = {0x7D, 0x7E, 0x7F, 0x7C, 0xFD, 0xFE, 0x00, 0xFF};
  for (int round = 0; round < 20000; ++round) {
    std::array<uint8_t, TypeParam::kSize> bytes;
    for (uint8_t& byte : bytes) byte = random() % 4 == 0 ? static_cast<uint8_t>(random()) : values[random() % 8];
    const uint8_t value = values[static_cast<size_t>(round) % values.size()];
    uint32_t expected = 0;
    for (size_t i = 0; i < bytes.size(); ++i) expected |= (bytes[i] == value ? 1U : 0U) << i;
    ASSERT_EQ(TypeParam::Load(bytes.data()).Find(value), expected);
  }
}

TYPED_TEST(ByteBlocks, StoreGivesBackWhatWasLoaded) {
  std::mt19937 random(41);
  const test::Bytes bytes = test::RandomBytes(random, TypeParam::kSize + 3, 4);
  test::Bytes copy(bytes.size());
  TypeParam::Load(bytes.data() + 1).Store(copy.data() + 1);
  EXPECT_TRUE(std::equal(copy.begin() + 1, copy.end() - 2, bytes.begin() + 1));
  EXPECT_EQ(copy.front() | copy.back() | copy[copy.size() - 2], 0);
}

}  // namespace
}  // namespace kral
