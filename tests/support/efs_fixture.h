// A connected handset for tests of its files: woken by data, and, on demand, with time-outs short enough to wait for.
#ifndef KRAL_TESTS_SUPPORT_EFS_FIXTURE_H
#define KRAL_TESTS_SUPPORT_EFS_FIXTURE_H

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/efs.h"
#include "storage/efs/efs_settings.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral::test {

class EfsTest : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    KRAL_SetReceiveMode(handle(), 1);
  }
  // Whatever happened, the handset is left with nothing open.
  void TearDown() override {
    EXPECT_EQ(handset().efs().open_descriptors(), 0u);
    EXPECT_EQ(handset().efs().open_directories(), 0u);
    HandsetTest::TearDown();
  }

  void ShortenTimeOuts(uint32_t milliseconds = 40) {
    KRAL_ConfigureTimeOut(handle(), 0, static_cast<int32_t>(milliseconds));
    Kral_ResourceManager::GetPhone(handle())->state<efs::Settings>().packet_time_out_ms = milliseconds;
  }

  static handset::Bytes RandomBytes(size_t size, uint32_t seed = 1) {
    std::mt19937 random(seed);
    handset::Bytes bytes(size);
    for (uint8_t& byte : bytes) byte = static_cast<uint8_t>(random());
    return bytes;
  }
  static std::string Text(const handset::Bytes& bytes) { return {bytes.begin(), bytes.end()}; }
};

}  // namespace kral::test

#endif
