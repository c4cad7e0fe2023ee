// The frame check against published values and against a shift register fed bit by bit.
#include "transport/line/fcs16.h"

#include <gtest/gtest.h>

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

TEST(Fcs16, BitsBehindTheLastWholeByteCountOneByOne) {
  std::mt19937 random(21);
  const Bytes bytes = test::RandomBytes(random, 400, 128);
  for (uint16_t bits = 0; bits < 3200; ++bits) {
    ASSERT_EQ(ComputeFcs16(bytes.data(), bits), PlainFcs(bytes.data(), bits)) << bits << " bits";
  }
  const Bytes longest = test::RandomBytes(random, 8192, 128);
  EXPECT_EQ(ComputeFcs16(longest.data(), 65535), PlainFcs(longest.data(), 65535));
}

}  // namespace
}  // namespace kral
