// Intel HEX against two foreign tools, srec_cat and objcopy, in both directions over generated images.
#include <cstdio>
#include <cstdlib>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_dpaged.h"
#include "kral/download.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::images {
namespace {

struct Layout {
  uint32_t base;  // a multiple of 64 KiB: the HEX base and the image base are then the same
  uint32_t size;
  bool linear;
};

// Segments reach up to 1 MiB. objcopy uses segments below that and linear records above. The sizes end within a
// chunk, at a chunk, and behind the reach of one extended address.
constexpr Layout kLayouts[] = {
    {0x10000, 1, true},          {0x10000, 0x800, false},    {0x20000, 0x8123, false},    {0x10000, 0xE0007, false},
    {0x00100000, 0x2345F, true}, {0xFFF00000, 0x1001, true}, {0x07FF0000, 0x3FFF0, true},
};

std::string Hex(uint32_t value) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%X", static_cast<unsigned>(value));
  return text;
}

class HexOracle : public testing::Test {
 protected:
  void SetUp() override {
    ASSERT_TRUE(Runs("srec_cat --version") && Runs("objcopy --version")) << "the scripts install srecord and binutils";
  }

  bool Runs(const std::string& command) const {
    return std::system((command + " >" + folder_.Path("output") + " 2>&1").c_str()) == 0;
  }

  // Random bytes with erased stretches of all lengths; the first and the last byte are not erased.
  std::string Generate(uint32_t size) {
    std::string bytes(size, '\xFF');
    for (uint32_t at = 0; at < size;) {
      const uint32_t written = std::uniform_int_distribution<uint32_t>(1, 3000)(random_);
      for (uint32_t i = 0; i < written && at < size; ++i) bytes[at++] = static_cast<char>(random_());
      at += std::uniform_int_distribution<uint32_t>(0, 200)(random_);
    }
    bytes.front() = bytes.back() = 'x';
    return bytes;
  }

  const test::TempFolder folder_;
  std::mt19937 random_{2024};
};

TEST_F(HexOracle, DecodesWhatTheToolsWrite) {
  for (const Layout& layout : kLayouts) {
    const std::string bytes = Generate(layout.size);
    const std::string bin = folder_.Add("in.bin", bytes);
    const std::string out = folder_.Path("out.hex");
    const std::string segmented = layout.linear ? "" : " -address-length=3";
    const std::string commands[] = {
        "srec_cat " + bin + " -binary -offset " + Hex(layout.base) + " -o " + out + " -intel" + segmented,
        "objcopy -I binary -O ihex --change-addresses " + Hex(layout.base) + " " + bin + " " + out};
    for (const std::string& command : commands) {
      SCOPED_TRACE(command);
      ASSERT_TRUE(Runs(command)) << folder_.Content("output");
      HexPhoneImageDecoder decoder;
      PhoneImageDPaged image(0x10000, &decoder);
      TextFile file;
      ASSERT_TRUE(file.OpenForReading(out));
      ASSERT_TRUE(decoder.Decode(image, file));
      EXPECT_EQ(image.GetBaseAddress(0), layout.base);
      EXPECT_EQ(image.GetSize(0) + image.GetSize(1), layout.size);
      std::string decoded(layout.size, '?');
      image.Read(layout.base, decoded.data(), layout.size, 0);
      EXPECT_EQ(decoded, bytes);
    }
  }
}

// Below 64 KiB objcopy writes no extended address, and the reader drops what has none in front of it.
TEST_F(HexOracle, OrdinaryFilesFromAddressZeroAreRefused) {
  const std::string hex = folder_.Path("out.hex");
  ASSERT_TRUE(Runs("objcopy -I binary -O ihex " + folder_.Add("in.bin", Generate(200000)) + " " + hex));
  KRAL_IMAGE_INFO info{};
  uint32_t result = 77;
  EXPECT_EQ(KRAL_IMAGE_GetInfo(hex.c_str(), KRAL_IMAGE_FORMAT_BY_CONTENT, &info, &result), 0);
  EXPECT_EQ(result, KRAL_STREAM_DATA_LOST);
  uint32_t line = 0;
  uint64_t bytes = 0;
  EXPECT_EQ(KRAL_HEX_FindLoss(hex.c_str(), &line, &bytes, nullptr), 1);
  EXPECT_EQ(line, 1u);
  EXPECT_EQ(bytes, 65536u);
}

TEST_F(HexOracle, TheToolsReadWhatIsEncoded) {
  for (const Layout& layout : kLayouts) {
    const std::string bytes = Generate(layout.size);
    PhoneImageDPaged image(0x10000, nullptr);
    image.SetBaseAddress(layout.base, 0);
    image.Write(layout.base, bytes.data(), layout.size, 0);
    HexPhoneImageDecoder encoder(false, false, layout.linear);
    TextFile file;
    const std::string hex = folder_.Path("in.hex");
    ASSERT_TRUE(file.OpenForWriting(hex));
    ASSERT_TRUE(encoder.Encode(image, file));
    ASSERT_TRUE(file.Close());

    const std::string out = folder_.Path("out.bin");
    const std::string commands[] = {"srec_cat " + hex + " -intel -offset -" + Hex(layout.base) + " -fill 0xFF 0 " +
                                        Hex(layout.size) + " -o " + out + " -binary",
                                    "objcopy -I ihex -O binary --gap-fill 0xFF " + hex + " " + out};
    for (const std::string& command : commands) {
      SCOPED_TRACE(command);
      ASSERT_TRUE(Runs(command)) << folder_.Content("output");
      EXPECT_EQ(folder_.Content("out.bin"), bytes);
    }
  }
}

TEST_F(HexOracle, StartAddressesAgree) {
  const std::string bin = folder_.Add("in.bin", "start");
  const std::string out = folder_.Path("out.hex");
  ASSERT_TRUE(
      Runs("srec_cat " + bin + " -binary -offset 0x80000 -o " + out + " -intel -execution-start-address 0x89ABCDEF"));
  HexPhoneImageDecoder decoder;
  PhoneImageDPaged image(64, &decoder);
  TextFile file;
  ASSERT_TRUE(file.OpenForReading(out));
  ASSERT_TRUE(decoder.Decode(image, file));
  EXPECT_EQ(image.GetStartAddress(), 0x89ABCDEFu);

  // And out again: an image of less than 16 bytes has the same lines in every program.
  TextMemory encoded;
  ASSERT_TRUE(decoder.Encode(image, encoded));
  EXPECT_EQ(encoded.text(), folder_.Content("out.hex"));
}

}  // namespace
}  // namespace kral::images
