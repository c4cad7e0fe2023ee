// The four kinds of image: bounds, regions, and what costs memory.
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "download/phone_image_binary.h"
#include "download/phone_image_dpaged.h"
#include "download/phone_image_raw.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using Kind = PhoneImageException::Kind;

std::string ReadText(PhoneImage& image, uint32_t address, uint32_t count, uint32_t region = 0) {
  std::string text(count, '?');
  image.Read(address, text.data(), count, region);
  return text;
}

void WriteText(PhoneImage& image, uint32_t address, const std::string& text, uint32_t region = 0) {
  image.Write(address, text.data(), static_cast<uint32_t>(text.size()), region);
}

void ExpectThrow(const char* text, uint32_t address, uint32_t count, Kind kind, const std::function<void()>& call) {
  try {
    call();
    ADD_FAILURE() << "nothing thrown instead of \"" << text << '"';
  } catch (const PhoneImageException& exception) {
    EXPECT_STREQ(exception.what(), text);
    EXPECT_EQ(exception.address(), address);
    EXPECT_EQ(exception.count(), count);
    EXPECT_EQ(exception.kind(), kind);
    EXPECT_GT(exception.line(), 1u);
  }
}

TEST(PagedImage, UnwrittenBytesReadAsErasedFlash) {
  PhoneImageDPaged image(500, nullptr);
  EXPECT_EQ(image.GetTotalSize(), 512000u);
  EXPECT_EQ(image.GetSize(0), 0u);
  EXPECT_EQ(ReadText(image, 511990, 10), std::string(10, '\xFF'));
  EXPECT_EQ(image.committed(), 0u);
  WriteText(image, 100, "abc");
  EXPECT_EQ(ReadText(image, 98, 7),
            "\xFF\xFF"
            "abc"
            "\xFF\xFF");
  image.Clear();
  EXPECT_EQ(ReadText(image, 98, 7), std::string(7, '\xFF'));
}

TEST(PagedImage, MemoryFollowsTheWritesInStretchesOfHalfAMebibyte) {
  constexpr uint32_t kMaximum = 256 * 1024;
  PhoneImageDPaged image(kMaximum, nullptr);
  WriteText(image, 0x0C000000, "far");
  EXPECT_EQ(image.committed(), 0x80000u);
  WriteText(image, 0x0C07FFFF, "edge");
  EXPECT_EQ(image.committed(), 0x100000u);
  EXPECT_EQ(ReadText(image, 0x0C07FFFD, 8),
            "\xFF\xFF"
            "edge"
            "\xFF\xFF");
  EXPECT_EQ(*image.GetPointer(0x123456), 0xFF);
  EXPECT_EQ(image.committed(), 0x180000u);
  WriteText(image, kMaximum * 1024 - 1, "!");
  EXPECT_EQ(ReadText(image, kMaximum * 1024 - 2, 2), "\xFF!");
}

TEST(PagedImage, TheFirstWriteSetsTheSizeWhateverItsDistance) {
  PhoneImageDPaged image(4, nullptr);
  image.SetBaseAddress(0x1000, 0);
  WriteText(image, 0x1100, "0123456789");
  EXPECT_EQ(image.GetSize(0), 10u);
  EXPECT_EQ(image.GetLastAddress(0), 0x1009u);
  WriteText(image, 0x1000, "abc");
  EXPECT_EQ(image.GetSize(0), 10u);
  WriteText(image, 0x1100, "0123456789");
  EXPECT_EQ(image.GetSize(0), 0x10Au);
}

TEST(PagedImage, TheSecondRegionLiesDirectlyBehindTheFirst) {
  PhoneImageDPaged image(4, nullptr);
  image.SetBaseAddress(0x20000, 0);
  image.SetBaseAddress(0x08000000, 1);
  WriteText(image, 0x20000, "first");
  WriteText(image, 0x08000000, "second", 1);
  EXPECT_EQ(ReadText(image, 0x20000, 11), "firstsecond");
  EXPECT_EQ(ReadText(image, 0x08000003, 3, 1), "ond");
  EXPECT_EQ(image.GetLastAddress(1), 0x08000005u);
  ExpectThrow("Write Failure", 4093, 4, Kind::kWriteOrAllocation, [&] { WriteText(image, 0x08000FF8, "1234", 1); });
  ExpectThrow("Read Failure", 2, 0, Kind::kRead, [&] { image.GetSize(2); });
}

