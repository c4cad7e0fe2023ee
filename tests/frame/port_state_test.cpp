// What a caller is told of a port that is not open.
#include <gtest/gtest.h>

#include <utility>

#include "frame/resource_manager.h"
#include "kral/connection.h"
#include "tests/support/handset_connection.h"
#include "tests/support/handset_ports.h"

namespace kral {
namespace {

constexpr uint16_t kPort = 12;

int32_t StateOf(KRAL_HANDLE handle) {
  int32_t state = -1;
  EXPECT_EQ(KRAL_GetPortState(handle, &state), 1);
  return state;
}

class PortStates : public testing::Test {
 protected:
  ~PortStates() override { KRAL_DisconnectAllServers(); }

  test::HandsetPorts ports_;
  handset::VirtualHandset& handset_ = ports_.Add(kPort);
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
    const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
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

TEST_F(PortStates, MissingOutputGivesZero) {
  EXPECT_EQ(KRAL_GetPortState(KRAL_ConnectServer(kPort), nullptr), 0);
}

}  // namespace
}  // namespace kral
