// The four kinds of image: bounds, regions, and what costs memory.
#include <typeinfo>

#include "download/images/phone_image_binary.h"
#include "download/images/phone_image_dpaged.h"
#include "download/images/phone_image_raw.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::images {
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

// The same six bytes as a file and as a caller's memory, in which a terminating zero counts.
TEST(FlatImages, ShowTheirBytesAndDifferInWhatTheyRefuse) {
  const test::TempFolder folder;
  const std::string bytes("table\0", 6);
  PhoneImageBinary file;
  PhoneImageRawBinary blob;
  PhoneImageRawBuffer buffer;
  ASSERT_TRUE(file.Open(folder.Add("image.bin", bytes)));
  for (PhoneImageRaw* image : std::initializer_list<PhoneImageRaw*>{&blob, &buffer}) {
    EXPECT_FALSE(image->SetData(nullptr, 5));
    EXPECT_EQ(image->GetTotalSize(), 0u);
    ASSERT_TRUE(image->SetData(bytes.data(), 5));
  }
  const struct {
    PhoneImage& image;
    uint32_t resized, last_address;
    const char* beyond;  // what a read behind the end throws
  } kRows[] = {{file, 4, 5, "Read Failure"}, {blob, 6, 0, ""}, {buffer, 6, 0, "Read Failure"}};
  for (const auto& [image, resized, last_address, beyond] : kRows) {
    SCOPED_TRACE(typeid(image).name());
    PhoneImage& shown = image;
    EXPECT_EQ(shown.GetSize(0), 6u);
    shown.SetSize(4, 0);
    shown.SetBaseAddress(0x100, 0);
    EXPECT_EQ(shown.GetSize(0), resized);
    EXPECT_EQ(shown.GetTotalSize(), 6u);
    EXPECT_EQ(shown.GetBaseAddress(0), 0u);
    EXPECT_EQ(shown.GetLastAddress(0), last_address);
    EXPECT_EQ(ReadText(shown, 0, 6), bytes);
    EXPECT_EQ(*shown.GetPointer(5), 0);
    ExpectThrow("Read Failure", 6, 1, Kind::kRead, [&] { shown.GetPointer(6); });
    ExpectThrow(beyond, 0, 7, Kind::kRead, [&] { ReadText(shown, 0, 7); });
    if (&shown != &file) {
      WriteText(shown, 0, "XXXXX");
      shown.Clear();
      EXPECT_EQ(ReadText(shown, 0, 6), bytes) << "writes are let pass and change nothing";
    }
  }
  EXPECT_EQ(ReadText(blob, 0x8000, 3, 1), "tab") << "whatever the address and the region";
  ExpectThrow("Read Failure", 0, 1, Kind::kRead, [&] { ReadText(buffer, 0, 1, 1); });
  file.SetStartAddress(7);
  EXPECT_EQ(file.GetStartAddress(), 7u);
  ExpectThrow("Write Failure", 0, 6, Kind::kWriteOrAllocation, [&] { file.Clear(); });
  ExpectThrow("Write Failure", 5, 1, Kind::kWriteOrAllocation, [&] { WriteText(file, 5, "x"); });
  char byte = 0;
  ExpectThrow("Read Failure", 0xFFFFFFFF, 2, Kind::kRead, [&] { file.Read(0xFFFFFFFF, &byte, 2, 0); });
  const std::function<void()> kCalls[] = {[&] { file.GetBaseAddress(1); },    [&] { file.GetSize(1); },
                                          [&] { file.GetLastAddress(1); },    [&] { file.SetSize(1, 1); },
                                          [&] { file.SetBaseAddress(1, 1); }, [&] { ReadText(file, 0, 1, 1); }};
  for (const auto& call : kCalls) ExpectThrow("Read Failure", 1, 0, Kind::kRead, call);
  EXPECT_EQ(folder.Content("image.bin"), bytes);
}

}  // namespace
}  // namespace kral::images
