// What a job refuses before anything is sent to anybody.
#include <gtest/gtest.h>

#include <functional>

#include "tests/support/hex_files.h"
#include "tests/support/station_fixture.h"

namespace kral {
namespace {

using test::StationTest;

class JobBadInput : public StationTest {
 protected:
  void SetUp() override {
    handset_ = &AddSocket(11);
    handset_->KeepTrace(true);
    image_ = AddBytes("image.bin", Pattern(5000));
  }

  uint8_t Programmer(const char* file) { return KRAL_VENTRIMS_AddProgrammer(job_, file, KRAL_VENTRIMS_PROGRAMMER_HEX); }

  handset::VirtualHandset* handset_ = nullptr;
  std::string image_;
};

TEST_F(JobBadInput, IsRefusedBeforeAnythingIsSent) {
  const std::string missing = folder_.Path("missing");
  const std::string broken = folder_.Add("broken.hex", test::kBrokenHex);
  const std::string dropped = folder_.Add("dropped.hex", test::kDroppedHex);
  const std::string no_data = folder_.Add("no_data.hex", ":00000001FF\n");
  const std::string second_region = folder_.Add("second.hex", test::kTwoRegionsHex);
  const std::string long_header = AddBytes("header", Pattern(513));
  const std::string programmer = folder_.Add("programmer.hex", kProgrammerHex);
  const std::string empty = folder_.Add("empty", "");
  const std::string backup = AddBackup();
  using Steps = std::function<void()>;
  struct Row {
    const char* what;
    uint32_t code;
    const char* text;
    Steps steps;
    uint16_t second_port = 0;
    uint32_t flags = 0;
  };
  const Steps one_image = [&] { AddImage(image_); };
  const Row rows[] = {
      {"no steps", KRAL_ERROR_ARGUMENT, "no steps", [] {}},
      {"a missing file", KRAL_ERROR_BAD_FILE, "missing", [&] { AddImage(image_), AddImage(missing); }},
      {"a broken HEX file", KRAL_ERROR_BAD_FILE, "line 2", [&] { AddImage(broken); }},
      {"a HEX file that loses data", KRAL_ERROR_BAD_FILE, "line 1", [&] { AddImage(dropped); }},
      {"a HEX file without data", KRAL_ERROR_BAD_FILE, "holds no data", [&] { AddImage(no_data); }},
      {"a second region", KRAL_ERROR_BAD_FILE, "second region", [&] { AddImage(second_region); }},
      {"a long header", KRAL_ERROR_BAD_FILE, "header has 513 bytes: a header takes 512",
       [&] {
         KRAL_VENTRIMS_AddImage(job_, image_.c_str(), KRAL_IMAGE_FORMAT_BINARY, 1, long_header.c_str(),
                                KRAL_STREAM_MULTI_IMAGE);
       }},
      {"a missing programmer", KRAL_ERROR_BAD_FILE, "missing", [&] { Programmer(missing.c_str()); }},
      {"a programmer without content", KRAL_ERROR_BAD_FILE, "empty",
       [&] { KRAL_VENTRIMS_AddProgrammer(job_, empty.c_str(), KRAL_VENTRIMS_PROGRAMMER_BOOT); }},
      {"an empty table", KRAL_ERROR_BAD_FILE, "is empty",
       [&] { KRAL_VENTRIMS_AddPartitionTable(job_, empty.c_str(), 0); }},
      {"a long table", KRAL_ERROR_BAD_FILE, "512", [&] { KRAL_VENTRIMS_AddPartitionTable(job_, image_.c_str(), 0); }},
      {"no PKV file", KRAL_ERROR_BAD_FILE, "image.bin", [&] { KRAL_VENTRIMS_AddRestore(job_, image_.c_str()); }},
      {"the programmer behind an image", KRAL_ERROR_ARGUMENT, "order",
       [&] { AddImage(image_), Programmer(programmer.c_str()); }},
      {"two programmers", KRAL_ERROR_ARGUMENT, "more than one",
       [&] { Programmer(programmer.c_str()), Programmer(programmer.c_str()); }},
      {"diagnostics between images", KRAL_ERROR_ARGUMENT, "between",
       [&] { AddImage(image_), KRAL_VENTRIMS_AddIdentity(job_), AddImage(image_); }},
      {"diagnostics before images", KRAL_ERROR_ARGUMENT, "not entered",
       [&] { KRAL_VENTRIMS_AddIdentity(job_), AddImage(image_); }},
      {"diagnostics behind images", KRAL_ERROR_ARGUMENT, "no restart",
       [&] { AddImage(image_), KRAL_VENTRIMS_AddVerify(job_, backup.c_str()); }},
      {"a loader without a programmer", KRAL_ERROR_ARGUMENT, "no flash programmer", one_image, 0,
       KRAL_VENTRIMS_ENTER_LOADER},
      {"a restart without a download", KRAL_ERROR_ARGUMENT, "restart", [&] { KRAL_VENTRIMS_AddIdentity(job_); }, 0,
       KRAL_VENTRIMS_RESET},
      {"a port that is busy", KRAL_ERROR_PORT_IN_USE, "COM12", one_image, 12},
      {"a port that is not there", KRAL_ERROR_NO_PORT, "COM13", one_image, 13},
  };
  ports_.Add(12);
  ports_.Occupy(12);
  for (const Row& row : rows) {
    SCOPED_TRACE(row.what);
    SetOptions(row.flags);
    AddToJob(11);
    if (row.second_port != 0) {
      ASSERT_EQ(KRAL_VENTRIMS_AddPort(job_, row.second_port, nullptr), 1);
    }
    row.steps();
    EXPECT_EQ(KRAL_VENTRIMS_Start(job_), 0);
    EXPECT_EQ(Error().code, row.code) << Error().text;
    EXPECT_NE(std::string(Error().text).find(row.text), std::string::npos) << Error().text;
    EXPECT_EQ(State().state, KRAL_VENTRIMS_NEW);
    EXPECT_EQ(KRAL_VENTRIMS_Wait(job_, 0), 0);
    EXPECT_EQ(KRAL_VENTRIMS_Free(job_), 1);
    job_ = KRAL_VENTRIMS_Create();
  }
  EXPECT_EQ(handset_->received(), handset::Bytes());
}

TEST_F(JobBadInput, ArgumentsAreRefusedWithAReason) {
  uint32_t number = 77;
  KRAL_VENTRIMS_OPTIONS options{};
  KRAL_VENTRIMS_RESULT result{};
  KRAL_VENTRIMS_STATE state{};
  char name[8] = {};
  AddToJob(11);
  AddImage(image_);
  struct Row {
    const char* what;
    std::function<uint8_t()> call;
  };
  const Row rows[] = {
      {"the same port", [&] { return KRAL_VENTRIMS_AddPort(job_, 11, &number); }},
      {"the same port by handle",
       [&] {
         KRAL_HANDLE handle = 0;
         KRAL_VENTRIMS_GetHandle(job_, 0, &handle);
         return KRAL_VENTRIMS_AddHandle(job_, handle, &number);
       }},
      {"port 0", [&] { return KRAL_VENTRIMS_AddPort(job_, 0, &number); }},
      {"any port", [&] { return KRAL_VENTRIMS_AddPort(job_, 65535, &number); }},
      {"no handle", [&] { return KRAL_VENTRIMS_AddHandle(job_, 0, &number); }},
      {"no image", [&] { return KRAL_VENTRIMS_AddImage(job_, nullptr, 0, 0, nullptr, 0); }},
      {"no format", [&] { return KRAL_VENTRIMS_AddImage(job_, "x", 9, 0, nullptr, 0); }},
      {"no method", [&] { return KRAL_VENTRIMS_AddImage(job_, "x", 0, 0, nullptr, 9); }},
      {"no programmer", [&] { return KRAL_VENTRIMS_AddProgrammer(job_, nullptr, 0); }},
      {"no kind", [&] { return KRAL_VENTRIMS_AddProgrammer(job_, "x", 2); }},
      {"no table", [&] { return KRAL_VENTRIMS_AddPartitionTable(job_, nullptr, 0); }},
      {"no backup", [&] { return KRAL_VENTRIMS_AddRestore(job_, nullptr); }},
      {"nothing to compare with", [&] { return KRAL_VENTRIMS_AddVerify(job_, nullptr); }},
      {"no mode", [&] { return KRAL_VENTRIMS_AddMode(job_, 6); }},
      {"null options", [&] { return KRAL_VENTRIMS_SetOptions(job_, nullptr); }},
      {"options of no size", [&] { return KRAL_VENTRIMS_SetOptions(job_, &options); }},
      {"no room for options", [&] { return KRAL_VENTRIMS_GetOptions(job_, nullptr); }},
      {"a state of no size", [&] { return KRAL_VENTRIMS_GetState(job_, &state); }},
      {"no such handset", [&] { return KRAL_VENTRIMS_GetResult(job_, 1, &result); }},
      {"no verdict yet", [&] { return KRAL_VENTRIMS_GetResult(job_, 0, &result); }},
      {"no such step", [&] { return KRAL_VENTRIMS_GetStepName(job_, 1, name, sizeof name); }},
      {"no room for a name", [&] { return KRAL_VENTRIMS_GetStepName(job_, 0, name, sizeof name); }},
      {"an abort before the start", [&] { return KRAL_VENTRIMS_Abort(job_, KRAL_VENTRIMS_ALL); }},
      {"a wait before the start", [&] { return KRAL_VENTRIMS_Wait(job_, 0); }},
  };
  for (const Row& row : rows) {
    KRAL_VENTRIMS_Start(0);  // leaves no record under the job
    EXPECT_EQ(row.call(), 0) << row.what;
    EXPECT_EQ(Error().code, static_cast<uint32_t>(KRAL_ERROR_ARGUMENT)) << row.what << ": " << Error().text;
    EXPECT_EQ(std::string(Error().function).substr(0, 14), "KRAL_VENTRIMS_") << row.what;
  }
  EXPECT_EQ(number, 77u);
  options.size = sizeof options;
  for (auto spoil :
       {+[](KRAL_VENTRIMS_OPTIONS& o) { o.flags = 4; }, +[](KRAL_VENTRIMS_OPTIONS& o) { o.at_once = 51; },
        +[](KRAL_VENTRIMS_OPTIONS& o) { o.retries = 101; }, +[](KRAL_VENTRIMS_OPTIONS& o) { o.start_ms = 3600001; }}) {
    ASSERT_EQ(KRAL_VENTRIMS_GetOptions(job_, &options), 1);
    spoil(options);
    EXPECT_EQ(KRAL_VENTRIMS_SetOptions(job_, &options), 0);
  }
}

TEST_F(JobBadInput, AnUnknownJobIsNone) {
  const KRAL_VENTRIMS_JOB freed = KRAL_VENTRIMS_Create();
  EXPECT_EQ(KRAL_VENTRIMS_Free(freed), 1);
  uint32_t serial = 0;
  for (const KRAL_VENTRIMS_JOB job : {0u, freed, 77u}) {
    EXPECT_EQ(KRAL_VENTRIMS_Start(job), 0);
    EXPECT_EQ(KRAL_VENTRIMS_Wait(job, 1000), 0);
    EXPECT_EQ(KRAL_VENTRIMS_Abort(job, 0), 0);
    EXPECT_EQ(KRAL_VENTRIMS_AddIdentity(job), 0);
    EXPECT_EQ(KRAL_VENTRIMS_Free(job), 0);
    KRAL_ERROR error{};
    ASSERT_EQ(KRAL_GetLastError(job, &error), 1);
    EXPECT_STREQ(error.function, "KRAL_VENTRIMS_Free");
  }
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(job_, &serial), 0) << "a job is no handset";
}

TEST_F(JobBadInput, AJobIsStartedOnceAndNotChangedAfterwards) {
  AddToJob(11);
  ASSERT_EQ(KRAL_VENTRIMS_AddIdentity(job_), 1);
  AddSocket(12);
  RunToEnd();
  EXPECT_EQ(KRAL_VENTRIMS_Start(job_), 0);
  EXPECT_EQ(Error().code, static_cast<uint32_t>(KRAL_ERROR_ARGUMENT));
  EXPECT_EQ(KRAL_VENTRIMS_AddPort(job_, 12, nullptr), 0);
  EXPECT_EQ(KRAL_VENTRIMS_AddIdentity(job_), 0);
  EXPECT_EQ(KRAL_VENTRIMS_SetCallback(job_, nullptr, 0), 0);
  EXPECT_EQ(KRAL_VENTRIMS_Abort(job_, KRAL_VENTRIMS_ALL), 1) << "what has ended stays as it is";
  EXPECT_EQ(Result(0).passed, 1u);
}

}  // namespace
}  // namespace kral