TEST(PagedImage, NothingOutsideTheReservationIsTouched) {
  PhoneImageDPaged image(1, nullptr);
  image.SetBaseAddress(0x1000, 0);
  uint8_t bytes[16] = {};
  ExpectThrow("Read Failure", 1009, 16, Kind::kRead, [&] { image.Read(0x1000 + 1009, bytes, 16, 0); });
  ExpectThrow("Write Failure", 1009, 16, Kind::kWriteOrAllocation, [&] { image.Write(0x1000 + 1009, bytes, 16, 0); });
  ExpectThrow("Write Failure", 0xFFFFFFFF, 1, Kind::kWriteOrAllocation, [&] { image.Write(0xFFF, bytes, 1, 0); });
  ExpectThrow("Read Failure", 1, 0xFFFFFFFF, Kind::kRead, [&] { image.Read(0x1001, bytes, 0xFFFFFFFF, 0); });
  ExpectThrow("Paged Allocation", 1024, 1, Kind::kWriteOrAllocation, [&] { image.GetPointer(1024); });
  EXPECT_EQ(image.GetSize(0), 0u);
  image.Read(0x1000 + 1024, bytes, 0, 0);
}

TEST(PagedMemory, ASecondReservationMayNotBeLarger) {
  CDemandPagedMemory memory;
  memory.Reserve(8192);
  memory.Reserve(4096);
  memory.Reserve(8192);
  EXPECT_EQ(memory.reserved(), 8192u);
  ExpectThrow("Paged Allocation", 0, 8193, Kind::kWriteOrAllocation, [&] { memory.Reserve(8193); });
  ExpectThrow("Paged Allocation", 0, 0xFFFFFFFF, Kind::kWriteOrAllocation, [] { PhoneImageDPaged(0x400000, nullptr); });
}

TEST(BinaryImage, ShowsTheFileWithinItsBounds) {
  const test::TempFolder folder;
  PhoneImageBinary image;
  ASSERT_TRUE(image.Open(folder.Add("image.bin", "0123456789")));
  EXPECT_EQ(image.GetTotalSize(), 10u);
  EXPECT_EQ(image.GetSize(0), 10u);
  EXPECT_EQ(image.GetLastAddress(0), 9u);
  EXPECT_EQ(image.GetStartAddress(), 0u);
  EXPECT_EQ(ReadText(image, 3, 7), "3456789");
  EXPECT_EQ(*image.GetPointer(9), '9');
  ExpectThrow("Read Failure", 10, 1, Kind::kRead, [&] { image.GetPointer(10); });
  ExpectThrow("Read Failure", 3, 8, Kind::kRead, [&] { ReadText(image, 3, 8); });
  char byte = 0;
  ExpectThrow("Read Failure", 0xFFFFFFFF, 2, Kind::kRead, [&] { image.Read(0xFFFFFFFF, &byte, 2, 0); });

  image.SetBaseAddress(0x1000, 0);
  image.SetSize(4, 0);
  image.SetStartAddress(7);
  EXPECT_EQ(image.GetBaseAddress(0), 0u);
  EXPECT_EQ(image.GetSize(0), 4u);
  EXPECT_EQ(image.GetLastAddress(0), 9u);
  EXPECT_EQ(image.GetStartAddress(), 7u);
  EXPECT_EQ(ReadText(image, 0, 10), "0123456789");
}

