// Intel HEX into an image: every oddity of the reader, and every way a file can be broken.
#include <cstdio>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_dpaged.h"
#include "tests/support/hex_files.h"
#include "tests/support/test.h"

namespace kral::images {
namespace {

constexpr uint32_t kNoAddress = 0xFFFFFFFF;

std::string Record(const std::string& digits) {
  return test::HexRecord(digits);
}

const std::string kEnd = ":00000001FF\n";
const std::string kBase1 = Record("020000040001");        // 0x10000
const std::string kHello = Record("0500200068656C6C6F");  // "hello" at 0x20
const std::string kWorld = Record("05003000776F726C64");  // "world" at 0x30
const std::string kSecond = Record("020000040800");       // 0x08000000

struct Decoded {
  explicit Decoded(const std::string& text, uint32_t maximum_kib = 500) : image(maximum_kib, &decoder) {
    TextMemory file(text);
    result = decoder.Decode(image, file);
  }

  std::string At(uint32_t address, uint32_t count, uint32_t region = 0) {
    std::string text(count, '?');
    image.Read(address, text.data(), count, region);
    return text;
  }

  HexPhoneImageDecoder decoder{true, true, true};
  PhoneImageDPaged image;
  bool result = false;
};

TEST(HexDecoder, LoadsDataBehindAnExtendedAddress) {
  const struct {
    const char* name;
    std::string text;
    uint32_t base;
  } kCases[] = {
      {"linear", kBase1 + kHello + kEnd, 0x10000},
      {"segment", Record("020000021234") + kHello + kEnd, 0x12340},
      {"last line without an end", kBase1 + kHello + ":00000001FF", 0x10000},
      {"carriage returns", ":020000040001F9\r\n:0500200068656C6C6FC7\r\n:00000001FF\r\n", 0x10000},
      {"lower case", ":020000040001f9\n:0500200068656c6c6fc7\n:00000001ff\n", 0x10000},
      {"any first character", "?020000040001F9\n;0500200068656C6C6FC7\nx00000001FF\n", 0x10000},
      {"end of file unchecked", kBase1 + kHello + ":00000001\n", 0x10000},
      {"spaces behind the checksum", kBase1 + kHello.substr(0, kHello.size() - 1) + "   \n" + kEnd, 0x10000},
  };
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.name);
    Decoded decoded(c.text);
    EXPECT_TRUE(decoded.result);
    EXPECT_EQ(decoded.image.GetBaseAddress(0), c.base);
    EXPECT_EQ(decoded.At(c.base + 0x1F, 7), "\xFFhello\xFF");
  }
}

TEST(HexDecoder, DigitsBeyondFRunOverIntoTheNextPlace) {
  // "0G" is 16, as is "10".
  std::string line = Record("1000000068656C6C6F20776F726C642121212121");
  Decoded decoded(kBase1 + line.replace(1, 2, "0G") + kEnd);
  EXPECT_TRUE(decoded.result);
  EXPECT_EQ(decoded.At(0x10000, 16), "hello world!!!!!");
}

TEST(HexDecoder, TheFileMustEndWithAnEndOfFileRecord) {
  const struct {
    const char* name;
    std::string text;
    bool accepted;
    bool has_data;
  } kCases[] = {
      {"no end", kBase1 + kHello, false, true},
      {"data behind the end", kBase1 + kEnd + kHello, false, true},
      {"two ends", kBase1 + kEnd + kHello + kEnd, true, true},
      {"start address behind the end", kBase1 + kHello + kEnd + Record("0400000500010020"), false, true},
      {"end only", kEnd, true, false},
      {"empty", "", false, false},
      {"blank line at the end", kBase1 + kHello + kEnd + "\n", false, true},
  };
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.name);
    Decoded decoded(c.text);
    EXPECT_EQ(decoded.result, c.accepted);
    EXPECT_EQ(decoded.image.GetSize(0), c.has_data ? 5u : 0u);
    EXPECT_EQ(decoded.At(0x10020, 5), c.has_data ? "hello" : std::string(5, '\xFF'));
  }
}

