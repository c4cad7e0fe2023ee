// Into and out of factory test mode, at run time and for the next boot.
#include "tests/support/ftm_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class ModeSwitchTest : public test::FtmTest {
 protected:
  void SetUp() override {
    FtmTest::SetUp();
    handset().mode().SetState(handset::ModeState::kOnline);
    for (const uint32_t id : {11u, 12u, 13u, 18u}) KRAL_ConfigureTimeOut(handle(), id, 0);
  }
  uint8_t IsFtm() {
    uint8_t is_ftm = 0xCC;
    EXPECT_EQ(KRAL_IsFTM_Mode(handle(), &is_ftm), 1);
    return is_ftm;
  }
};

TEST_F(ModeSwitchTest, RunTimeSwitchGoesThereAndBackAndSendsNothingWhenAlreadyThere) {
  EXPECT_EQ(IsFtm(), 0);
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 1), 1);
  EXPECT_EQ(IsFtm(), 1);
  const size_t traffic = Traffic();
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 7), 1);
  EXPECT_EQ(Traffic(), traffic + 1);  // the query only
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 0), 1);
  EXPECT_EQ(IsFtm(), 0);
}

TEST_F(ModeSwitchTest, RunTimeSwitchFailsWithTheQueryAndUnderTheLegacyCode) {
  handset().Expect("4B 0F 00 00").Reply("13 4B 0F 00 00");
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 1), 0);
  EXPECT_EQ(Traffic(), 1u);
  KRAL_FTM_SET_COMMAND_CODE(handle(), 59);
  EXPECT_EQ(KRAL_ChangeFTM_ModeRuntime(handle(), 1), 0);
  EXPECT_EQ(Traffic(), 1u);
  EXPECT_TRUE(Logged("16 KRAL_ChangeFTM_ModeRuntime: Failed: Does not support non FTM_COMMAND_75 mode"));
}

TEST_F(ModeSwitchTest, BootModeGoesOfflineAndWritesTheBootFlag) {
  EXPECT_EQ(KRAL_ChangeFTM_BootMode(handle(), 1, 0), 1);
  const auto requests = handset().requests();
  EXPECT_EQ(HexText(requests.front()), "29 01 00");
  EXPECT_EQ(HexText(ByteView(requests.back()).first(5)), "27 C5 01 01 00");
  EXPECT_EQ(requests.back().size(), 131u);
  KRAL_FTM_SET_COMMAND_CODE(handle(), 59);  // the legacy query reads the flag
  EXPECT_EQ(IsFtm(), 1);
  EXPECT_EQ(KRAL_ChangeFTM_BootMode(handle(), 0, 1), 1);
  EXPECT_EQ(LastRequest(), "29 02 00");
}

TEST_F(ModeSwitchTest, BootModeStopsAtABadNvStatusAndAtAFailedSwitch) {
  handset().Expect("29 01 00").Reply("29 01 00");
  handset().Expect("4B 0F 00 00").Reply("4B 0F 00 00 00 00 00 00 03 00 00 00");
  handset().Expect("27 C5 01 ...").Reply("27 C5 01 07 00");
  EXPECT_EQ(KRAL_ChangeFTM_BootMode(handle(), 1, 1), 0);
  EXPECT_TRUE(Logged("16 KRAL_ChangeFTM_BootMode() - Failed to write NV FTM mode"));
  const size_t traffic = Traffic();
  handset().Expect("29 01 00").Reply("18 29 01 00");
  handset().Expect("4B 0F 00 00").Reply("13 4B 0F 00 00");
  EXPECT_EQ(KRAL_ChangeFTM_BootMode(handle(), 1, 1), 0);
  EXPECT_EQ(Traffic(), traffic + 2);
}

TEST_F(ModeSwitchTest, ApplicationTargetIsNotInFtmWhateverItsServiceSays) {
  Connect([] { KRAL_SetTargetType(1); });
  KRAL_ConfigureTimeOut(handle(), KRAL_TIME_OUT_LIVENESS, kAnswerInTimeMs);
  EXPECT_EQ(IsFtm(), 0);
  EXPECT_TRUE(Logged(
      "4 GetPhoneOperatingMode() is not supported in ZTD target. Use 0x4B, 0x32, 0x3, 0x0 to check diag service"));
  EXPECT_EQ(LastRequest(), "4B 32 03 00 00 00 00 00 00 00 00 00");
}

}  // namespace
}  // namespace kral
