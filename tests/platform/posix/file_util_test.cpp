// Names of pipes, at which the opening of a file would wait for somebody who writes.
#include <gtest/gtest.h>

#include <cstdlib>

#include "kral/kral.h"
#include "platform/file_util.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

TEST(Pipes, AreNoFilesAndNeverWaitedFor) {
  const test::TempFolder folder;
  const std::string pipe = folder.Path("pipe");
  ASSERT_EQ(std::system(("mkfifo '" + pipe + "'").c_str()), 0);
  for (const uint32_t format : {KRAL_IMAGE_FORMAT_BY_CONTENT, KRAL_IMAGE_FORMAT_HEX, KRAL_IMAGE_FORMAT_BINARY}) {
    KRAL_IMAGE_INFO info{};
    uint32_t result = 77;
    EXPECT_EQ(KRAL_IMAGE_GetInfo(pipe.c_str(), format, &info, &result), 0);
    EXPECT_EQ(result, KRAL_STREAM_FILE_NOT_OPENED) << format;
  }
  std::vector<uint8_t> bytes;
  EXPECT_EQ(ReadWholeFile(pipe, 100, bytes), std::errc::invalid_argument);
  EXPECT_FALSE(ReadWholeFile("/proc/self/status", 1 << 16, bytes)) << "a file without a size";
  EXPECT_FALSE(bytes.empty());
}

}  // namespace
}  // namespace kral
