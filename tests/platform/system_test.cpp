// What both platforms give in the same way: time, markers of ports in use, variables of the environment.
#include <set>

#include "platform/clock.h"
#include "platform/environment.h"
#include "platform/local_time.h"
#include "platform/named_mutex.h"
#include "platform/serial_device.h"
#include "tests/support/test.h"

namespace kral {
namespace {

TEST(SystemClockTest, AShortSleepIsShortWhileAFineTimerLives) {
  const FineTimer timer;
  Clock& clock = SystemClock();
  uint32_t shortest = UINT32_MAX;
  // The best of many: a busy machine may delay any of them.
  for (int i = 0; i < 30; ++i) {
    const uint32_t start = clock.TickMs();
    clock.SleepMs(1);
    clock.SleepMs(1);
    shortest = std::min(shortest, clock.TickMs() - start);
  }
  EXPECT_GE(shortest, 1u);
  EXPECT_LE(shortest, 6u);
}

TEST(LocalTimeTest, TextsArePaddedAndTheReadingIsInRange) {
  const LocalTime time{2024, 5, 1, 3, 4, 59, 7};
  EXPECT_EQ(DateText(time), "2024-05-01");
  EXPECT_EQ(TimeText(time), "03:04:59");
  const LocalTime now = CurrentLocalTime();
  EXPECT_GE(now.year, 2024);
  EXPECT_TRUE(now.month >= 1 && now.month <= 12 && now.day >= 1 && now.day <= 31);
  EXPECT_TRUE(now.hour >= 0 && now.hour < 24 && now.minute >= 0 && now.minute < 60);
  EXPECT_TRUE(now.second >= 0 && now.second <= 60 && now.millisecond >= 0 && now.millisecond < 1000);
}

TEST(NamedMutexTest, LiveOnesHaveDistinctValuesAndANameTwiceIsNoFailure) {
  std::vector<std::unique_ptr<NamedMutex>> live;
  std::set<uint32_t> values;
  for (int i = 0; i < 60; ++i) {
    live.push_back(CreateNamedMutex("kral test marker #" + std::to_string(i % 50)));
    ASSERT_TRUE(live.back());
    values.insert(live.back()->value());
  }
  EXPECT_EQ(values.size(), 60u);
  EXPECT_EQ(values.count(0), 0u);
}

TEST(EnvironmentTest, ValuesAreSetAndUnset) {
  SetEnvironmentValue("KRAL_TEST_VARIABLE", "a=b c");
  EXPECT_EQ(EnvironmentValue("KRAL_TEST_VARIABLE"), "a=b c");
  SetEnvironmentValue("KRAL_TEST_VARIABLE", std::nullopt);
  EXPECT_EQ(EnvironmentValue("KRAL_TEST_VARIABLE"), std::nullopt);
}

TEST(OpenComPortTest, APortThatIsNotThereSaysSo) {
  DeviceResult result;
  EXPECT_FALSE(OpenComPort(187, result));
  EXPECT_EQ(result.error, DeviceError::kNoSuchPort);
  EXPECT_NE(result.system_code, 0u);
  EXPECT_FALSE(result.text.empty());
}

}  // namespace
}  // namespace kral
