// Image files that somebody cuts short while they are in use: only Windows keeps others from that.
#include "download/images/phone_image_binary.h"
#include "tests/support/download_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::images {
namespace {

constexpr size_t kSize = 100000;
constexpr size_t kLeft = 20000;

TEST(ShrinkingFile, IsAReadFailureBehindItsNewEnd) {
  const test::TempFolder folder;
  const std::string path = folder.Add("image", std::string(kSize, 'x'));
  PhoneImageBinary image;
  ASSERT_TRUE(image.Open(path));
  std::filesystem::resize_file(path, kLeft);
  std::string bytes(kLeft, '?');
  image.Read(0, bytes.data(), kLeft, 0);
  EXPECT_EQ(bytes, std::string(kLeft, 'x'));
  for (const auto& [address, count] : {std::pair{kLeft, 1u}, std::pair{kLeft - 10, 20u}, std::pair{kSize - 1, 1u}}) {
    try {
      image.Read(static_cast<uint32_t>(address), bytes.data(), count, 0);
      ADD_FAILURE() << address;
    } catch (const PhoneImageException& exception) {
      EXPECT_STREQ(exception.what(), "Read Failure");
      EXPECT_EQ(exception.address(), address);
    }
  }
}

class ShrinkingImage : public test::DownloadTest {};

TEST_F(ShrinkingImage, EndsTheWriting) {
  const test::TempFolder folder;
  std::string path = folder.Add("image", std::string(kSize, 'x'));
  StartProgrammer();
  const auto shrink = [](KRAL_HANDLE, uint32_t, uint32_t, uintptr_t value) {
    std::filesystem::resize_file(*reinterpret_cast<const std::string*>(value), kLeft);
  };
  KRAL_ConfigureDownloadCallBack(handle(), shrink, reinterpret_cast<uintptr_t>(&path));
  uint32_t result = 77;
  EXPECT_EQ(KRAL_STREAM_WriteImageFile(handle(), path.c_str(), KRAL_IMAGE_FORMAT_BINARY, 1, nullptr,
                                       KRAL_STREAM_MULTI_IMAGE, block_size_, window_, &result),
            0);
  EXPECT_EQ(result, KRAL_STREAM_FILE_NOT_READ) << ErrorText();
  KRAL_ConfigureDownloadCallBack(handle(), nullptr, 0);
}

}  // namespace
}  // namespace kral::images
