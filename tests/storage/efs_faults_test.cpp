// Every fault of the line at every packet of a transfer and of a listing: exact bytes, or a clean failure. And what
// becomes of late answers: they are nobody else's, and the handles that they tell of are closed.
#include "kral/nv.h"
#include "storage/efs/efs_settings.h"
#include "tests/support/efs_fixture.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/handset_ports.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

// Passes: the host never notices. Again: one try is spoilt; requests that are sent once fail. Gone: nothing works.
enum class Harm { kPasses, kAgain, kGone };

struct FaultRow {
  const char* name;
  Fault fault;
  Harm harm;
  bool hides_handle = false;  // the answer to an opening request is spoilt for good, though it was carried out
};

const FaultRow kFaultRows[] = {
    {"split", handset::Split(3), Harm::kPasses},
    {"duplicate", handset::Duplicate(), Harm::kPasses},
    {"leading noise", handset::LeadingNoise(40), Harm::kPasses},
    {"merge", handset::Merge(), Harm::kAgain},
    {"delay", handset::Delay(120), Harm::kAgain},
    {"after the next request", handset::AfterNextRequest(), Harm::kAgain},
    {"lose", handset::Lose(), Harm::kAgain, true},
    {"corrupt", handset::Corrupt(), Harm::kAgain, true},
    {"wrong code", handset::WrongCode(0x55), Harm::kAgain, true},
    {"refuse", handset::Refuse(19), Harm::kAgain},
    {"ignore", handset::Ignore(), Harm::kAgain},
    {"hang up", handset::HangUp(), Harm::kGone},
};

constexpr uint32_t kTimeOutMs = 80;  // the delayed answer comes behind it

class EfsFaults : public test::EfsTest {
 protected:
  // Carries an operation out with one fault at each of its packets, on a line and a handset that know nothing of the
  // fault before. `commands` are the operation's own, in order; `outcome` is empty when it is as `passed` says.
  void Strike(const std::vector<uint8_t>& commands, const std::function<uint8_t()>& run,
              const std::function<std::string(bool passed)>& outcome) {
    for (const FaultRow& row : kFaultRows) {
      for (size_t packet = 1; packet <= commands.size(); ++packet) {
        SCOPED_TRACE(testing::Message() << row.name << " at packet " << packet);
        handset().Restart();  // nothing is open, or under way, of the run before
        Connect();
        KRAL_SetReceiveMode(handle(), 1);
        ShortenTimeOuts(kTimeOutMs);
        ++run_;
        handset().faults().Add(row.fault, handset::When::Nth(packet).Of("4B 13"));
        const uint64_t struck = handset().faults().struck();
        const bool passed = run() == 1;
        EXPECT_EQ(handset().faults().struck(), struck + 1);
        handset().faults().Clear();

        const uint8_t command = commands[packet - 1];
        EXPECT_EQ(passed, Survives(row.harm, command, commands)) << LogText();
        if (row.harm == Harm::kGone && !passed) continue;  // what the handset keeps cannot be tidied up
        EXPECT_EQ(outcome(passed), "");
        if (row.harm == Harm::kGone) continue;
        const bool opens = command == 2 || command == 11;
        const size_t left = handset().efs().open_descriptors() + handset().efs().open_directories();
        EXPECT_EQ(left, row.hides_handle && opens ? 1u : 0u) << LogText();
      }
    }
    handset().Restart();
    EXPECT_EQ(run_, std::size(kFaultRows) * commands.size());
  }

  static bool Survives(Harm harm, uint8_t command, const std::vector<uint8_t>& commands) {
    const bool writing = commands.front() == 19;
    const bool sent_once = commands.size() == 1;
    const bool closing = command == 3 || command == 13;
    // What has been read is there, closed or not; what was written may not be.
    if (harm == Harm::kGone) return closing && !writing;
    return harm == Harm::kPasses || !sent_once;
  }

  // The handset's file of the present run; each has its own.
  std::string Path() const { return "/f" + std::to_string(run_); }

  test::TempFolder folder_;
  const Bytes data_ = RandomBytes(700);
  size_t run_ = 0;
};

TEST_F(EfsFaults, StrikeAPut) {
  Strike(
      {19, 15, 2, 5, 5, 3},
      [&] { return KRAL_EfsWriteMem(handle(), data_.data(), static_cast<uint32_t>(data_.size()), Path().c_str()); },
      [&](bool passed) -> std::string {
        const auto file = handset().efs().File(Path());
        if (passed) return file == data_ ? "" : "other bytes";
        return file ? "a partial file" : "";
      });
}

