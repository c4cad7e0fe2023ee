// Frames as they are built: byte stuffing, the FCS, and what is too long to be sent.
#include "transport/line/hdlc_frame.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>

#include "tests/support/plain_codec.h"

namespace kral {
namespace {

using test::Bytes;
using test::PlainFrame;

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

}  // namespace
}  // namespace kral
