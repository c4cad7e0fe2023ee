// Every fault of the line at every packet of a transfer and of a listing: exact bytes, or a clean failure.
#include <gtest/gtest.h>

#include "tests/support/efs_fixture.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using handset::Bytes;
using handset::Fault;

// Passes: the host never notices. Again: one try is spoilt; requests that are sent once fail. Gone: nothing works.
enum class Harm { kPasses, kAgain, kGone };

struct Row {
  const char* name;
  Fault fault;
  Harm harm;
  bool hides_handle = false;  // the answer to an opening request is spoilt for good, though it was carried out
};

const Row kRows[] = {
    {"split", handset::Split(3), Harm::kPasses},
    {"duplicate", handset::Duplicate(), Harm::kPasses},
    {"leading noise", handset::LeadingNoise(40), Harm::kPasses},
    {"merge", handset::Merge(), Harm::kAgain},
    {"delay", handset::Delay(60), Harm::kAgain},
    {"after the next request", handset::AfterNextRequest(), Harm::kAgain},
    {"lose", handset::Lose(), Harm::kAgain, true},
    {"corrupt", handset::Corrupt(), Harm::kAgain, true},
    {"wrong code", handset::WrongCode(0x55), Harm::kAgain, true},
    {"refuse", handset::Refuse(19), Harm::kAgain},
    {"ignore", handset::Ignore(), Harm::kAgain},
    {"hang up", handset::HangUp(), Harm::kGone},
};

constexpr uint32_t kTimeOutMs = 40;  // the delayed answer comes behind it

class EfsFaults : public test::EfsTest {
 protected:
  // Carries an operation out with one fault at each of its packets, on a line and a handset that know nothing of the
  // fault before. `commands` are the operation's own, in order; `outcome` is empty when it is as `passed` says.
  void Strike(const std::vector<uint8_t>& commands, const std::function<uint8_t()>& run,
              const std::function<std::string(bool passed)>& outcome) {
    for (const Row& row : kRows) {
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
        EXPECT_EQ(passed, Survives(row.harm, command, commands[1] == 15)) << LogText();
        if (row.harm == Harm::kGone && !passed) continue;  // what the handset keeps cannot be tidied up
        EXPECT_EQ(outcome(passed), "");
        if (row.harm == Harm::kGone) continue;
        const bool opens = command == 2 || command == 11;
        const size_t left = handset().efs().open_descriptors() + handset().efs().open_directories();
        EXPECT_EQ(left, row.hides_handle && opens ? 1u : 0u) << LogText();
      }
    }
    handset().Restart();
    EXPECT_EQ(run_, std::size(kRows) * commands.size());
  }

  static bool Survives(Harm harm, uint8_t command, bool writing) {
    const bool sent_once = command == 15 || command == 19;  // stat and the free space
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

}  // namespace
}  // namespace kral