TEST_F(EfsFaults, StrikeAGet) {
  handset().efs().AddFile("/source", data_);
  const std::string target = folder_.Add("target", "");
  Strike(
      {15, 2, 4, 4, 3},
      [&] {
        folder_.Add("target", "before");
        return KRAL_EfsRead(handle(), target.c_str(), "/source");
      },
      [&](bool passed) -> std::string {
        const auto& files = std::filesystem::directory_iterator(std::filesystem::path(target).parent_path());
        if (std::distance(begin(files), end(files)) != 1) return "a temporary file";
        return folder_.Content("target") == (passed ? Text(data_) : "before") ? "" : "other bytes";
      });
}

TEST_F(EfsFaults, StrikeAPutOverAnItem) {
  const Bytes item = RandomBytes(20, 2);
  Strike(
      {19, 15, 8, 2, 5, 3},
      [&] {
        handset().efs().AddItemFile(Path(), item);
        return KRAL_EfsWriteMem(handle(), data_.data(), 500, Path().c_str());
      },
      [&](bool passed) -> std::string {
        const auto file = handset().efs().File(Path());
        if (passed) return file == Bytes(data_.begin(), data_.begin() + 500) ? "" : "other bytes";
        return !file || file == item ? "" : "a partial file";
      });
}

TEST_F(EfsFaults, StrikeItems) {
  const Bytes item = RandomBytes(100, 2);
  handset().efs().AddItemFile("/item", item);
  const std::string target = folder_.Add("target", "");
  const auto fetched = [&](bool passed) {
    return folder_.Content("target") == (passed ? Text(item) : "before") ? "" : "other bytes";
  };
  Strike(
      {15, 39},
      [&] {
        folder_.Add("target", "before");
        return KRAL_EfsRead(handle(), target.c_str(), "/item");
      },
      fetched);
  run_ = 0;
  Strike(
      {38}, [&] { return KRAL_EfsPutItemFromMem(handle(), Path().c_str(), item.data(), 100); },
      [&](bool passed) {
        const auto file = handset().efs().File(Path());
        return file == item || (!passed && !file) ? "" : "other bytes";
      });
}

TEST_F(EfsFaults, StrikeAListing) {
  handset().efs().AddFile("/d/one", Bytes{1});
  handset().efs().AddDirectory("/d/two");
  std::string listed;
  Strike(
      {11, 12, 12, 12, 13},
      [&] {
        KRAL_EFS_ENTRY entries[3] = {};
        uint32_t count = 3;
        const uint8_t result = KRAL_EfsDirectory(handle(), "/d", KRAL_EFS_FILTER_ALL, entries, &count);
        listed = std::to_string(count) + entries[0].name + entries[1].name;
        return result;
      },
      [&](bool passed) -> std::string {
        if (passed) return listed == "2/d/one/d/two" ? "" : listed;
        return listed.starts_with('3') ? "" : "a count in spite of the failure";
      });
}

// --- Late answers ---------------------------------------------------------------------------------------------------

TEST_F(EfsFaults, LateAnswerIsPassedOverByWhatFollows) {
  ShortenTimeOuts(kTimeOutMs);
  handset().efs().AddFile("/f", Bytes{1});
  handset().faults().Add(handset::AfterNextRequest(), handset::When::Nth(1).Of("4B 13 08"));
  uint32_t error = 77;
  EXPECT_EQ(KRAL_EfsDelete(handle(), "/missing", &error), 0);
  EXPECT_EQ(KRAL_EFS2_DIAG_CHMOD(handle(), "/f", 0400, &error), 1) << "its answer comes behind that of the removal";
  EXPECT_EQ(error, 0u);

  KRAL_SetEfsReadAndWritePacketSize(handle(), 120, 112);
  handset().faults().Add(handset::AfterNextRequest(), handset::When::Nth(2).Of("4B 13 05"));
  handset().ClearTrace();
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data_.data(), 700, "/put"), 1);
  EXPECT_EQ(handset().efs().File("/put"), data_);
  EXPECT_EQ(handset().requests().size(), 3u + 7u + 1u + 1u) << "one packet goes out twice, not every one behind it";
}