TEST(BinaryImage, RefusesWritesAndOtherRegions) {
  const test::TempFolder folder;
  PhoneImageBinary image;
  ASSERT_TRUE(image.Open(folder.Add("image.bin", "0123456789")));
  ExpectThrow("Write Failure", 0, 10, Kind::kWriteOrAllocation, [&] { image.Clear(); });
  ExpectThrow("Write Failure", 5, 1, Kind::kWriteOrAllocation, [&] { WriteText(image, 5, "x"); });
  const std::function<void()> kCalls[] = {[&] { image.GetBaseAddress(1); }, [&] { image.GetSize(1); },
                                          [&] { image.GetLastAddress(1); }, [&] { image.SetSize(1, 1); },
                                          [&] { image.SetBaseAddress(1, 1); }};
  for (const auto& call : kCalls) ExpectThrow("Read Failure", 1, 0, Kind::kRead, call);
  ExpectThrow("Read Failure", 1, 0, Kind::kRead, [&] { ReadText(image, 0, 1, 1); });
  EXPECT_EQ(folder.Content("image.bin"), "0123456789");
}

TEST(BinaryImage, MissingAndEmptyFilesAreRefused) {
  const test::TempFolder folder;
  PhoneImageBinary image;
  EXPECT_FALSE(image.Open(folder.Path("missing.bin")));
  EXPECT_NE(image.last_error(), 0u);
  EXPECT_FALSE(image.Open(folder.Add("empty.bin", "")));
  EXPECT_FALSE(image.Open(folder.Path("")));
  EXPECT_EQ(image.GetTotalSize(), 0u);
  ExpectThrow("Read Failure", 0, 1, Kind::kRead, [&] { ReadText(image, 0, 1); });
}

TEST(MappedFile, AWritableViewChangesTheFile) {
  const test::TempFolder folder;
  const std::string path = folder.Add("file", "before");
  CMapFileToMemory file;
  EXPECT_EQ(file.Size(), 0u);
  uint8_t* view = file.Open(path, true);
  ASSERT_NE(view, nullptr);
  EXPECT_EQ(file.Size(), 6u);
  view[0] = 'B';
  file.Close();
  EXPECT_EQ(file.Size(), 0u);
  EXPECT_EQ(folder.Content("file"), "Before");
  EXPECT_EQ(file.Open(folder.Path("missing"), true), nullptr);
  EXPECT_NE(file.last_error(), 0u);
}

TEST(RawImages, CountTheTerminatingZeroAndDifferInReadOnly) {
  PhoneImageRawBinary blob;
  PhoneImageRawBuffer buffer;
  std::string data = "table";
  for (PhoneImageRaw* image : std::initializer_list<PhoneImageRaw*>{&blob, &buffer}) {
    EXPECT_FALSE(image->SetData(nullptr, 5));
    EXPECT_EQ(image->GetTotalSize(), 0u);
    ASSERT_TRUE(image->SetData(data.data(), 5));
    image->SetSize(2, 0);
    image->SetBaseAddress(0x100, 0);
    WriteText(*image, 0, "XXXXX");
    image->Clear();
    EXPECT_EQ(image->GetSize(0), 6u);
    EXPECT_EQ(image->GetTotalSize(), 6u);
    EXPECT_EQ(image->GetLastAddress(0), 0u);
    EXPECT_EQ(image->GetBaseAddress(0), 0u);
    EXPECT_EQ(ReadText(*image, 0, 6), std::string("table\0", 6));
    EXPECT_EQ(*image->GetPointer(5), 0);
    ExpectThrow("Read Failure", 6, 1, Kind::kRead, [&] { image->GetPointer(6); });
  }
  EXPECT_EQ(ReadText(blob, 0x8000, 3, 1), "tab");
  ExpectThrow("", 0, 7, Kind::kRead, [&] { ReadText(blob, 0, 7); });
  EXPECT_EQ(ReadText(buffer, 2, 3), "ble");
  ExpectThrow("Read Failure", 4, 3, Kind::kRead, [&] { ReadText(buffer, 4, 3); });
  ExpectThrow("Read Failure", 0, 1, Kind::kRead, [&] { ReadText(buffer, 0, 1, 1); });
}

}  // namespace
}  // namespace kral
