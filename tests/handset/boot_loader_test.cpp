// The boot loader's place in the life of a handset: leaving the port, coming back, becoming something else. Its packets
// are tested with the library's side of them.
#include "handset/boot_loader.h"

#include <gtest/gtest.h>

#include "handset/virtual_handset.h"
#include "handset/wire_modes.h"
#include "tests/support/fake_clock.h"
#include "tests/support/handset_host.h"

namespace kral::handset {
namespace {

constexpr const char* kHelloHead = "01 00 00 00 30 00 00 00 02 00 00 00";

class BootLoaderLife : public testing::Test {
 protected:
  bool SaysHello() { return host_.Read().starts_with(kHelloHead); }

  test::FakeClock clock_;
  VirtualHandset handset_{{}, clock_};
  test::HandsetHost host_{handset_};
  const std::shared_ptr<BootLoader> loader_ = std::make_shared<BootLoader>();
};

TEST_F(BootLoaderLife, DownloadRequestMakesTheDeviceLeaveAndComeBackAsAnother) {
  handset_.mode().SetLoader(std::make_shared<Reappearance>(loader_, 100, 200));
  EXPECT_EQ(host_.Ask("3A"), "3A");
  EXPECT_EQ(handset_.MillisecondsToOutput(), 100u);
  clock_.Advance(99);
  EXPECT_FALSE(handset_.vanished());
  clock_.Advance(1);
  EXPECT_TRUE(handset_.vanished());
  EXPECT_FALSE(handset_.FromHost(FromHex("00")));
  clock_.Advance(200);
  EXPECT_FALSE(handset_.vanished());
  EXPECT_EQ(handset_.appearances(), 2u);
  EXPECT_TRUE(SaysHello());
  handset_.PlugIn();
  EXPECT_EQ(host_.Ask("7B"), "7B") << "diagnostic again";
}

TEST_F(BootLoaderLife, HandsetThatStartsInItSaysHelloWithEveryPowerOn) {
  handset_.SetStartMode(loader_);
  for (int i = 0; i < 2; ++i) {
    handset_.Restart();
    EXPECT_TRUE(SaysHello());
    EXPECT_EQ(host_.Read(), "");
  }
  EXPECT_EQ(handset_.appearances(), 1u);
  handset_.HangUp();
  handset_.PlugIn();
  EXPECT_TRUE(SaysHello());
  handset_.SetStartMode(nullptr);
  handset_.Restart();
  EXPECT_EQ(host_.Ask("7B"), "7B");
}

TEST_F(BootLoaderLife, HostThatMakesAMistakeIsHeardNoMore) {
  handset_.EnterMode(loader_);
  host_.Read();
  handset_.FromHost(FromHex("0D 00 00 00 0C 00 00 00 02 00 00 00"));
  EXPECT_NE(loader_->problem(), "");
  handset_.FromHost(FromHex("05 00 00 00 08 00 00 00"));
  EXPECT_EQ(host_.Read(), "");
  EXPECT_FALSE(loader_->transferred());
}

}  // namespace
}  // namespace kral::handset