TEST_F(EfsFaults, HandlesThatLateAnswersTellOfAreClosed) {
  handset().efs().AddFile("/f", data_);
  ShortenTimeOuts(kTimeOutMs);
  // Later than the moment for which late answers are waited for, and in the middle of the transfer.
  handset().faults().Add(handset::Delay(300), handset::When::Nth(1).Of("4B 13 02"));
  handset().faults().Add(handset::Delay(15), handset::When::Always().Of("4B 13 04"));
  KRAL_SetEfsReadAndWritePacketSize(handle(), 40, 524);
  Bytes back(700);
  auto size = static_cast<uint32_t>(back.size());
  EXPECT_EQ(KRAL_EfsReadMem(handle(), "/f", back.data(), &size), 1) << LogText();
  EXPECT_EQ(back, data_);
  EXPECT_EQ(handset().efs().open_descriptors(), 0u) << LogText();

  // All tries given up, and their answers in front of requests of another family.
  handset().faults().Add(handset::Delay(600), handset::When::Always().Of("4B 13 02"));
  EXPECT_EQ(KRAL_EfsReadMem(handle(), "/f", back.data(), &size), 0);
  handset().faults().Clear();
  const efs::OpenHandles& files = Kral_ResourceManager::GetPhone(handle())->state<efs::Settings>().files;
  EXPECT_TRUE(test::Eventually([&] {
    std::array<uint8_t, 128> item;
    uint16_t status = 0;
    KRAL_DIAG_NV_READ_F(handle(), 1, item.data(), item.size(), &status);
    return files.unanswered == 0;
  }));
  uint32_t error = 0;
  EXPECT_EQ(KRAL_EfsMkDir(handle(), "/after", &error), 1);
  EXPECT_EQ(handset().efs().open_descriptors(), 0u) << LogText();
}

// A handset gives out the lowest free number.
TEST_F(EfsFaults, AHandleIsNotClosedAfterAnotherFolderHasItsNumber) {
  handset().efs().AddFile("/d/one", {});
  ShortenTimeOuts(3000);
  handset().faults().Add(handset::Delay(300), handset::When::Nth(1).Of("4B 13 0D"));
  const uint64_t struck = handset().faults().struck();
  std::thread other([&] {
    EXPECT_TRUE(test::Eventually([&] { return handset().faults().struck() > struck; }));
    KRAL_AbortEFS_Operation(handle());
  });
  const auto list = [&] { return KRAL_EfsDirectory(handle(), "/d", KRAL_EFS_FILTER_ALL, nullptr, nullptr); };
  list();
  other.join();
  for (int i = 0; i < 2; ++i) EXPECT_EQ(list(), 1) << LogText();
}

TEST_F(EfsFaults, AWriteThatFailedMayHaveOpenedAFile) {
  static std::atomic<int> failing;
  struct Slow {  // delivers an opening request, and says that it did not
    static uint32_t KRAL_CALL Send(uintptr_t context, uintptr_t value, uint32_t count, const uint8_t* data,
                                   uint32_t* written) {
      const uint32_t sent = handset::CallerTransport::Send(context, value, count, data, written);
      constexpr uint8_t kOpen[] = {0x4B, 0x13, 0x02};
      const bool opens = std::search(data, data + count, std::begin(kOpen), std::end(kOpen)) != data + count;
      return opens && failing-- > 0 ? 1 : sent;
    }
  };
  handset().efs().AddFile("/f", data_);
  Disconnect();
  const KRAL_HANDLE slow =
      KRAL_ConnectServer_UserDefinedTransport(2, transport().handle_value(), transport().context(), &Slow::Send,
                                              &handset::CallerTransport::Receive, &handset::CallerTransport::Flush);
  ASSERT_NE(slow, 0u);
  KRAL_SetReceiveMode(slow, 1);
  for (const int failures : {1, 5}) {
    failing = failures;
    Bytes back(data_.size());
    auto size = static_cast<uint32_t>(back.size());
    EXPECT_EQ(KRAL_EfsReadMem(slow, "/f", back.data(), &size), failures < 5 ? 1 : 0);
    // The answers to what was given up may come with a later operation.
    uint32_t error = 0;
    EXPECT_TRUE(test::Eventually([&] {
      return handset().efs().open_descriptors() == 0 || (KRAL_EfsMkDir(slow, "/after", &error), false);
    })) << failures
        << LogText();
  }
  EXPECT_EQ(failing, 0);
  KRAL_DisconnectServer(slow);
}

