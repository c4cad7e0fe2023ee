// What a caller is told of a port that is not open.
#include <future>

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/connection.h"
#include "kral/diag.h"
#include "kral/log.h"
#include "kral/transport.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/handset_connection.h"
#include "tests/support/handset_ports.h"
#include "tests/support/test.h"

namespace kral {
namespace {

constexpr uint16_t kWatchedPort = 12;
constexpr uint32_t kTooLong = 20000;  // of a wait that shall end long before

int32_t StateOf(KRAL_HANDLE handle) {
  int32_t state = -1;
  EXPECT_EQ(KRAL_GetPortState(handle, &state), 1);
  return state;
}

class PortStates : public testing::Test {
 protected:
  ~PortStates() override { KRAL_DisconnectAllServers(); }

  test::HandsetPorts ports_;
  handset::VirtualHandset& handset_ = ports_.Add(kWatchedPort);
};

TEST_F(PortStates, EachReasonHasItsState) {
  for (const auto& [error, state] :
       {std::pair{DeviceError::kNoSuchPort, KRAL_PORT_NOT_FOUND}, std::pair{DeviceError::kBusy, KRAL_PORT_BUSY},
        std::pair{DeviceError::kNotPermitted, KRAL_PORT_NOT_PERMITTED},
        std::pair{DeviceError::kLineSettings, KRAL_PORT_FAILED}, std::pair{DeviceError::kOther, KRAL_PORT_FAILED}}) {
    Kral_ResourceManager::SetDeviceOpener([error = error](int, DeviceResult& result) {
      result = {error, 1, "refused"};
      return std::unique_ptr<SerialDevice>();
    });
    const KRAL_HANDLE handle = KRAL_ConnectServer(kWatchedPort);
    EXPECT_EQ(StateOf(handle), state);
    KRAL_DisconnectServer(handle);
  }
  EXPECT_EQ(StateOf(KRAL_ConnectServer(256)), KRAL_PORT_NOT_FOUND);
  EXPECT_EQ(StateOf(KRAL_ConnectServer(KRAL_PORT_NULL)), KRAL_PORT_OPEN);
}

TEST_F(PortStates, FunctionsOfTheCallerAreOpenWhenTheyAreComplete) {
  HandsetConnection connection(300);
  EXPECT_EQ(StateOf(connection.Connect()), KRAL_PORT_OPEN);
  EXPECT_EQ(StateOf(KRAL_ConnectServer_UserDefinedTransport(301, 0, connection.transport().context(),
                                                            &handset::CallerTransport::Send, nullptr, nullptr)),
            KRAL_PORT_CLOSED);
}

TEST_F(PortStates, UnplugInIdleClosesThePortAndTheNextRequestOpensItAgain) {
  for (const uint8_t receive_mode : {0, 1}) {
    const KRAL_HANDLE handle = KRAL_ConnectServer(kWatchedPort);
    KRAL_SetReceiveMode(handle, receive_mode);
    ASSERT_EQ(KRAL_IsPhoneConnected(handle), 1);
    handset_.HangUp();
    EXPECT_TRUE(test::Eventually([this] { return !ports_.IsOpen(kWatchedPort); })) << "held until the next request";
    EXPECT_EQ(StateOf(handle), KRAL_PORT_GONE);
    EXPECT_EQ(KRAL_SetDTR_State(handle, 1), 0) << "it counts as closed";
    handset_.PlugIn();
    EXPECT_EQ(StateOf(handle), KRAL_PORT_GONE) << "nobody has opened it yet";
    EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
    EXPECT_EQ(StateOf(handle), KRAL_PORT_OPEN);
    KRAL_DisconnectServer(handle);
  }
}

// Also where it was unplugged in the moment after a reply, and nobody has looked at the port since.
TEST_F(PortStates, TheFirstRequestOfAPortThatIsBackIsAnswered) {
  ports_.TellLate();
  for (const uint8_t receive_mode : {0, 1}) {
    const KRAL_HANDLE handle = KRAL_ConnectServer(kWatchedPort);
    KRAL_SetReceiveMode(handle, receive_mode);
    for (int time = 0; time < 10; ++time) {
      ASSERT_EQ(KRAL_IsPhoneConnected(handle), 1) << int{receive_mode} << ", " << time;
      handset_.HangUp();
      handset_.PlugIn();
    }
    KRAL_DisconnectServer(handle);
  }
}

TEST_F(PortStates, UnplugEndsEveryWaitAtOnce) {
  static constexpr uint8_t kRequest = 0x26;
  const auto send_sync = [](KRAL_HANDLE handle) {
    std::array<uint8_t, 8> reply{};
    uint16_t size = reply.size();
    return KRAL_SendSync(handle, 1, &kRequest, &size, reply.data(), kTooLong);
  };
  const auto send_raw = [](KRAL_HANDLE handle) {
    std::array<uint8_t, 8> reply{};
    uint16_t size = reply.size();
    return KRAL_SendRAW(handle, 1, &kRequest, &size, reply.data(), kTooLong);
  };
  const auto await_log = [](KRAL_HANDLE handle) {
    std::array<uint8_t, KRAL_LONGEST_PACKET> packet{};
    uint16_t size = 0;
    return KRAL_DIAG_WaitNextPhoneLog(handle, &size, packet.data(), kTooLong);
  };
  const auto await_event = [](KRAL_HANDLE handle) {
    KRAL_EVENT event{};
    return KRAL_DIAG_WaitNextEvent(handle, &event, kTooLong);
  };
  const KRAL_HANDLE handle = KRAL_ConnectServer(kWatchedPort);
  for (const auto request : {+send_sync, +send_raw}) {
    ASSERT_EQ(KRAL_IsPhoneConnected(handle), 1);
    handset_.faults().Add(handset::HangUp(), handset::When::Nth(1));
    const auto start = std::chrono::steady_clock::now();
    auto log = std::async(std::launch::async, await_log, handle);
    auto event = std::async(std::launch::async, await_event, handle);
    EXPECT_EQ(request(handle), 0);
    EXPECT_EQ(log.get(), 0);
    EXPECT_EQ(event.get(), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::milliseconds(kTooLong / 2));
    EXPECT_EQ(StateOf(handle), KRAL_PORT_GONE) << "and not closed by a time-out";
    EXPECT_FALSE(ports_.IsOpen(kWatchedPort));
    handset_.faults().Clear();
    handset_.PlugIn();
  }
}

TEST_F(PortStates, MissingOutputGivesZero) {
  EXPECT_EQ(KRAL_GetPortState(KRAL_ConnectServer(kWatchedPort), nullptr), 0);
}

// --- A port that another protocol has for itself, and how the connection gets it back -------------------------------

TEST(BorrowedPort, IsOpenedByNoRequestUntilItIsGivenBack) {
  test::HandsetPorts ports;
  handset::VirtualHandset& handset = ports.Add(7);
  const KRAL_HANDLE handle = KRAL_ConnectServer(7);
  ASSERT_EQ(KRAL_IsPhoneConnected(handle), 1);
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  CSerialPort* const port = phone->BorrowPort();
  ASSERT_NE(port, nullptr);
  EXPECT_EQ(phone->BorrowPort(), port);
  EXPECT_TRUE(ports.IsOpen(7));
  EXPECT_EQ(StateOf(handle), KRAL_PORT_OPEN);
  const uint64_t requests = handset.request_count();
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 0);
  EXPECT_EQ(handset.request_count(), requests);

