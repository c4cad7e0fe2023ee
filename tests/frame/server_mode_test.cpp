// Connections through the phone server.
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/connection.h"
#include "kral/text_log.h"
#include "tests/support/phone_log.h"
#include "tests/support/scripted_server.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using Calls = std::vector<std::string>;

class ServerMode : public testing::Test {
 protected:
  // Connected on port 3, with what has been called so far forgotten.
  Diag_FTM& Connected() {
    handle_ = KRAL_ConnectServer(3);
    server_.TakeCalls();
    return *Kral_ResourceManager::GetPhone(handle_);
  }

  bool Send(Diag_FTM& phone, uint8_t code) {
    phone.packet().Reset();
    phone.packet().Append8(code);
    return static_cast<bool>(phone.Send(phone.packet(), 100));
  }

  test::ScriptedServer server_;
  KRAL_HANDLE handle_ = 0;
};

TEST_F(ServerMode, ConnectMakesTheProxyAndRegistersTheSorter) {
  handle_ = KRAL_ConnectServer(3);
  EXPECT_EQ(server_.TakeCalls(), (Calls{"make KRAL", "connect 3 within 200", "connect 3 within 200", "register"}));
  EXPECT_EQ(server_.listener, &Kral_ResourceManager::GetPhone(handle_)->sorter());
  KRAL_ConnectServer(3);
  EXPECT_EQ(server_.TakeCalls(), Calls{}) << "it is connected already";
  KRAL_DisconnectServer(handle_);
  EXPECT_EQ(server_.TakeCalls(), Calls{"unregister"});
  KRAL_DisconnectServer(handle_);
  EXPECT_EQ(server_.TakeCalls(), Calls{"end KRAL"});
}

TEST_F(ServerMode, LivenessGoesThroughTheServer) {
  Connected();
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 0) << "the echo of the version request is one byte long";
  server_.answer = [](auto request) {
    std::vector<uint8_t> reply(request.begin(), request.end());
    if (reply.size() == 1) reply.push_back(0x31);
    return reply;
  };
  server_.TakeCalls();
  EXPECT_EQ(KRAL_IsPhoneConnected(handle_), 1);
  EXPECT_EQ(server_.TakeCalls(), (Calls{"send 7B 00 01 02 03 04 05 06 07 08 09 within 80", "send 00 within 80"}));
}

TEST_F(ServerMode, ConnectWaitsForTimeOutTwoAndIsTriedAgainByTheLivenessCheck) {
  server_.connects = false;
  Connected();
  EXPECT_EQ(server_.listener, nullptr);
  KRAL_ConfigureTimeOut(handle_, 2, 50);
  server_.connects = true;
  KRAL_IsPhoneConnected(handle_);
  const auto calls = server_.TakeCalls();
  ASSERT_GE(calls.size(), 2u);
  EXPECT_EQ(calls[0], "connect 3 within 50");
  EXPECT_EQ(calls[1], "register");
}

TEST_F(ServerMode, FirstReplyByteMustBeTheRequests) {
  auto& phone = Connected();
  test::PhoneLog log(handle_, KRAL_LOG_ERR);
  EXPECT_TRUE(Send(phone, 38));
  EXPECT_EQ(log.Take(), Calls{});
  server_.answer = [](auto) { return std::vector<uint8_t>{39, 1}; };
  EXPECT_FALSE(Send(phone, 38));
  EXPECT_EQ(log.Take(), Calls{"16 SEND SYNC Failed: expected 38 received 39"});
  server_.answer = [](auto) { return std::vector<uint8_t>{19, 38}; };
  EXPECT_FALSE(Send(phone, 38));
  EXPECT_EQ(log.Take(), (Calls{"16 SEND SYNC Failed: expected 38 received 19",
                               "16 ERROR:\tDIAG_BAD_CMD_F (19) received, bad command"}));
}

TEST_F(ServerMode, ReplyIsCutToTheRoom) {
  auto& phone = Connected();
  server_.answer = [](auto) { return std::vector<uint8_t>{38, 1, 2, 3, 4, 5, 6}; };
  std::array<uint8_t, 5> response = {0xCC, 0xCC, 0xCC, 0xCC, 0xCC};
  const Reply reply = phone.SendSync(std::array<uint8_t, 1>{38}, std::span(response).first(4), 38, 100);
  EXPECT_TRUE(reply);
  EXPECT_EQ(reply.bytes().size(), 4u);
  EXPECT_EQ(response, (std::array<uint8_t, 5>{38, 1, 2, 3, 0xCC}));
  server_.answer = [](auto) { return std::vector<uint8_t>(100000, 38); };
  EXPECT_TRUE(Send(phone, 38));
  EXPECT_EQ(phone.packet().response_length(), CDiagPacket::kCapacity);
}

TEST_F(ServerMode, ExceptionsOfTheServerNeverLeaveTheLibrary) {
  server_.on_connect = [] { throw OrbtServerException(); };
  EXPECT_NE(KRAL_ConnectServer(9), 0u) << "the proxy fails to connect: no phone object";
  EXPECT_EQ(KRAL_IsPhoneConnected(KRAL_ConnectServer(9)), 0);
  server_.on_connect = [] {};

  auto& phone = Connected();
  test::PhoneLog log(handle_, KRAL_LOG_ERR);
  server_.answer = [](auto) -> std::vector<uint8_t> { throw OrbtServerException(); };
  EXPECT_FALSE(Send(phone, 38));
  EXPECT_EQ(log.Take().size(), 1u);
}

const std::pair<std::function<void()>, const char*> kUnregisterFailures[] = {
    {[] { throw OrbtServerException(); },
     "16 ORBT server exception caught while removing an event listener in Diag_FTM::ClosePort()."},
    {[] { throw std::runtime_error("unknown"); },
     "16 Unknown exception caught while removing an event listener in Diag_FTM::ClosePort()."},
};

TEST_F(ServerMode, ClosingGoesOnWhenTheListenerCannotBeUnregistered) {
  for (const auto& [failure, line] : kUnregisterFailures) {
    Connected();
    KRAL_ConnectServer(3);
    server_.on_unregister = failure;
    test::PhoneLog log(handle_, KRAL_LOG_ERR);
    KRAL_DisconnectServer(handle_);
    EXPECT_EQ(log.Take(), Calls{line});
    server_.TakeCalls();
    KRAL_DisconnectServer(handle_);
    EXPECT_EQ(server_.TakeCalls(), Calls{"end KRAL"}) << "not unregistered twice";
    server_.on_unregister = [] {};
  }
}

TEST_F(ServerMode, ListenerTakesPacketsOfTheServersThread) {
  auto& phone = Connected();
  server_.listener->OnPacket(std::array<uint8_t, 4>{38, 1, 0, 0});
  EXPECT_EQ(phone.responses().size(), 1u);
}

TEST(ServerModeWithoutServer, ConnectsGiveTheirHandleAndEveryRequestZero) {
  KRAL_SetLibraryMode(1);
  const KRAL_HANDLE handle = KRAL_ConnectServer(3);
  EXPECT_NE(handle, 0u);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 0);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 0), 0);
  EXPECT_EQ(KRAL_ConnectServerWithVerify(4), 0u);
  uint16_t port = 0;
  EXPECT_EQ(KRAL_GetComPortNumber(handle, &port), 1);
  KRAL_DisconnectAllServers();
  KRAL_SetLibraryMode(0);
}

}  // namespace
}  // namespace kral
