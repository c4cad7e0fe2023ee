// The exported requests, packet modes and port lines, against a handset on a caller's transport and behind a phone
// server.
#include "kral/transport.h"
#include "tests/support/handset_connection.h"
#include "tests/support/scripted_server.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class TransportExports : public HandsetTest {
 protected:
  uint8_t Ask(std::vector<uint8_t> request, uint32_t time_out_ms = 5000) {
    size_ = static_cast<uint16_t>(response_.size());
    return KRAL_SendSync(handle(), static_cast<uint16_t>(request.size()), request.data(), &size_, response_.data(),
                         time_out_ms);
  }

  std::array<uint8_t, 64> response_{};
  uint16_t size_ = 0;
};

TEST_F(TransportExports, MissingArgumentsGiveZeroWithoutTraffic) {
  const uint8_t request = 0;
  uint16_t size = 4;
  std::array<uint8_t, 4> response{};
  EXPECT_EQ(KRAL_SendSync(handle(), 0, &request, &size, response.data(), 10), 0);
  EXPECT_EQ(KRAL_SendSync(handle(), 1, nullptr, &size, response.data(), 10), 0);
  EXPECT_EQ(KRAL_SendASync(handle(), 1, nullptr, 10, 0), 0);
  EXPECT_EQ(KRAL_SendRAW(handle(), 0, &request, &size, response.data(), 10), 0);
  EXPECT_EQ(KRAL_SetPacketMode(handle(), 4), 0);
  EXPECT_TRUE(HasLine(16, "KRAL_SetPacketMode() -  Error, Invalid packet mode"));
  EXPECT_EQ(KRAL_SetPacketMode(handle(), 0), 1);
  EXPECT_EQ(handset().request_count(), 0u);
  EXPECT_EQ(KRAL_SendSync(handle(), 1, &request, nullptr, nullptr, 5000), 1) << "a reply that nobody wants to see";
}

TEST_F(TransportExports, StartFlagReportsTheFormerSettingAndLeadsTheNextFrame) {
  EXPECT_EQ(KRAL_SetStartFlag(handle(), 1), 0);
  EXPECT_EQ(KRAL_SetStartFlag(handle(), 1), 1);
  EXPECT_TRUE(HasLine(4, "START_FLAG = ON"));
  const uint8_t request = 0x0C;
  EXPECT_EQ(KRAL_SendASync(handle(), 1, &request, 10, 0), 1);
  EXPECT_EQ(KRAL_SetStartFlag(handle(), 0), 1);
  EXPECT_TRUE(HasLine(4, "START_FLAG = OFF"));
  EXPECT_EQ(KRAL_SendASync(handle(), 1, &request, 10, 0), 1);
  EXPECT_EQ(KRAL_SendASync(handle(), 1, &request, 10, 1), 1) << "forced";
  const auto bytes = handset().received();
  ASSERT_EQ(bytes.size(), 5u + 4u + 5u);
  EXPECT_EQ(bytes[0], 0x7E);
  EXPECT_EQ(bytes[5], 0x0C);
  EXPECT_EQ(bytes[9], 0x7E);
}

TEST_F(TransportExports, RawPacketCallbackSeesRepliesAndWhatIsDropped) {
  std::atomic<uint32_t> length{0};
  const auto callback = [](uint32_t size, const uint8_t*, uintptr_t value) {
    *reinterpret_cast<std::atomic<uint32_t>*>(value) += size;
  };
  EXPECT_EQ(KRAL_ConfigureCallBacks(handle(), callback, reinterpret_cast<uintptr_t>(&length)), 1);
  handset().SendPacket(handset::FromHex("10 01 02"));  // a log packet while collection is off
  handset().Expect("7B 01").Reply("7B 01 02 03");
  EXPECT_EQ(Ask({0x7B, 1}), 1);
  EXPECT_EQ(length, 5u + 6u) << "FCS included";
  EXPECT_EQ(size_, 4) << "and not here";
  EXPECT_TRUE(HasLine(512, "KRAL_SendSync"));
  EXPECT_EQ(KRAL_ConfigureCallBacks(handle(), nullptr, 0), 1);
}

TEST_F(TransportExports, LinesOfACallersTransportReportTheInvertedResult) {
  EXPECT_EQ(KRAL_SetDTR_State(handle(), 1), 1);
  EXPECT_EQ(KRAL_SetRTS_State(handle(), 1), 0);
  EXPECT_EQ(KRAL_FlushRxBuffer(handle()), 1);
  EXPECT_EQ(transport().flushes(), 1u);
  EXPECT_EQ(KRAL_SetSendDataSerialWriteSizeLimit(handle(), 0), 0);
  EXPECT_EQ(KRAL_SetSendDataSerialWriteSizeLimit(handle(), 512), 1);
}

TEST(TransportExportsThroughServer, FunctionsOfTheFramerAreRefused) {
  test::ScriptedServer server;
  const KRAL_HANDLE handle = KRAL_ConnectServer(7);
  test::PhoneLog log(handle);
  const uint8_t request = 0x0C;
  uint16_t size = 4;
  std::array<uint8_t, 4> response{};
  EXPECT_EQ(KRAL_SendASync(handle, 1, &request, 10, 0), 0);
  EXPECT_EQ(KRAL_SendRAW(handle, 1, &request, &size, response.data(), 10), 1) << "success although nothing is sent";
  EXPECT_EQ(KRAL_SetStartFlag(handle, 1), 0);
  EXPECT_EQ(KRAL_SetPacketMode(handle, 2), 0);
  for (const char* name : {"KRAL_SendASync", "KRAL_SendRAW", "KRAL_SetStartFlag", "KRAL_SetPacketMode"}) {
    EXPECT_TRUE(log.Has(std::string("16 ") + name + "() : FAIL in ORBT mode")) << name;
  }
  EXPECT_EQ(KRAL_FlushRxBuffer(handle), 0);
  EXPECT_EQ(KRAL_SetReceiveMode(handle, 1), 0);
  EXPECT_EQ(KRAL_NotifyReceived(handle), 0);
  EXPECT_EQ(KRAL_SetReceiveWait(handle, 1), 0);
  EXPECT_EQ(KRAL_SetDTR_State(handle, 1), 0);
  EXPECT_EQ(KRAL_SetRTS_State(handle, 1), 0);
  EXPECT_EQ(KRAL_SetSendDataSerialWriteSizeLimit(handle, 512), 0);
  for (const auto& call : server.TakeCalls()) EXPECT_FALSE(call.starts_with("send")) << call;

  EXPECT_EQ(KRAL_SendSync(handle, 1, &request, &size, response.data(), 10), 1);
  EXPECT_EQ(size, 1);
}

}  // namespace
}  // namespace kral
