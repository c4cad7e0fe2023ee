// A text log that is written into a pipe.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <string>

#include "base/text_log.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

TEST(TextLogPipe, ReaderThatLeavesEndsTheLinesAndNotTheProcess) {
  const test::TempFolder folder;
  const std::string path = folder.Path("pipe");
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  const int reader = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  ASSERT_GE(reader, 0);
  const auto before = std::signal(SIGPIPE, SIG_DFL);
  DataLogFileHandler log;
  log.Start(path.c_str());
  log.WriteLine(kLogFn, "read");
  char line[64] = {};
  EXPECT_GT(read(reader, line, sizeof(line) - 1), 0);
  EXPECT_NE(std::string(line).find("LOG_FN,read\n"), std::string::npos) << line;
  close(reader);
  log.WriteLine(kLogFn, "unread");
  log.Stop();
  sigset_t pending;
  sigpending(&pending);
  EXPECT_EQ(sigismember(&pending, SIGPIPE), 0) << "nothing is left behind";
  std::signal(SIGPIPE, before);
}

}  // namespace
}  // namespace kral
