// What the exports tell of image files, and conversions between them.
#include "kral/download.h"
#include "tests/support/failures.h"
#include "tests/support/hex_files.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

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

TEST_F(ImageFiles, SecondRegionIsTold) {
  const auto file = folder_.Add("two.hex", test::kTwoRegionsHex);
  ASSERT_EQ(Info(file), 0u);
  EXPECT_EQ(info_.base[1], 0x08000000u);
  EXPECT_EQ(info_.size[1], 1u);
}

TEST_F(ImageFiles, ThatWouldLoseDataAreRefusedWithTheLineOfTheFirstLoss) {
  using test::HexRecord;
  const auto output = folder_.Add("output", "as it was");
  const std::string base1 = HexRecord("020000040001");
  const std::string hello = HexRecord("0500200068656C6C6F");  // at 0x20 of the extended address
  const std::string abc = HexRecord("03000000616263");
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
      {"a later record reaches a part of it", base1 + hello + HexRecord("03001F00616865") + end, 2, 3},
      {"a later record reaches all of it", base1 + hello + HexRecord("030023006C6F63") + end, 0, 0},
      {"the same data again", base1 + abc + abc + HexRecord("020001006263") + end, 0, 0},
      {"other data for some addresses", base1 + abc + HexRecord("0400010062646566") + end, 3, 1},
      {"other data for erased flash, which is data too", base1 + HexRecord("02000000FFFF") + abc + end, 3, 2},
      {"other data for two records and their gap",
       base1 + abc + HexRecord("0100040065") + HexRecord("0500000061FF63FFFF") + end, 4, 2},
      {"other data behind some without a place", base1 + hello + HexRecord("0200200068FF") + end, 2, 4},
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
  uint32_t base = 0xFFFF0000;
  const auto full = folder_.Add("full", std::string(0x10000, 'x'));
  EXPECT_EQ(Convert(full, folder_.Path("output"), KRAL_HEX_FROM_BINARY, &base), 0u);
  // Without a record that tells the base, it is the last address: the image would go on from 0.
  const auto baseless = folder_.Add(
      "baseless.hex", test::HexRecord("020000040000") + test::HexRecord("0400000500000000") +
                          test::HexRecord("020000005555") + test::HexRecord("0100020055") + ":00000001FF\n");
  EXPECT_EQ(Info(baseless), KRAL_STREAM_PAST_END);
}