TEST(HexDecoder, DataBeforeTheFirstExtendedAddressIsDropped) {
  Decoded only(kHello + Record("0400000312345678") + kEnd);
  EXPECT_TRUE(only.result);
  EXPECT_EQ(only.image.GetSize(0), 0u);
  EXPECT_EQ(only.image.GetBaseAddress(0), kNoAddress);
  EXPECT_EQ(only.image.GetStartAddress(), 0x12345678u);

  // Not even its checksum matters.
  Decoded mixed(":05002000badbadbad\n" + kBase1 + kWorld + kEnd);
  EXPECT_TRUE(mixed.result);
  EXPECT_EQ(mixed.At(0x10020, 5), std::string(5, '\xFF'));
  EXPECT_EQ(mixed.At(0x10030, 5), "world");
}

TEST(HexDecoder, TheBaseIsTheLowestExtendedAddressWithDataRightBehindIt) {
  const std::string base2 = Record("020000040002");
  const std::string start = Record("0400000500010020");
  // The lower base counts only when a data record follows it at once; without that, its data lies below the image.
  Decoded lower_second(base2 + kHello + kBase1 + kWorld + kEnd);
  EXPECT_TRUE(lower_second.result);
  EXPECT_EQ(lower_second.image.GetBaseAddress(0), 0x10000u);
  EXPECT_EQ(lower_second.At(0x20020, 5), "hello");
  EXPECT_EQ(lower_second.At(0x10030, 5), "world");

  Decoded interrupted(base2 + kHello + kBase1 + start + kWorld + kEnd);
  EXPECT_FALSE(interrupted.result);
  EXPECT_EQ(interrupted.image.GetBaseAddress(0), 0x20000u);
  EXPECT_EQ(interrupted.At(0x20020, 5), "hello");
}

TEST(HexDecoder, TheSizeCountsFromTheSecondWriteOn) {
  Decoded one(kBase1 + kHello + kEnd);
  EXPECT_EQ(one.image.GetSize(0), 5u);
  Decoded two(kBase1 + kHello + kWorld + kEnd);
  EXPECT_EQ(two.image.GetSize(0), 0x35u);
}

TEST(HexDecoder, DataAtTheSecondBaseGoesBehindTheFirstRegion) {
  const std::string base9 = Record("020000040900");
  Decoded decoded(kBase1 + Record("0500000068656C6C6F") + kSecond + Record("05000000776F726C64") + base9 + kEnd);
  EXPECT_TRUE(decoded.result);
  EXPECT_EQ(decoded.image.GetSize(0), 5u);
  EXPECT_EQ(decoded.image.GetSize(1), 5u);
  EXPECT_EQ(decoded.image.GetBaseAddress(1), 0x08000000u);
  EXPECT_EQ(decoded.At(0x08000000, 5, 1), "world");
  EXPECT_EQ(decoded.At(0x10000, 10), "helloworld");

  // Nothing came before it: it is the first region.
  Decoded alone(kSecond + kHello + kEnd);
  EXPECT_TRUE(alone.result);
  EXPECT_EQ(alone.image.GetBaseAddress(0), 0x08000000u);
  EXPECT_EQ(alone.image.GetSize(0), 5u);
  EXPECT_EQ(alone.image.GetSize(1), 0u);

  // There is no way back to the first region: 0x10100 - 0x08000000 lies outside.
  Decoded back(kBase1 + kHello + kSecond + kWorld + kBase1 + kWorld + kEnd);
  EXPECT_FALSE(back.result);
  EXPECT_EQ(back.At(0x10030, 5), std::string(5, '\xFF'));
}

TEST(HexDecoder, StartAddressRecordsSetTheFlags) {
  const struct {
    const char* name;
    std::string text;
    uint32_t start;
    bool present;
    bool linear_start;
    bool linear;
  } kCases[] = {
      {"none", Record("020000021000") + kHello + kEnd, kNoAddress, false, true, false},
      {"type 3", Record("020000021000") + Record("0400000312345678") + kEnd, 0x12345678, true, false, false},
      {"type 5", Record("020000021000") + Record("04000005FEDCBA98") + kEnd, 0xFEDCBA98, true, true, true},
      {"type 5, then 3", Record("0400000500000001") + Record("0400000300000002") + kEnd, 2, true, false, true},
      {"type 4", kBase1 + kHello + kEnd, kNoAddress, false, true, true},
  };
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.name);
    Decoded decoded(c.text);
    EXPECT_TRUE(decoded.result);
    EXPECT_EQ(decoded.image.GetStartAddress(), c.start);
    EXPECT_EQ(decoded.decoder.start_address_present(), c.present);
    EXPECT_EQ(decoded.decoder.start_is_linear(), c.linear_start);
    EXPECT_EQ(decoded.decoder.linear_addressing(), c.linear);
  }
}

