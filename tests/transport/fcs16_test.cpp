#include "transport/fcs16.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string_view>

#include "tests/support/plain_codec.h"

namespace kral {
namespace {

using test::Bytes;
using test::PlainFcs;

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

// The check is linear, so messages of a single set bit tell every mistake in where a bit is folded to.
TEST(Fcs16, EverySingleBitOfAMessageCountsRight) {
  for (const size_t size : {15U, 16U, 64U, 127U, 128U, 129U, 255U, 256U, 400U, 545U}) {
    Bytes bytes(size);
    for (size_t bit = 0; bit < size * 8; ++bit) {
      bytes[bit / 8] = static_cast<uint8_t>(1U << (bit % 8));
      ASSERT_EQ(FcsOf(bytes), PlainFcs(bytes.data(), size * 8)) << "bit " << bit << " of " << size << " bytes";
      bytes[bit / 8] = 0;
    }
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

TEST(Fcs16, CheckedOverBodyAndFcsGivesGoodValueUntilABitFlips) {
  std::mt19937 random(22);
  for (const size_t size : {1U, 2U, 13U, 14U, 62U, 200U, 1022U, 4091U}) {
    Bytes body = test::WithFcs(test::RandomBytes(random, size, 128));
    ASSERT_EQ(FcsOf(body), FcsGoodValue) << size << " bytes";
    for (int i = 0; i < 50; ++i) {
      const size_t bit = random() % (body.size() * 8);
      body[bit / 8] = static_cast<uint8_t>(body[bit / 8] ^ (1U << (bit % 8)));
      ASSERT_NE(FcsOf(body), FcsGoodValue) << "bit " << bit << " of " << size << " bytes";
      body[bit / 8] = static_cast<uint8_t>(body[bit / 8] ^ (1U << (bit % 8)));
    }
  }
}

}  // namespace
}  // namespace kral