TEST_F(ImageFiles, FailuresHaveTheirResultsNameFileAndLineAndLeaveTheOutputAlone) {
  const auto broken = folder_.Add("broken.hex", test::kBrokenHex);
  const auto dropped = folder_.Add("dropped.hex", test::kDroppedHex);
  const std::string head = ":020000040002F8\n:0100000055AA\n";
  const auto endless = folder_.Add("endless.hex", head);
  const auto far = folder_.Add("far.hex", head + test::HexRecord("02000004F000") + test::HexRecord("0100000055"));
  const auto glued = folder_.Add("glued.hex", ":020000040002F8\n:0100000055AA:0100010055A9\n:00000001FF\n");
  const auto two = folder_.Add("two.hex", test::kTwoRegionsHex);
  const auto binary = folder_.Add("image.bin", std::string(0x10001, 'x'));
  const auto empty = folder_.Add("empty.bin", "");
  const auto large = folder_.Add("large.bin", "");
  std::filesystem::resize_file(large, uint64_t{5} << 30);
  const auto missing = folder_.Path("missing.bin");
  const auto nowhere = folder_.Path("no/folder");
  const auto output = folder_.Add("output", "as it was");
  const auto info = [this](const std::string& file, uint32_t result, uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT) {
    return [=, this] { return Info(file, format) != result; };
  };
  const auto convert = [this](const std::string& input, const std::string& target, uint32_t direction, uint32_t result,
                              uint32_t base = 0) {
    return [=, this]() mutable { return Convert(input, target, direction, &base) != result; };
  };
  const auto find_loss = [](const char* file) {
    uint32_t line = 0;
    return KRAL_HEX_FindLoss(file, &line, nullptr, nullptr);
  };
  const std::string bad_file = "KRAL_IMAGE_GetInfo BAD_FILE";
  test::ExpectFailures(
      0,
      {{"KRAL_IMAGE_GetInfo ARGUMENT", "file", [] { return KRAL_IMAGE_GetInfo(nullptr, 0, nullptr, nullptr); }},
       {"KRAL_IMAGE_GetInfo ARGUMENT", "no image format 9", info(binary, KRAL_STREAM_BAD_ARGUMENT, 9)},
       {bad_file, "missing.bin cannot be opened", info(missing, KRAL_STREAM_FILE_NOT_OPENED)},
       {bad_file, "cannot be opened", info(missing, KRAL_STREAM_FILE_NOT_OPENED, KRAL_IMAGE_FORMAT_HEX)},
       {bad_file, "empty.bin is empty", info(empty, KRAL_STREAM_FILE_NOT_OPENED)},
       {bad_file, "no Intel HEX record", info(empty, KRAL_STREAM_FILE_NOT_DECODED, KRAL_IMAGE_FORMAT_HEX)},
       {bad_file, "large.bin has 4 GiB or more", info(large, KRAL_STREAM_FILE_TOO_LARGE)},
       {bad_file + " line 2", "holds no sound Intel HEX record", info(broken, KRAL_STREAM_FILE_NOT_DECODED)},
       {bad_file + " line 2", "no end-of-file record", info(endless, KRAL_STREAM_FILE_NOT_DECODED)},
       {bad_file + " line 4", "lie outside of the image", info(far, KRAL_STREAM_FILE_NOT_DECODED)},
       {bad_file + " line 2", "have no place in the image", info(glued, KRAL_STREAM_DATA_LOST)},
       {bad_file + " line 1", "have no place in the image", info(dropped, KRAL_STREAM_DATA_LOST)},
       {"KRAL_HEX_FindLoss BAD_FILE line 2", "broken.hex", [&] { return find_loss(broken.c_str()); }},
       {"KRAL_HEX_FindLoss ARGUMENT", "file", [&] { return find_loss(nullptr); }},
       {"KRAL_HEX_Convert BAD_FILE", "second region", convert(two, output, KRAL_HEX_TO_BINARY, KRAL_STREAM_BAD_IMAGE)},
       {"KRAL_HEX_Convert BAD_FILE line 2", "broken.hex",
        convert(broken, output, KRAL_HEX_TO_BINARY, KRAL_STREAM_FILE_NOT_DECODED)},
       {"KRAL_HEX_Convert BAD_FILE", "missing.bin",
        convert(missing, output, KRAL_HEX_TO_BINARY, KRAL_STREAM_FILE_NOT_OPENED)},
       {"KRAL_HEX_Convert ARGUMENT", "0x00000100",
        convert(binary, output, KRAL_HEX_FROM_BINARY, KRAL_STREAM_BAD_ARGUMENT, 0x100)},
       {"KRAL_HEX_Convert ARGUMENT", "past address 0xFFFFFFFF",
        convert(binary, output, KRAL_HEX_FROM_BINARY, KRAL_STREAM_PAST_END, 0xFFFF0000)},
       {"KRAL_HEX_Convert ARGUMENT", "would replace",
        convert(binary, folder_.Path("./image.bin"), KRAL_HEX_FROM_BINARY, KRAL_STREAM_BAD_ARGUMENT)},
       {"KRAL_HEX_Convert ARGUMENT", "would replace",
        convert(broken, broken, KRAL_HEX_TO_BINARY, KRAL_STREAM_BAD_ARGUMENT)},
       {"KRAL_HEX_Convert ARGUMENT", "direction", convert(binary, output, 2, KRAL_STREAM_BAD_ARGUMENT)},
       {"KRAL_HEX_Convert BAD_FILE", "cannot be written",
        convert(binary, nowhere, KRAL_HEX_FROM_BINARY, KRAL_HEX_NOT_WRITTEN), true}});
  EXPECT_EQ(KRAL_HEX_Convert(nullptr, nullptr, 0, nullptr, nullptr), 0);
  EXPECT_EQ(folder_.Content("output"), "as it was");
}

}  // namespace
}  // namespace kral
