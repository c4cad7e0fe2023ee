// The handset's side of logs and events: what it refuses, and that it sends what is on and nothing else.
#include "handset/services/log_service.h"

#include "handset/log_generator.h"
#include "tests/support/fake_clock.h"
#include "tests/support/handset_host.h"
#include "tests/support/test.h"

namespace kral::handset {
namespace {

class HandsetLogs : public testing::Test {
 protected:
  test::FakeClock clock_;
  VirtualHandset handset_{Identity{}, clock_};
  test::HandsetHost host_{handset_};
};

TEST_F(HandsetLogs, RefusesWhatItCannotTake) {
  for (const auto& [request, reply] : std::initializer_list<std::pair<const char*, const char*>>{
           {"73 00 00 00 05 00 00 00", "14 73 00 00 00 05 00 00 00"},
           {"73 00 00 00 04 00 00 00 10 00 00 00", "14 73 00 00 00 04 00 00 00 10 00 00 00"},
           {"73 00 00 00 03 00 00 00 00", "15 73 00 00 00 03 00 00 00 00"},
           {"73 00 00 00 03 00 00 00 00 00 00 00 51 00 00 00", "14 73 00 00 00 03 00 00 00 00 00 00 00 51 00 00 00"},
           {"73 00 00 00 03 00 00 00 00 00 00 00 09 00 00 00 FF",
            "15 73 00 00 00 03 00 00 00 00 00 00 00 09 00 00 00 FF"},
           {"82 00 00 00 09 00 FF", "82 01 00 00 09 00 FF"},
           {"82 00 00 00 FF FF", "82 01 00 00 FF FF"},
           {"7D 04 05 00 04 00 00 00", "14 7D 04 05 00 04 00 00 00"},
           {"7D 04 05 00 06 00 00 00 01 00 00 00", "15 7D 04 05 00 06 00 00 00 01 00 00 00"},
       }) {
    EXPECT_EQ(host_.Ask(request), reply);
  }
  EXPECT_EQ(handset_.logs().changes(), 0u);
}

TEST_F(HandsetLogs, SendsWhatIsOnInBurstsAtItsRate) {
  LogGenerator generator(handset_, {.logs = 100, .reports = 100, .messages = 100, .burst = 4, .report_events = 2});
  generator.Advance(1000);
  EXPECT_EQ(generator.sent().packets(), 0u) << "nothing is on";
  host_.Ask("73 00 00 00 03 00 00 00 01 00 00 00 10 00 00 00 22 00");
  generator.Advance(30);
  EXPECT_EQ(generator.sent().logs, 0u);
  generator.Advance(50);
  const auto packets = host_.Packets();
  ASSERT_EQ(packets.size(), 8u);
  EXPECT_EQ(packets[0].substr(0, 23), "10 00 3C 00 3C 00 01 10");
  EXPECT_EQ(packets[1].substr(0, 23), "10 00 3C 00 3C 00 05 10");
  host_.Ask("82 00 00 00 09 00 80 01");
  host_.Ask("7D 04 05 00 05 00 00 00 01 00 00 00");
  generator.Advance(40);
  EXPECT_EQ(generator.sent().reports, 4u);
  EXPECT_EQ(generator.sent().events, 8u);
  EXPECT_EQ(generator.sent().messages, 4u);
  handset_.Restart();
  generator.Advance(1000);
  EXPECT_EQ(generator.sent().packets(), 20u) << "after a restart nothing is on";
}

}  // namespace
}  // namespace kral::handset
