// A port that another protocol has for itself, and how the connection gets it back.
#include <gtest/gtest.h>

#include <array>

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "tests/support/handset_ports.h"

namespace kral {
namespace {

int32_t StateOf(KRAL_HANDLE handle) {
  int32_t state = -1;
  EXPECT_EQ(KRAL_GetPortState(handle, &state), 1);
  return state;
}

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
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);

  ASSERT_NE(phone->BorrowPort(), nullptr);
  EXPECT_EQ(KRAL_ConnectServer(7), handle) << "a connect takes it back";
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);

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
