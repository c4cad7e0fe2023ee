// Every fault of the virtual handset behind a connection of the library: what it costs a request, and no more.
#include <gtest/gtest.h>

#include "kral/diag.h"
#include "tests/support/handset_connection.h"

namespace kral {
namespace {

using handset::When;

class ConnectedHandset : public HandsetTest {};

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

}  // namespace
}  // namespace kral
