// What the exports tell of image files, and conversions between them.
#include <gtest/gtest.h>

#include <string>

#include "kral/download.h"
#include "tests/support/hex_files.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

class ImageFiles : public testing::Test {
 protected:
  uint32_t Convert(const std::string& input, const std::string& output, uint32_t direction, uint32_t* base = nullptr) {
    uint32_t result = UINT32_MAX;
    const uint8_t done = KRAL_HEX_Convert(input.c_str(), output.c_str(), direction, base, &result);
    EXPECT_EQ(done, result == 0 ? 1 : 0);
    return result;
  }
  uint32_t Info(const std::string& file, uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT) {
    uint32_t result = UINT32_MAX;
    info_ = {};
    const uint8_t done = KRAL_IMAGE_GetInfo(file.c_str(), format, &info_, &result);
    EXPECT_EQ(done, result == 0 ? 1 : 0);
    return result;
  }

  test::TempFolder folder_;
  KRAL_IMAGE_INFO info_{};
};

TEST_F(ImageFiles, GoToHexAndBackWithTheirGaps) {
  std::string bytes = "from the beginning" + std::string(5000, '\xFF') + "to the end";
  const auto binary = folder_.Add("a.bin", bytes);
  const auto hex = folder_.Path("a.hex");
  uint32_t base = 0x01230000;
  EXPECT_EQ(Convert(binary, hex, KRAL_HEX_FROM_BINARY, &base), 0u);
  EXPECT_LT(folder_.Content("a.hex").size(), 300u) << "gaps are left out";
  base = 0;
  EXPECT_EQ(Convert(hex, folder_.Path("b.bin"), KRAL_HEX_TO_BINARY, &base), 0u);
  EXPECT_EQ(base, 0x01230000u);
  EXPECT_EQ(folder_.Content("b.bin"), bytes);

  EXPECT_EQ(Info(hex), 0u);
  EXPECT_EQ(info_.format, KRAL_IMAGE_FORMAT_HEX);
  EXPECT_EQ(info_.base[0], 0x01230000u);
  EXPECT_EQ(info_.size[0], bytes.size());
  EXPECT_EQ(info_.size[1], 0u);
  EXPECT_EQ(info_.start_address, 0xFFFFFFFFu);
  EXPECT_EQ(info_.payload, 28u);
  EXPECT_EQ(Info(binary), 0u);
  EXPECT_EQ(info_.format, KRAL_IMAGE_FORMAT_BINARY);
  EXPECT_EQ(info_.size[0], bytes.size());
}

TEST_F(ImageFiles, SecondRegionIsToldAndFitsIntoNoBinary) {
  const auto file = folder_.Add("two.hex", test::kTwoRegionsHex);
  ASSERT_EQ(Info(file), 0u);
  EXPECT_EQ(info_.base[1], 0x08000000u);
  EXPECT_EQ(info_.size[1], 1u);
  EXPECT_EQ(Convert(file, folder_.Path("two.bin"), KRAL_HEX_TO_BINARY), KRAL_STREAM_BAD_IMAGE);
}

TEST_F(ImageFiles, FailuresHaveTheirResultsAndLeaveTheOutputAlone) {
  const auto good = folder_.Add("good.bin", "abc");
  const auto broken = folder_.Add("broken.hex", test::kBrokenHex);
  const auto output = folder_.Add("output", "as it was");
  uint32_t odd_base = 0x8000;
  EXPECT_EQ(Convert(good, output, KRAL_HEX_FROM_BINARY, &odd_base), KRAL_STREAM_BAD_ARGUMENT);
  EXPECT_EQ(Convert(good, output, 2), KRAL_STREAM_BAD_ARGUMENT);
  EXPECT_EQ(Convert(broken, output, KRAL_HEX_TO_BINARY), KRAL_STREAM_FILE_NOT_DECODED);
  EXPECT_EQ(Convert(folder_.Path("missing"), output, KRAL_HEX_TO_BINARY), KRAL_STREAM_FILE_NOT_OPENED);
  EXPECT_EQ(Convert(folder_.Add("empty", ""), output, KRAL_HEX_FROM_BINARY), KRAL_STREAM_FILE_NOT_OPENED);
  EXPECT_EQ(Convert(good, folder_.Path("no/such/folder"), KRAL_HEX_FROM_BINARY), KRAL_HEX_NOT_WRITTEN);
  EXPECT_EQ(folder_.Content("output"), "as it was");
  EXPECT_EQ(Info(broken), KRAL_STREAM_FILE_NOT_DECODED);
  EXPECT_EQ(Info(good, 9), KRAL_STREAM_BAD_ARGUMENT);
  EXPECT_EQ(KRAL_IMAGE_GetInfo(nullptr, 0, &info_, nullptr), 0);
  EXPECT_EQ(KRAL_HEX_Convert(nullptr, nullptr, 0, nullptr, nullptr), 0);
}

}  // namespace
}  // namespace kral
