// Who answers on a port, and that asking changes nothing for whoever is connected to it.
#include "kral/kral.h"
#include "tests/support/handset_ports.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::VirtualHandset;

class PortQuestion : public testing::Test {
 protected:
  KRAL_PORT_INFO Ask(uint16_t port) {
    KRAL_PORT_INFO info{};
    info.answers = 99;
    EXPECT_EQ(KRAL_GetPortInfo(port, 1, &info), 1) << port;
    return info;
  }
  test::HandsetPorts ports_;
};

TEST_F(PortQuestion, EachOfThoseThatAnswerIsTold) {
  VirtualHandset& in_loader = ports_.Add(102);
  in_loader.EnterMode({std::shared_ptr<void>(), &in_loader.loader()});
  VirtualHandset& in_programmer = ports_.Add(103);
  in_programmer.EnterMode(in_programmer.programmer_mode());
  VirtualHandset& in_boot_loader = ports_.Add(104);
  in_boot_loader.SetStartMode(in_boot_loader.boot_loader());
  in_boot_loader.Restart();
  ports_.Add(105).faults().Add(handset::Ignore(), handset::When::Always());
  ports_.Add(106).faults().Add(handset::Delay(150), handset::When::Always());  // later than one check waits
  ports_.Add(101);
  ports_.AddDead(107);
  ports_.Add(108);
  ports_.Occupy(108);
  const struct {
    uint16_t port;
    uint32_t state, answers;
  } kRows[] = {
      {101, KRAL_PORT_CLOSED, KRAL_ANSWERS_DIAGNOSTICS},      {102, KRAL_PORT_CLOSED, KRAL_ANSWERS_LOADER},
      {103, KRAL_PORT_CLOSED, KRAL_ANSWERS_FLASH_PROGRAMMER}, {104, KRAL_PORT_CLOSED, KRAL_ANSWERS_BOOT_LOADER},
      {105, KRAL_PORT_CLOSED, KRAL_ANSWERS_NOTHING},          {106, KRAL_PORT_CLOSED, KRAL_ANSWERS_DIAGNOSTICS},
      {107, KRAL_PORT_NOT_FOUND, KRAL_ANSWERS_NOT_ASKED},     {108, KRAL_PORT_BUSY, KRAL_ANSWERS_NOT_ASKED}};
  for (const auto& row : kRows) {
    const KRAL_PORT_INFO info = Ask(row.port);
    EXPECT_EQ(info.state, row.state) << row.port;
    EXPECT_EQ(info.answers, row.answers) << row.port;
  }
  EXPECT_EQ(ports_.open(), std::set<uint16_t>{108}) << "the other program's";
}

TEST_F(PortQuestion, AConnectionStaysAsItWas) {
  ports_.Add(101);
  const KRAL_HANDLE handle = KRAL_ConnectServer(101);
  KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_LIVENESS, 123);
  const KRAL_PORT_INFO info = Ask(101);
  EXPECT_EQ(info.state, uint32_t{KRAL_PORT_OPEN});
  EXPECT_EQ(info.answers, uint32_t{KRAL_ANSWERS_DIAGNOSTICS});
  EXPECT_TRUE(ports_.IsOpen(101));
  EXPECT_EQ(KRAL_GetTimeOut(handle, KRAL_TIME_OUT_LIVENESS), 123);
  EXPECT_EQ(ports_.opens(), std::vector<uint16_t>{101});
  KRAL_DisconnectServer(handle);
  EXPECT_FALSE(ports_.IsOpen(101)) << "one connect, one release";
}

TEST_F(PortQuestion, WithoutTheQuestionNothingIsOpened) {
  ports_.Add(101);
  KRAL_PORT_INFO info{};
  EXPECT_EQ(KRAL_GetPortInfo(101, 0, &info), 1);
  EXPECT_EQ(info.answers, uint32_t{KRAL_ANSWERS_NOT_ASKED});
  EXPECT_TRUE(ports_.opens().empty());
  EXPECT_EQ(KRAL_GetPortInfo(101, 0, nullptr), 0);
  for (const uint32_t port : {KRAL_PORT_NULL, KRAL_PORT_ANY}) {
    EXPECT_EQ(KRAL_GetPortInfo(static_cast<uint16_t>(port), 1, &info), 0) << port;
  }
}

}  // namespace
}  // namespace kral
