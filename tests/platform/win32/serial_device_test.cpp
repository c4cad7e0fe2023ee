// A COM port with a handset behind it: the number is given by the variable KRAL_TEST_COM. Without it there is nothing
// to test, unless KRAL_TEST_REQUIRE_COM says that there must be.
#include "platform/serial_device.h"

#include <cstdlib>

#include "platform/environment.h"
#include "platform/file_util.h"
#include "platform/port_list.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr uint32_t kLong = 5000;

// A framed loopback request; the handset answers with the same bytes.
const Bytes kLoopback = {0x7B, 0x00, 0x01, 0x02, 0x03, 0x04, 0x05, 0x06, 0x07, 0x08, 0x09, 0x9D, 0x5F, 0x7E};

class ComPortTest : public testing::Test {
 protected:
  void SetUp() override {
    const auto number = EnvironmentValue("KRAL_TEST_COM");
    if (!number) {
      ASSERT_FALSE(EnvironmentValue("KRAL_TEST_REQUIRE_COM")) << "KRAL_TEST_COM is not set";
      GTEST_SKIP() << "KRAL_TEST_COM is not set";
    }
    number_ = std::atoi(number->c_str());
    DeviceResult result;
    port_ = OpenComPort(number_, result);
    ASSERT_TRUE(port_) << result.text;
    port_->PurgeBoth();
  }

  // Reads as the receive thread does in its two modes.
  Bytes ReadAll(size_t count, bool waiting) {
    Bytes bytes;
    Bytes buffer(4096);
    const auto deadline = steady_clock::now() + milliseconds(kLong);
    while (bytes.size() < count && steady_clock::now() < deadline) {
      if (waiting) {
        port_->WaitReadable(100);
      } else {
        std::this_thread::sleep_for(milliseconds(1));
      }
      const size_t received = port_->Read(buffer);
      bytes.insert(bytes.end(), buffer.begin(), buffer.begin() + static_cast<ptrdiff_t>(received));
    }
    return bytes;
  }

  int number_ = 0;
  std::unique_ptr<SerialDevice> port_;
};

TEST_F(ComPortTest, BytesGoBothWaysInBothReceiveModesInAnyOrder) {
  for (const bool waiting : {false, true, true, false, true, false, false}) {
    ASSERT_EQ(port_->Write(kLoopback, 5000), kLoopback.size());
    EXPECT_EQ(ReadAll(kLoopback.size(), waiting), kLoopback);
    EXPECT_EQ(port_->InputWaiting(), 0u);
  }
}

TEST_F(ComPortTest, AReadOfAnEmptyQueueReturnsAtOnce) {
  Bytes buffer(16);
  const auto start = steady_clock::now();
  for (int i = 0; i < 10; ++i) EXPECT_EQ(port_->Read(buffer), 0u);
  EXPECT_LT(steady_clock::now() - start, milliseconds(kLong));
  EXPECT_FALSE(port_->gone());
}

TEST_F(ComPortTest, AWaitEndsWithAWakeOrItsTime) {
  EXPECT_FALSE(port_->WaitReadable(0));
  port_->Wake();
  const auto start = steady_clock::now();
  EXPECT_FALSE(port_->WaitReadable(kLong));
  std::thread waker([this] { port_->Wake(); });
  EXPECT_FALSE(port_->WaitReadable(kLong));
  EXPECT_LT(steady_clock::now() - start, milliseconds(kLong));
  waker.join();
  EXPECT_FALSE(port_->WaitReadable(10));
}

TEST_F(ComPortTest, PurgingDropsWhatAWaitHasAlreadyTaken) {
  ASSERT_EQ(port_->Write(kLoopback, 5000), kLoopback.size());
  ASSERT_TRUE(port_->WaitReadable(kLong));
  std::this_thread::sleep_for(milliseconds(50));
  port_->PurgeInput();
  EXPECT_FALSE(port_->WaitReadable(0));
}

TEST_F(ComPortTest, RatesCanBeChanged) {
  EXPECT_EQ(port_->BaudRate(), 115200u);
  EXPECT_EQ(port_->SetBaudRate(57600).error, DeviceError::kNone);
  EXPECT_EQ(port_->BaudRate(), 57600u);
}

TEST_F(ComPortTest, ThePortIsListedAndOpensAgainAfterAClose) {
  std::vector<uint16_t> ports;
  ASSERT_TRUE(ListComPorts(ports));
  EXPECT_NE(std::ranges::find(ports, number_), ports.end());
  port_.reset();
  EXPECT_EQ(OpenToWriteText("COM" + std::to_string(number_)), nullptr) << "lines of a log do not go to a handset";
  DeviceResult result;
  EXPECT_TRUE(OpenComPort(number_, result)) << result.text;
}

}  // namespace
}  // namespace kral
