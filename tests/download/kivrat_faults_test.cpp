// Every fault of the line at every packet of a boot transfer, against the boot loader of the virtual handset: the
// programmer runs, byte for byte, or the call failed and the next one works.
#include "download/boot/kivrat.h"
#include "handset/caller_transport.h"
#include "handset/loaders/boot_loader.h"
#include "handset/virtual_handset.h"
#include "tests/support/fake_clock.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::BootLoader;
using handset::Bytes;

enum class Harm { kPasses, kFails, kEither };

struct FaultRow {
  const char* name;
  Fault fault;
  Harm harm;
};

const FaultRow kFaultRows[] = {
    {"split", handset::Split(3, 2), Harm::kPasses},
    {"delay", handset::Delay(4000), Harm::kPasses},
    {"late", handset::Delay(5100), Harm::kFails},
    {"duplicate", handset::Duplicate(), Harm::kEither},  // of the last packet, nobody reads the second
    {"leading noise", handset::LeadingNoise(5), Harm::kEither},
    {"merge", handset::Merge(), Harm::kFails},
    {"lose", handset::Lose(), Harm::kFails},
    {"corrupt", handset::Corrupt(), Harm::kEither},           // the last byte is often one that decides nothing
    {"wrong code", handset::WrongCode(0x55), Harm::kEither},  // the data of the identity have no code
    {"ignore", handset::Ignore(), Harm::kFails},
    {"hang up", handset::HangUp(), Harm::kFails},
};

class KivratFaults : public testing::Test {
 protected:
  void SetUp() override {
    OpenArguments arguments;
    arguments.user = {cable_.handle_value(), cable_.context(), &handset::CallerTransport::Send,
                      &handset::CallerTransport::Receive, &handset::CallerTransport::Flush};
    ASSERT_TRUE(phone_.OpenPort(arguments));
    loader_->Set({.piece_size = 1000});
    loader_->SetProgrammer(nullptr);
    handset_.SetStartMode(loader_);
  }

  // From power on to the running programmer.
  bool Transfer() {
    EXPECT_TRUE(phone_.BorrowPort());
    handset_.Restart();
    uint32_t version = 0;
    std::optional<uint32_t> identity;
    return kivrat::Connect(phone_, version, &identity) && kivrat::DownloadFlashProgrammer(phone_, file_);
  }

  test::FakeClock clock_;
  handset::VirtualHandset handset_{{}, clock_};
  handset::CallerTransport cable_{handset_};
  Diag_FTM phone_{1, clock_};
  const std::shared_ptr<BootLoader> loader_ = std::make_shared<BootLoader>();
  const Bytes programmer_ = handset::MakeProgrammer(2500);
  test::TempFolder folder_;
  const std::string file_ = folder_.Add("programmer", {reinterpret_cast<const char*>(programmer_.data()), 2500});
};

TEST_F(KivratFaults, StrikeEveryPacket) {
  // Hello, ready, execute response, identity, hello; header, three pieces, end, done response.
  constexpr size_t kPackets = 11;
  for (const FaultRow& row : kFaultRows) {
    for (size_t packet = 1; packet <= kPackets; ++packet) {
      SCOPED_TRACE(testing::Message() << row.name << " at packet " << packet);
      handset_.faults().Add(row.fault, handset::When::Nth(packet));
      const uint64_t struck = handset_.faults().struck();
      const bool passed = Transfer();
      EXPECT_EQ(handset_.faults().struck(), struck + 1);
      handset_.faults().Clear();
      if (row.harm != Harm::kEither) {
        EXPECT_EQ(passed, row.harm == Harm::kPasses);
      }
      if (passed) {
        EXPECT_TRUE(loader_->transferred());
        EXPECT_EQ(loader_->image(), programmer_);
      }
      if (row.fault.kind != Fault::Kind::kCorrupt) {
        EXPECT_EQ(loader_->problem(), "") << "the host stops at the first surprise";
      }
      EXPECT_FALSE(phone_.port_borrowed());
    }
    EXPECT_TRUE(Transfer()) << "after " << row.name << ": " << loader_->problem();
    EXPECT_EQ(loader_->image(), programmer_);
  }
}

TEST_F(KivratFaults, PiecesOfEverySizeArriveWhole) {
  for (const uint32_t piece : {1u, 7u, 128u, 2492u, 131072u}) {
    loader_->Set({.piece_size = piece});
    EXPECT_TRUE(Transfer()) << piece;
    EXPECT_EQ(loader_->image(), programmer_);
    EXPECT_EQ(loader_->problem(), "");
  }
}

TEST_F(KivratFaults, FilesThatAreNoProgrammersAreRefusedByTheTarget) {
  folder_.Add("programmer", "no programmer at all");
  // The target tells so in a status that the host takes note of only.
  EXPECT_TRUE(Transfer());
  EXPECT_FALSE(loader_->transferred());
  // A file that is shorter than it says ends the transfer, and one byte of it may be all that is left.
  folder_.Add("programmer", {reinterpret_cast<const char*>(programmer_.data()), 2009});
  EXPECT_FALSE(Transfer());
  EXPECT_EQ(loader_->image().size(), 2009u);
}

}  // namespace
}  // namespace kral
