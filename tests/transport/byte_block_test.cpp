// The blocks of bytes that are searched at once, one by one.
#include "transport/line/byte_block.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>

#include "tests/support/plain_codec.h"

namespace kral {
namespace {

template <class Block>
class ByteBlocks : public testing::Test {};

#ifdef __SSE2__
using Kinds = testing::Types<WordBlock, Sse2Block>;
#else
using Kinds = testing::Types<WordBlock>;
#endif
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