TEST(HexDecoder, BrokenLinesFailAndKeepWhatCameBefore) {
  const std::string data123 = Record("7B000000" + std::string(2 * 123, '0'));
  const std::string data124 = Record("7C000000" + std::string(2 * 124, '0'));
  ASSERT_TRUE(Decoded(kBase1 + kHello + data123 + kEnd).result);
  const struct {
    const char* name;
    std::string line;
  } kCases[] = {
      {"data checksum", ":0500300068656C6C6FB8\n"},
      {"data one digit short", ":0500300068656C6C6FB\n"},
      {"length beyond the line", ":FF00300068656C6C6FB7\n"},
      {"length of digits beyond F", ":ZZ00300068656C6C6FB7\n"},
      {"124 bytes: longer than a line may be", data124},
      {"cut in the type", ":0500300\n"},
      {"first type character", ":05003010776F726C64BA\n"},
      {"unknown type", Record("00000006")},
      {"type A", ":0000000AF6\n"},
      {"segment checksum", ":020000021000ED\n"},
      {"segment cut", ":02000002\n"},
      {"linear checksum", ":020000040001FA\n"},
      {"linear cut", ":020000040001F\n"},
      {"start segment checksum", ":04000003123456784E\n"},
      {"start linear cut", ":0400000512345678\n"},
      {"other text", "S00600004844521B\n"},
      {"blank line", "\n"},
      {"endless line", std::string(300000, '0') + "\n"},
  };
  for (const auto& c : kCases) {
    SCOPED_TRACE(c.name);
    Decoded decoded(kBase1 + kHello + c.line + kWorld + kEnd);
    EXPECT_FALSE(decoded.result);
    EXPECT_EQ(decoded.At(0x10020, 5), "hello");
    EXPECT_EQ(decoded.At(0x10030, 5), std::string(5, '\xFF'));
    EXPECT_EQ(decoded.image.GetStartAddress(), kNoAddress);
  }
}

TEST(HexDecoder, DataBeyondTheReservationFails) {
  EXPECT_TRUE(Decoded(kBase1 + Record("0103FF0055") + kEnd, 1).result);
  EXPECT_FALSE(Decoded(kBase1 + Record("0203FF005555") + kEnd, 1).result);
  // The last bytes of the address space.
  Decoded top(Record("02000004FFFF") + Record("02FFFE005555") + kEnd, 64);
  EXPECT_TRUE(top.result);
  EXPECT_EQ(top.At(0xFFFFFFFE, 2), "UU");
}

TEST(HexDecoder, LinesAcrossReadsAreKeptWhole) {
  // 10,000 records of 16 bytes: some of them straddle every buffer the reader may use.
  std::string text = kBase1;
  for (unsigned i = 0; i < 10000; ++i) {
    const unsigned address = i * 16;
    char digits[48];
    if (address % 0x10000 == 0 && i != 0) {
      std::snprintf(digits, sizeof digits, "02000004%04X", 1 + address / 0x10000);
      text += Record(digits);
    }
    std::snprintf(digits, sizeof digits, "10%04X00%08X%024X", address % 0x10000, i, 0);
    text += Record(digits);
  }
  Decoded decoded(text + kEnd);
  ASSERT_TRUE(decoded.result);
  EXPECT_EQ(decoded.image.GetSize(0), 160000u);
  for (unsigned i = 0; i < 10000; ++i) {
    const std::string expected = {'\0', '\0', static_cast<char>(i >> 8), static_cast<char>(i)};
    ASSERT_EQ(decoded.At(0x10000 + i * 16, 4), expected) << i;
  }
}

}  // namespace
}  // namespace kral::images
