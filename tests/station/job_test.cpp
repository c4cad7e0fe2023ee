// Jobs from beginning to end, on several handsets at once.
#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>

#include "tests/support/station_fixture.h"

namespace kral {
namespace {

using handset::Bytes;
using test::StationTest;

class Job : public StationTest {
 protected:
  static void KRAL_CALL OnChange(KRAL_VENTRIMS_JOB job, uint32_t handset, uintptr_t value) {
    auto& self = *reinterpret_cast<Job*>(value);
    ++self.calls_;
    KRAL_VENTRIMS_PROGRESS progress{};
    progress.size = sizeof progress;
    if (KRAL_VENTRIMS_GetProgress(job, handset, &progress) != 1) ++self.wrong_;
    if (KRAL_VENTRIMS_Wait(job, 1) != 0 || KRAL_VENTRIMS_Free(job) != 0) ++self.wrong_;
  }

  std::atomic<int> calls_{0};
  std::atomic<int> wrong_{0};
};

TEST_F(Job, FlashesRestartsRestoresAndVerifiesEveryHandset) {
  const Bytes software = handset::MakeSoftware("VHS-2.0.1", 30000);
  const std::string backup = AddBackup();
  for (const uint16_t port : {11, 12, 13}) AddSocket(port);
  SetOptions(KRAL_VENTRIMS_ENTER_LOADER | KRAL_VENTRIMS_RESET, 0, 30000, 2);
  ASSERT_EQ(KRAL_VENTRIMS_AddProgrammer(job_, folder_.Add("programmer.hex", kProgrammerHex).c_str(),
                                        KRAL_VENTRIMS_PROGRAMMER_HEX),
            1);
  ASSERT_EQ(AddImage(AddBytes("software.bin", software)), 1);
  ASSERT_EQ(KRAL_VENTRIMS_AddMode(job_, KRAL_MODE_FACTORY_TEST), 1);
  ASSERT_EQ(KRAL_VENTRIMS_AddRestore(job_, backup.c_str()), 1);
  ASSERT_EQ(KRAL_VENTRIMS_AddVerify(job_, backup.c_str()), 1);
  ASSERT_EQ(KRAL_VENTRIMS_SetCallback(job_, &Job::OnChange, reinterpret_cast<uintptr_t>(this)), 1);
  for (const uint16_t port : {11, 12, 13}) {
    AddToJob(port);
    KRAL_ConfigureTimeOut(Progress(port - 11u).handle, KRAL_TIME_OUT_AFTER_FTM, 0);
  }
  std::string names;
  for (uint32_t step = 0; step < State().steps; ++step) {
    char name[64] = {};
    EXPECT_EQ(KRAL_VENTRIMS_GetStepName(job_, step, name, sizeof name), 1);
    names += std::string(name) + '\n';
  }
  EXPECT_EQ(names,
            "identity\nenter loader\nflash programmer (programmer.hex)\nimage 1 (software.bin)\nrestart\nmode 3\n"
            "restore (phone.pkv)\nverify (phone.pkv)\n");
  RunToEnd();

  const KRAL_VENTRIMS_STATE state = State();
  EXPECT_EQ(state.state, KRAL_VENTRIMS_ENDED);
  EXPECT_EQ(state.passed, 3u);
  EXPECT_EQ(state.bytes_done, state.bytes_total);
  EXPECT_EQ(state.bytes_total, 3u * (16 + software.size()));
  for (uint32_t number = 0; number < 3; ++number) {
    const KRAL_VENTRIMS_RESULT result = Result(number);
    EXPECT_EQ(result.passed, 1u) << result.error.text << " in " << result.progress.step_name;
    EXPECT_EQ(result.error.code, static_cast<uint32_t>(KRAL_ERROR_NONE));
    EXPECT_EQ(result.progress.attempts, 1u);
    EXPECT_EQ(result.progress.port, 11 + number);
    EXPECT_STREQ(result.progress.model, "VH-1");
    EXPECT_STREQ(result.progress.revision, "VHS-2.0.1") << "as told after the restart";
    EXPECT_EQ(std::stoul(result.progress.serial, nullptr, 16), 11 + number);
    EXPECT_EQ(result.progress.step_done, 30u);
  }
  EXPECT_GT(calls_, 3 * 8);
  EXPECT_EQ(wrong_, 0);
}

TEST_F(Job, GoesFromTheBootLoaderToFlash) {
  const Bytes image = Pattern(20000);
  for (const uint16_t port : {11, 12}) {
    handset::VirtualHandset& handset = AddSocket(port);
    handset.boot_loader()->Set({.piece_size = 1000});
    handset.SetStartMode(handset.boot_loader());
    handset.Restart();
  }
  const std::string programmer = AddBytes("programmer", handset::MakeProgrammer(2500));
  ASSERT_EQ(KRAL_VENTRIMS_AddProgrammer(job_, programmer.c_str(), KRAL_VENTRIMS_PROGRAMMER_BOOT), 1);
  const std::string file = AddBytes("image.bin", image);
  const std::string header = folder_.Add("header", "head");
  ASSERT_EQ(
      KRAL_VENTRIMS_AddImage(job_, file.c_str(), KRAL_IMAGE_FORMAT_BINARY, 9, header.c_str(), KRAL_STREAM_MULTI_IMAGE),
      1);
  for (const uint16_t port : {11, 12}) AddToJob(port);
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  std::filesystem::resize_file(programmer, 0);
  ASSERT_EQ(KRAL_VENTRIMS_Wait(job_, 120000), 1);
  for (uint32_t number = 0; number < 2; ++number) {
    const KRAL_VENTRIMS_RESULT result = Result(number);
    EXPECT_EQ(result.passed, 1u) << result.error.text << " in " << result.progress.step_name;
    EXPECT_EQ(result.progress.bytes_done, 2500 + image.size());
    EXPECT_STREQ(result.progress.serial, "") << "nobody asks a boot loader";
  }
}

TEST_F(Job, AHandsetThatRefusesTheVersionRequestIsThere) {
  AddSocket(11).faults().Add(handset::Refuse(19), handset::When::Always().Of("00"));
  AddToJob(11);
  KRAL_ConfigureTimeOut(Progress(0).handle, KRAL_TIME_OUT_COMMAND, 300);
  SetOptions(0);
  ASSERT_EQ(KRAL_VENTRIMS_AddIdentity(job_), 1);
  RunToEnd();
  EXPECT_EQ(Result(0).passed, 1u) << Result(0).error.text;
  EXPECT_STREQ(Result(0).progress.serial, "0000000B");
}

TEST_F(Job, TakesAConnectedHandsetAndLeavesItsSettingsAlone) {
  handset::VirtualHandset& handset = AddSocket(11);
  const KRAL_HANDLE handle = KRAL_ConnectServer(11);
  KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_COMMAND, 5000);
  ASSERT_EQ(KRAL_VENTRIMS_AddIdentity(job_), 1);
  ASSERT_EQ(KRAL_VENTRIMS_AddHandle(job_, handle, nullptr), 1);
  KRAL_VENTRIMS_OPTIONS options{};
  options.size = sizeof options;
  ASSERT_EQ(KRAL_VENTRIMS_GetOptions(job_, &options), 1);
  options.command_ms = 3000;
  ASSERT_EQ(KRAL_VENTRIMS_SetOptions(job_, &options), 1);
  RunToEnd();
  EXPECT_EQ(Result(0).passed, 1u) << Result(0).error.text;
  EXPECT_EQ(KRAL_GetTimeOut(handle, KRAL_TIME_OUT_COMMAND), 5000);
  EXPECT_EQ(KRAL_VENTRIMS_Free(std::exchange(job_, 0)), 1);
  EXPECT_TRUE(ports_.IsOpen(11)) << "it is the caller's";
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
  handset.HangUp();
}

TEST_F(Job, ReadsEveryFileOnce) {
  const Bytes image = Pattern(50000);
  const std::string file = AddBytes("image.bin", image);
  const std::string hex = folder_.Add("table.hex", ":020000040004F6\n:0400000001020304F2\n:00000001FF\n");
  for (uint16_t port = 11; port < 15; ++port) {
    handset::VirtualHandset& handset = AddSocket(port);
    handset.EnterMode(handset.programmer_mode());
    AddToJob(port);
  }
  SetOptions(0, 0, 30000, 1);
  ASSERT_EQ(AddImage(file), 1);
  ASSERT_EQ(AddImage(hex), 1);
  ASSERT_EQ(AddImage(file), 1);
  ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
  for (const std::string& name : {file, hex}) std::filesystem::resize_file(name, 0);
  ASSERT_EQ(KRAL_VENTRIMS_Wait(job_, 120000), 1);
  EXPECT_EQ(State().passed, 4u) << Result(0).error.text;
}

}  // namespace
}  // namespace kral
