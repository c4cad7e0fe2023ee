// Switching the operating mode: the delays, the read-back, and the line each leaves in the log.
#include "kral/kral.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::ModeState;

constexpr uint32_t kFtmDelay = 11;
constexpr uint32_t kOnlineDelay = 12;
constexpr uint32_t kOfflineDelay = 13;
constexpr uint32_t kReadBack = 18;

class ModeControl : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    for (const uint32_t id : {kFtmDelay, kOnlineDelay, kOfflineDelay}) SetTimeOut(id, 5);
    SetTimeOut(kReadBack, 30);
    ClearLog();
  }

  void SetTimeOut(uint32_t id, int32_t milliseconds) { KRAL_ConfigureTimeOut(handle(), id, milliseconds); }
  bool HasLineWith(const std::string& part) { return LogText().find(part) != std::string::npos; }
};

TEST_F(ModeControl, EachModeWaitsAndIsReadBackAsItNeeds) {
  struct Case {
    uint16_t mode;
    int32_t delay;
    ModeState reached;
    const char* line;
  };
  for (const Case& c : {Case{3, 5, ModeState::kFactoryTest, "post-FTM-mode-switch delay is 5ms."},
                        Case{4, 5, ModeState::kOnline, "post-ONLINE-mode-switch delay is 5ms."},
                        Case{0, 5, ModeState::kOfflineAnalog, "post-OFFLINE-mode-switch delay is 5ms."},
                        Case{1, 5, ModeState::kOfflineDigital, "post-OFFLINE-mode-switch delay is 5ms."},
                        Case{3, 0, ModeState::kFactoryTest, "post-FTM-mode-switch delay is zero."},
                        Case{4, 0, ModeState::kOnline, "post-ONLINE-mode-switch delay is zero."},
                        Case{1, 0, ModeState::kOfflineDigital, "post-OFFLINE-mode-switch delay is zero."},
                        Case{5, 5, ModeState::kLowPower,
                             "enabling phone mode read back flag for LPM, please make sure "
                             "VARN_Timeout_Runtime_Mode_Switching is configured long enough."}}) {
    SCOPED_TRACE(c.line);
    ClearLog();
    for (const uint32_t id : {kFtmDelay, kOnlineDelay, kOfflineDelay}) SetTimeOut(id, c.delay);
    EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), c.mode), 1);
    EXPECT_EQ(handset().mode().state(), c.reached);
    EXPECT_EQ(handset::HexText(handset().requests().back()), "4B 0F 00 00");
    EXPECT_TRUE(HasLine(4, std::string("KRAL_DIAG_CONTROL_F() -- ") + c.line));
    EXPECT_TRUE(HasLine(4, "DIAG_CONTROL_F -- post-runtime-mode-switch timeout is 30 ms."));
    EXPECT_TRUE(HasLineWith("4 DIAG_CONTROL_F -- mode switching status polling has succeeded (time used = "));
  }
}

TEST_F(ModeControl, OtherModesReturnRightAfterTheRequest) {
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 2), 1);
  EXPECT_TRUE(HasLine(4, "DIAG_CONTROL_F -- no mode read back for eMode = 2"));
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 9), 0);  // the handset refuses it, and that is the result
  EXPECT_EQ(handset::HexText(handset().requests().back()), "29 09 00");
}

TEST_F(ModeControl, SlowHandsetIsAskedAgainUntilItHasSwitched) {
  SetTimeOut(kReadBack, 5000);
  handset().mode().SetSwitchingDelay(400);
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 3), 1);
  EXPECT_GE(handset().request_count(), 3u);
}

TEST_F(ModeControl, HandsetThatNeverSwitchesFailsTheCall) {
  handset().mode().SetSwitchingDelay(60000);
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 3), 0);
  EXPECT_TRUE(HasLineWith("4 DIAG_CONTROL_F -- mode switching status polling has timeout (time used = "));
}

// The low four bits are sent, but the comparison takes the mode as it was passed.
TEST_F(ModeControl, BitsAboveTheLowFourFailTheReadBack) {
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 0x13), 0);
  EXPECT_EQ(handset().mode().state(), ModeState::kFactoryTest);
  EXPECT_TRUE(HasLine(2, "KRAL_DIAG_CONTROL_F(eMode=3)"));
}

// Some handsets switch without answering: the read-back has the last word.
TEST_F(ModeControl, LostAnswerDoesNotFailASwitchThatIsReadBack) {
  SetTimeOut(0, 50);
  handset().faults().Add(handset::Lose(), handset::When::Nth(1).Of("29"));
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 3), 1);
}

TEST_F(ModeControl, LegacyFtmCommandSleepsInsteadOfAsking) {
  ASSERT_EQ(KRAL_FTM_SET_COMMAND_CODE(handle(), 59), 1);
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 3), 1);
  EXPECT_EQ(handset::HexText(handset().requests().back()), "29 03 00");
  EXPECT_TRUE(HasLine(4,
                      "DIAG_CONTROL_F -- mode switching status polling skipped with FTM_COMMAND_59; did an extra sleep "
                      "with 30 ms"));
}

TEST_F(ModeControl, ApplicationProcessorTargetCannotBeReadBack) {
  Connect([] { KRAL_SetTargetType(1); });
  SetTimeOut(kOnlineDelay, 0);
  SetTimeOut(kReadBack, 30);
  EXPECT_EQ(KRAL_DIAG_CONTROL_F(handle(), 4), 0);
  EXPECT_EQ(handset().request_count(), 1u);
}

}  // namespace
}  // namespace kral
