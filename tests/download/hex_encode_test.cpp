// An image out as Intel HEX: the exact text, with the limits and shortcuts of the writer.
#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_binary.h"
#include "download/images/phone_image_dpaged.h"
#include "download/images/phone_image_raw.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::images {
namespace {

struct Flags {
  bool start;
  bool linear_start;
  bool linear;
};

constexpr Flags kSegments{false, false, false};
constexpr Flags kLinear{false, false, true};

std::string Encode(PhoneImage& image, Flags flags) {
  HexPhoneImageDecoder encoder(flags.start, flags.linear_start, flags.linear);
  TextMemory file;
  EXPECT_TRUE(encoder.Encode(image, file));
  return file.text();
}

// An image of the given size whose bytes are all `fill`.
void Fill(PhoneImage& image, uint32_t base, uint32_t size, char fill, uint32_t region = 0) {
  image.SetBaseAddress(base, region);
  const std::string bytes(size, fill);
  image.Write(base, bytes.data(), size, region);
}

const std::string kEndRecord = ":00000001FF\n";

TEST(HexEncoder, WritesTheExactText) {
  PhoneImageDPaged image(64, nullptr);
  image.SetBaseAddress(0x12340, 0);
  image.Write(0x12340, "0123456789abcdefXYZ", 19, 0);
  const std::string data = ":10000000303132333435363738396162636465668E\n:0300100058595AE2\n";
  EXPECT_EQ(Encode(image, kSegments), ":020000021234B6\n" + data + kEndRecord);
  // The linear record holds the upper half of the base only, and the offsets do not make up for it: required.
  EXPECT_EQ(Encode(image, kLinear), ":020000040001F9\n" + data + kEndRecord);
}

TEST(HexEncoder, EmptyAndErasedImages) {
  PhoneImageDPaged image(64, nullptr);
  EXPECT_EQ(Encode(image, kSegments), ":020000020000FC\n" + kEndRecord);
  // Erased chunks are left out but for the last, and the gap before it asks for a new extended record.
  Fill(image, 0x1000, 0x28, '\xFF');
  EXPECT_EQ(Encode(image, kSegments), ":020000020100FB\n:020000020102F9\n:08000000FFFFFFFFFFFFFFFF00\n" + kEndRecord);
}

TEST(HexEncoder, GapsAndOffsetsThatRunOutStartANewExtendedRecord) {
  PhoneImageDPaged gap(64, nullptr);
  Fill(gap, 0x20000, 0x30, '\xFF');
  gap.Write(0x20000, "\x01", 1, 0);
  gap.Write(0x20020, "\x02", 1, 0);
  const std::string erased(30, 'F'), zeros(32, '0');
  EXPECT_EQ(Encode(gap, kSegments), ":020000022000DC\n:1000000001" + erased + "FE\n:020000022002DA\n:1000000002" +
                                        erased + "FD\n" + kEndRecord);
  PhoneImageDPaged long_one(256, nullptr);
  Fill(long_one, 0, 0x10020, '\0');
  EXPECT_NE(Encode(long_one, kLinear).find(":10FFF000" + zeros + "01\n:020000040001F9\n:10000000" + zeros + "F0\n"),
            std::string::npos);
}

TEST(HexEncoder, WritesBothRegions) {
  PhoneImageDPaged image(64, nullptr);
  Fill(image, 0x10000, 1, 'A');
  Fill(image, 0x08000000, 2, 'B', 1);
  EXPECT_EQ(Encode(image, kLinear), ":020000040001F9\n:0100000041BE\n:020000040800F2\n:0200000042427A\n" + kEndRecord);
}

TEST(HexEncoder, StartRecordsFollowTheFlags) {
  PhoneImageDPaged image(64, nullptr);
  image.SetStartAddress(0x12345678);
  const std::string segment = ":0400000312345678E5\n" + kEndRecord;
  const std::string linear = ":0400000512345678E3\n" + kEndRecord;
  const std::pair<Flags, std::string> kCases[] = {
      {{true, true, true}, ":020000040000FA\n" + linear},
      {{true, false, true}, ":020000040000FA\n" + segment},
      {{true, true, false}, ":020000020000FC\n" + segment},
      {{false, true, true}, ":020000040000FA\n" + kEndRecord},
  };
  for (const auto& [flags, text] : kCases) EXPECT_EQ(Encode(image, flags), text);
}

TEST(HexEncoder, TakesImagesWithOneRegion) {
  const test::TempFolder folder;
  PhoneImageBinary image;
  ASSERT_TRUE(image.Open(folder.Add("image.bin", "0123456789abcdefX")));
  EXPECT_EQ(Encode(image, kLinear),
            ":020000040000FA\n:10000000303132333435363738396162636465668E\n:010010005897\n" + kEndRecord);
}

TEST(HexEncoder, ImageAndFileFailuresGiveFalse) {
  HexPhoneImageDecoder encoder;
  PhoneImageDPaged too_large(1, nullptr);
  too_large.SetSize(2048, 0);
  TextMemory memory;
  EXPECT_FALSE(encoder.Encode(too_large, memory));

  PhoneImageDPaged image(1, nullptr);
  TextFile closed;
  EXPECT_FALSE(encoder.Encode(image, closed));
}

}  // namespace
}  // namespace kral::images
