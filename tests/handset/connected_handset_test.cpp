// The virtual handset behind a connection of the library: what the fixture of the other tests promises.
#include <gtest/gtest.h>

#include "kral/diag.h"
#include "tests/support/handset_connection.h"

namespace kral {
namespace {

using handset::FromHex;
using handset::When;

class ConnectedHandset : public HandsetTest {};

TEST_F(ConnectedHandset, IsAliveOnBothKindsOfTarget) {
  EXPECT_EQ(KRAL_IsPhoneConnected(handle()), 1);
  EXPECT_EQ(handset().requests(), (std::vector<handset::Bytes>{FromHex("7B 00 01 02 03 04 05 06 07 08 09"), {0}}));
  Connect([] { KRAL_SetTargetType(1); });
  EXPECT_EQ(KRAL_IsPhoneConnected(handle()), 1);
  EXPECT_EQ(handset().requests().back(), FromHex("4B 32 03 00 00 00 00 00 00 00 00 00"));
}

TEST_F(ConnectedHandset, FollowsModelAndScript) {
  uint32_t serial = 0;
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle(), &serial), 1);
  EXPECT_EQ(serial, handset().identity().identity().serial_number);
  handset().Expect("2F").Reply("2F 78 56");
  uint16_t switches = 0;
  EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 1);
  EXPECT_EQ(switches, 0x5678);
  EXPECT_TRUE(HasLine(KRAL_LOG_C_HIGH_LEVEL_START, "KRAL_DIAG_GET_DIPSW_F")) << LogText();
  EXPECT_EQ(ErrorText(), "");
}

TEST_F(ConnectedHandset, FaultsThatCostNothingAreSurvived) {
  struct Case {
    const char* name;
    handset::Fault fault;
  };
  for (const Case& c : {Case{"split", handset::Split(1)}, Case{"slowly split", handset::Split(2, 2)},
                        Case{"delayed", handset::Delay(20)}, Case{"noise", handset::LeadingNoise(9)},
                        Case{"duplicate", handset::Duplicate()}}) {
    SCOPED_TRACE(c.name);
    handset().faults().Add(c.fault, When::Nth(1));
    uint16_t switches = 0;
    EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 1);
    EXPECT_EQ(switches, 0x1234);
    handset().faults().Clear();
  }
}

TEST_F(ConnectedHandset, FaultsThatCostTheRequestCostOnlyThatOne) {
  ASSERT_EQ(KRAL_ConfigureTimeOut(handle(), 0, 50), 1);
  struct Case {
    const char* name;
    handset::Fault fault;
    std::string error;
  };
  for (const Case& c :
       {Case{"lost", handset::Lose(), "Request timed out"}, Case{"corrupt", handset::Corrupt(), "Request timed out"},
        Case{"silent", handset::Ignore(), "Request timed out"},
        Case{"late", handset::AfterNextRequest(), "Request timed out"},
        Case{"refused", handset::Refuse(handset::Refusal::kBadMode),
             "ERROR:\tDIAG_BAD_MODE_F (24) received, command is invalid for the current mode"},
        Case{"wrong", handset::WrongCode(0x30),
             "Received different response command byte (0x30)than was requested (0x2F)"}}) {
    SCOPED_TRACE(c.name);
    ClearLog();
    handset().faults().Add(c.fault, When::Nth(1));
    uint16_t switches = 0;
    EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 0);
    EXPECT_TRUE(HasLine(KRAL_LOG_ERR, c.error)) << LogText();
    handset().faults().Clear();
    handset().DropOutput();
    EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 1);
  }
}

TEST_F(ConnectedHandset, VanishesMidRequestAndComesBack) {
  ASSERT_EQ(KRAL_ConfigureTimeOut(handle(), 0, 50), 1);
  handset().faults().Add(handset::HangUp(), When::Nth(1));
  uint16_t switches = 0;
  EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 0);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle()), 0);
  handset().PlugIn();
  EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), &switches), 1);
}

}  // namespace
}  // namespace kral
