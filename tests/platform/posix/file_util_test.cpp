// What only looks like a file: pipes, at which an opening would wait for somebody on the other side, devices and links.
#include "platform/file_util.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "base/text_log.h"
#include "kral/download.h"
#include "platform/posix/file_descriptor.h"
#include "tests/support/efs_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "transport/collection/capture_reader.h"
#include "transport/collection/capture_series.h"
#include "transport/collection/capture_writer.h"

namespace {

// What becomes of a file on the disk shows in what is synchronised, and when.
std::function<int(const std::string& path)> on_sync;

}  // namespace

// In the place of the system's own, which it calls.
int fsync(int descriptor) {
  if (on_sync) {
    const int error = on_sync(std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(descriptor)));
    errno = error;
    if (error != 0) return -1;
  }
  return static_cast<int>(::syscall(SYS_fsync, descriptor));
}

namespace kral {
namespace {

class Pipes : public test::EfsTest {
 protected:
  void SetUp() override {
    EfsTest::SetUp();
    ASSERT_EQ(::mkfifo(pipe_.c_str(), 0600), 0);
  }

  test::TempFolder folder_;
  const std::string pipe_ = folder_.Path("pipe");
};

TEST_F(Pipes, AreNoFilesAndNeverWaitedFor) {
  for (const uint32_t format : {KRAL_IMAGE_FORMAT_BY_CONTENT, KRAL_IMAGE_FORMAT_HEX, KRAL_IMAGE_FORMAT_BINARY}) {
    KRAL_IMAGE_INFO info{};
    uint32_t result = 77;
    EXPECT_EQ(KRAL_IMAGE_GetInfo(pipe_.c_str(), format, &info, &result), 0);
    EXPECT_EQ(result, KRAL_STREAM_FILE_NOT_OPENED) << format;
  }
  std::vector<uint8_t> bytes;
  EXPECT_EQ(ReadWholeFile(pipe_, 100, bytes), std::errc::invalid_argument);
  EXPECT_FALSE(ReadWholeFile("/proc/self/status", 1 << 16, bytes)) << "a file without a size";
  EXPECT_FALSE(bytes.empty());
  EXPECT_EQ(KRAL_EfsWrite(handle(), pipe_.c_str(), "/file"), 0);
  EXPECT_FALSE(OpenCaptureSource(pipe_));
  EXPECT_FALSE(OpenCaptureFile(pipe_));
}

TEST(CaptureSeriesTest, NameMayHaveABackslash) {
  const test::TempFolder folder;
  EXPECT_TRUE(CaptureSeries(folder.Path("a\\b.cap"), 0)());
  EXPECT_TRUE(std::filesystem::exists(folder.Path("a\\b-00001.cap")));
}

TEST_F(Pipes, TakeTheTextLogOnceSomebodyReadsAndTheReadersEndCostsLinesOnly) {
  const auto before = std::signal(SIGPIPE, SIG_DFL);
  DataLogFileHandler log;
  log.Start(pipe_.c_str());
  log.WriteLine(kLogErr, "lost");
  {
    const FileDescriptor reader(::open(pipe_.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
    EXPECT_FALSE(OpenToWrite(pipe_)) << "not even now";
    log.WriteLine(kLogErr, "text");
    std::array<char, 100> read{};
    ASSERT_GT(::read(reader.get(), read.data(), read.size() - 1), 0);
    EXPECT_STREQ(read.data() + 10, ",LOG_ERR,text\n");
  }
  log.WriteLine(kLogErr, "unread");
  log.Stop();
  sigset_t pending;
  sigpending(&pending);
  EXPECT_EQ(sigismember(&pending, SIGPIPE), 0) << "nothing is left behind";
  std::signal(SIGPIPE, before);
  log.Start("/dev/full");
  log.WriteLine(kLogErr, "a device that takes nothing");
}

TEST_F(Pipes, DevicesAndFoldersAreNotReplacedAndLinksLeadToWhatIs) {
  std::filesystem::create_symlink("missing", folder_.Path("broken"));
  const struct {
    std::string path;
    std::errc error;
  } kRows[] = {{pipe_, std::errc::invalid_argument},
               {"/dev/null", std::errc::invalid_argument},
               {folder_.Path(""), std::errc::is_a_directory},
               {folder_.Path("broken"), std::errc::no_such_file_or_directory}};
  for (const auto& row : kRows) EXPECT_EQ(AtomicFile().Open(row.path), row.error) << row.path;

  std::filesystem::create_directory(folder_.Path("inner"));
  folder_.Add("inner/target", "old");
  std::filesystem::create_symlink("inner/target", folder_.Path("link"));
  const std::vector<uint8_t> text = {'n', 'e', 'w'};
  EXPECT_FALSE(ReplaceWholeFile(folder_.Path("link"), text));
  EXPECT_TRUE(std::filesystem::is_symlink(folder_.Path("link")));
  EXPECT_EQ(folder_.Content("inner/target"), "new");
}

TEST(AtomicFileTest, TheFileIsOnTheDiskBeforeItsNameAndTheFolderBehindIt) {
  const test::TempFolder folder;
  const std::string target = folder.Add("target", "old");
  const std::string parent = std::filesystem::canonical(target).parent_path();
  int error_of_folder = 0;
  std::vector<std::pair<std::string, std::string>> synced;
  on_sync = [&](const std::string& path) {
    const bool is_folder = path == parent;
    synced.emplace_back(is_folder ? "folder" : path == target ? "target" : "file", folder.Content("target"));
    return is_folder ? error_of_folder : 0;
  };
  const std::vector<uint8_t> text = {'n', 'e', 'w'};
  EXPECT_FALSE(ReplaceWholeFile(target, text));
  EXPECT_EQ(synced, (decltype(synced){{"file", "old"}, {"folder", "new"}}));
  for (const int error : {EIO, EINVAL}) {  // the second: of a file system whose folders cannot be synchronised
    error_of_folder = error;
    EXPECT_EQ(ReplaceWholeFile(target, text).value(), error == EINVAL ? 0 : error);
  }
  on_sync = {};
}

TEST(AtomicFileTest, TheFileInTheTargetsPlaceHasItsMode) {
  const test::TempFolder folder;
  const mode_t umask = ::umask(022);
  for (const unsigned mode : {0600u, 0640u, 0666u, 0755u}) {
    const std::string path = folder.Add("target", "old");
    ASSERT_EQ(::chmod(path.c_str(), mode), 0);
    EXPECT_FALSE(ReplaceWholeFile(path, {}));
    EXPECT_EQ(static_cast<unsigned>(std::filesystem::status(path).permissions()), mode);
  }
  EXPECT_FALSE(ReplaceWholeFile(folder.Path("new"), {}));
  EXPECT_EQ(static_cast<unsigned>(std::filesystem::status(folder.Path("new")).permissions()), 0644u);
  ::umask(umask);
}

}  // namespace
}  // namespace kral
