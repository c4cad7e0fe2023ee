// What the exports tell of image files, and conversions between them.
#include <gtest/gtest.h>

#include <filesystem>
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

TEST_F(ImageFiles, ThatWouldLoseDataAreRefusedWithTheLineOfTheFirstLoss) {
  using test::HexRecord;
  const auto output = folder_.Add("output", "as it was");
  const std::string base1 = HexRecord("020000040001");
  const std::string hello = HexRecord("0500200068656C6C6F");  // at 0x20 of the extended address
  const std::string end = ":00000001FF\n";
  const struct {
    const char* name;
    std::string text;
    uint32_t line;
    uint64_t bytes;
  } kRows[] = {
      {"no extended address", test::kDroppedHex, 1, 5},
      {"two records in front of the first one", hello + hello + base1 + HexRecord("0100000055") + end, 1, 10},
      {"a start address is no base", HexRecord("0400000500010000") + hello + end, 2, 5},
      {"one record above the base", base1 + hello + end, 2, 5},
      {"falling order", base1 + hello + HexRecord("03000000616263") + end, 2, 5},
      {"a later record reaches a part of it", base1 + hello + HexRecord("03001F00616263") + end, 2, 3},
      {"a later record reaches all of it", base1 + hello + HexRecord("03002300616263") + end, 0, 0},
      {"the end of the address space",
       HexRecord("02000004FFFF") + HexRecord("02FFFC005555") + HexRecord("02FFFE005555") + end, 2, 4},
      {"the second region above its base", base1 + HexRecord("0100000055") + HexRecord("020000040800") + hello + end, 4,
       5},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.name);
    const auto file = folder_.Add("file.hex", row.text);
    const uint32_t result = row.bytes == 0 ? KRAL_STREAM_WRITTEN : KRAL_STREAM_DATA_LOST;
    EXPECT_EQ(Info(file), result);
    if (row.bytes != 0) {
      EXPECT_EQ(Convert(file, output, KRAL_HEX_TO_BINARY), result);
    }
    uint32_t line = 77;
    uint64_t bytes = 77;
    uint32_t found = 77;
    EXPECT_EQ(KRAL_HEX_FindLoss(file.c_str(), &line, &bytes, &found), 1);
    EXPECT_EQ(line, row.line);
    EXPECT_EQ(bytes, row.bytes);
    EXPECT_EQ(found, 0u);
  }
  EXPECT_EQ(folder_.Content("output"), "as it was");
  uint32_t line = 77;
  uint32_t found = 77;
  EXPECT_EQ(KRAL_HEX_FindLoss(folder_.Add("file.hex", test::kBrokenHex).c_str(), &line, nullptr, &found), 0);
  EXPECT_EQ(found, KRAL_STREAM_FILE_NOT_DECODED);
  EXPECT_EQ(KRAL_HEX_FindLoss(folder_.Path("missing").c_str(), &line, nullptr, &found), 0);
  EXPECT_EQ(found, KRAL_STREAM_FILE_NOT_OPENED);
  EXPECT_EQ(line, 77u);
  EXPECT_EQ(KRAL_HEX_FindLoss(folder_.Path("file.hex").c_str(), nullptr, nullptr, nullptr), 0);
}

TEST_F(ImageFiles, EndWhereTheAddressesEnd) {
  const auto output = folder_.Path("output");
  uint32_t base = 0xFFFF0000;
  EXPECT_EQ(Convert(folder_.Add("over", std::string(0x10001, 'x')), output, KRAL_HEX_FROM_BINARY, &base),
            KRAL_STREAM_PAST_END);
  EXPECT_FALSE(std::filesystem::exists(output));
  EXPECT_EQ(Convert(folder_.Add("full", std::string(0x10000, 'x')), output, KRAL_HEX_FROM_BINARY, &base), 0u);
  // Without a record that tells the base, it is the last address: the image would go on from 0.
  const auto baseless = folder_.Add(
      "baseless.hex", test::HexRecord("020000040000") + test::HexRecord("0400000500000000") +
                          test::HexRecord("020000005555") + test::HexRecord("0100020055") + ":00000001FF\n");
  EXPECT_EQ(Info(baseless), KRAL_STREAM_PAST_END);
  const auto large = folder_.Add("large", "x");
  std::filesystem::resize_file(large, uint64_t{5} << 30);
  EXPECT_EQ(Info(large), KRAL_STREAM_FILE_TOO_LARGE);
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