// The caller's transport of the other tests stays open whatever happens.
TEST(EfsOnAComPort, LostAnswersCloseThePortAndTheNextTryOpensIt) {
  const Bytes data(700, 0x5A);
  test::HandsetPorts ports;
  auto& phone = ports.Add(9);
  const KRAL_HANDLE com = KRAL_ConnectServer(9);
  ASSERT_NE(com, 0u);
  KRAL_ConfigureTimeOut(com, 0, 200);
  Kral_ResourceManager::GetPhone(com)->state<efs::Settings>().packet_time_out_ms = 200;
  for (const char* const command : {"13", "0F", "05", "03"}) {
    SCOPED_TRACE(command);
    const size_t opens = ports.opens().size();
    phone.faults().Add(handset::Lose(), handset::When::Nth(1).Of(std::string("4B 13 ") + command));
    EXPECT_EQ(KRAL_EfsWriteMem(com, data.data(), 700, "/put"), 1);
    EXPECT_EQ(phone.efs().File("/put"), data);
    EXPECT_EQ(phone.efs().open_descriptors(), 0u);
    EXPECT_GT(ports.opens().size(), opens);
    phone.faults().Clear();
  }
}

// --- Abort from another thread --------------------------------------------------------------------------------------

TEST_F(EfsFaults, AbortOfAnotherThreadEndsWhatRuns) {
  for (int i = 0; i < 300; ++i) handset().efs().AddFile("/d/" + std::to_string(i), {});
  handset().efs().AddFile("/source", RandomBytes(60000));
  const Bytes large = RandomBytes(60000);
  const std::string target = folder_.Add("target", "before");
  struct Operation {
    const char* name;
    const char* command;
    std::function<uint8_t()> run;
  };
  const Operation operations[] = {
      {"put", "4B 13 05", [&] { return KRAL_EfsWriteMem(handle(), large.data(), 60000, "/put"); }},
      {"get", "4B 13 04", [&] { return KRAL_EfsRead(handle(), target.c_str(), "/source"); }},
      {"list", "4B 13 0C", [&] { return KRAL_EfsDirectory(handle(), "/d", KRAL_EFS_FILTER_ALL, nullptr, nullptr); }},
  };
  // One that answers nothing any more is not waited for when it comes to cleaning up, either.
  // One whose answers come too late for that is told all the same. Dying: the packet under way is the last answered.
  enum Manner { kSlow, kSilent, kLate, kDead, kDying };
  for (const Manner manner : {kSlow, kSilent, kLate, kDead, kDying}) {
    for (const Operation& operation : operations) {
      constexpr std::array<const char*, 5> kNames = {", slow answers", ", no answer", ", late answers",
                                                     ", never an answer", ", a last answer"};
      SCOPED_TRACE(testing::Message() << operation.name << kNames[manner]);
      ShortenTimeOuts(3000);
      KRAL_SetResynchronise(handle(), manner == kLate ? 1 : 0);
      handset().faults().Add(manner == kSlow    ? handset::Delay(5)
                             : manner == kDying ? handset::Lag(30)
                             : manner == kLate  ? handset::Lag(400)
                                                : handset::Ignore(),
                             handset::When::Always().Of(operation.command));
      std::chrono::steady_clock::time_point aborted;
      handset().ClearTrace();
      const uint64_t struck = handset().faults().struck();
      std::thread other([&] {
        const auto has_begun = [&] { return handset().faults().struck() > struck; };
        for (int i = 0; i < 5000 && !has_begun(); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(1));
        if (manner == kDead || manner == kDying) handset().faults().Add(handset::Ignore(), handset::When::Always());
        aborted = std::chrono::steady_clock::now();
        KRAL_AbortEFS_Operation(handle());
      });
      EXPECT_EQ(operation.run(), 0);
      other.join();
      // Told to be 250 ms; a machine may be busy. One time-out is 3,000.
      EXPECT_LT(std::chrono::steady_clock::now() - aborted, std::chrono::milliseconds(1000));
      // What the one before could not be told to close comes on top.
      EXPECT_LT(handset().requests().size(), manner == kSlow ? 120u : 16u);
      EXPECT_TRUE(LogText().find(" aborted") != std::string::npos) << LogText();
      const auto is_kept = [&] { return handset().efs().Exists("/put"); };
      for (int i = 0; i < 2000 && manner == kLate && is_kept(); ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
      }
      EXPECT_TRUE(manner == kDead || manner == kDying || !is_kept());
      EXPECT_EQ(folder_.Content("target"), "before");
      handset().faults().Clear();
      ClearLog();
    }
  }
  // What a dead handset could not be told to close is closed with the next operation that it answers.
  uint32_t error = 0;
  EXPECT_EQ(KRAL_EfsMkDir(handle(), "/after", &error), 1);
}

}  // namespace
}  // namespace kral
