// Marks that other programs see, processes and station switches on Linux.
#include <spawn.h>
#include <sys/wait.h>

#include <csignal>
#include <fstream>

#include "platform/environment.h"
#include "platform/named_mutex.h"
#include "platform/process.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

bool SystemShows(const std::string& name) {
  std::ifstream sockets("/proc/net/unix");
  const std::string all{std::istreambuf_iterator<char>(sockets), {}};
  return all.find("@" + name + "\n") != std::string::npos;
}

TEST(NamedMutexMarkTest, TheSystemShowsTheNameWhileTheMutexLives) {
  const std::string name = "kral marker seen by others #7";
  {
    const auto mutex = CreateNamedMutex(name);
    ASSERT_TRUE(mutex);
    EXPECT_TRUE(SystemShows(name));
  }
  EXPECT_FALSE(SystemShows(name));
}

TEST(NamedMutexMarkTest, AReleasedValueDoesNotComeBackWithTheNext) {
  const uint32_t first = CreateNamedMutex("kral marker")->value();
  const uint32_t second = CreateNamedMutex("kral marker")->value();
  EXPECT_NE(first, second);
}

TEST(TerminateProcessTest, EndsTheProcessOfThatNameAndNoOther) {
  const test::TempFolder folder;
  const std::string name = "kral-test-process-of-its-own";
  std::filesystem::copy_file("/bin/sleep", folder.Path(name));
  std::string seconds = "60";
  std::string program = folder.Path(name);
  std::array<char*, 3> arguments = {program.data(), seconds.data(), nullptr};
  pid_t child = 0;
  ASSERT_EQ(::posix_spawn(&child, program.c_str(), nullptr, nullptr, arguments.data(), nullptr), 0);
  TerminateProcessByName("kral-test-process-of-its");
  int status = 0;
  EXPECT_EQ(::waitpid(child, &status, WNOHANG), 0);
  TerminateProcessByName(name.c_str());
  ASSERT_EQ(::waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGKILL);
}

TEST(StationSwitchTest, AnEnvironmentVariableChoosesTheWriterOfBackups) {
  EXPECT_EQ(pkv::ChosenPkvWriter(), pkv::PkvWriter::kStorageClasses);
  SetEnvironmentValue("KRAL_USE_PKV_FILE", "");
  EXPECT_EQ(pkv::ChosenPkvWriter(), pkv::PkvWriter::kVarnPkvFile);
  SetEnvironmentValue("KRAL_USE_PKV_FILE", std::nullopt);
  EXPECT_EQ(pkv::ChosenPkvWriter(), pkv::PkvWriter::kStorageClasses);
}

}  // namespace
}  // namespace kral