  phone->GiveBackPort();
  EXPECT_FALSE(ports.IsOpen(7));
  EXPECT_EQ(StateOf(handle), KRAL_PORT_CLOSED);
  uint32_t serial = 0;
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle, &serial), 1);

  ASSERT_NE(phone->BorrowPort(), nullptr);
  EXPECT_EQ(KRAL_ConnectServer(7), handle) << "a connect takes it back";
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle, &serial), 1);

  ASSERT_NE(phone->BorrowPort(), nullptr);
  KRAL_DisconnectAllServers();
  EXPECT_FALSE(ports.IsOpen(7));
  EXPECT_EQ(phone->BorrowPort(), nullptr);
}

TEST(BorrowedPort, KeepsWhatTheDeviceHasSentAlready) {
  test::HandsetPorts ports;
  handset::VirtualHandset& handset = ports.Add(7);
  const auto phone = Kral_ResourceManager::GetPhone(Kral_ResourceManager::CreateContext(7));
  handset.SendUnframed(handset::FromHex("01 02 03"));
  CSerialPort* const port = phone->BorrowPort();
  ASSERT_NE(port, nullptr);
  std::array<uint8_t, 8> buffer{};
  EXPECT_EQ(port->Receive(buffer.data(), 8), 3u);
}

TEST(BorrowedPort, ThatDoesNotOpenSaysWhy) {
  test::HandsetPorts ports;
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(9);
  EXPECT_EQ(Kral_ResourceManager::GetPhone(handle)->BorrowPort(), nullptr);
  EXPECT_EQ(StateOf(handle), KRAL_PORT_NOT_FOUND);
  const KRAL_HANDLE null_port = KRAL_ConnectServer(KRAL_PORT_NULL);
  EXPECT_EQ(Kral_ResourceManager::GetPhone(null_port)->BorrowPort(), nullptr);
}

}  // namespace
}  // namespace kral
