// Connecting, the liveness check, reopening, and what each way of connecting promises.
#include <future>
#include <system_error>

#include "base/thread_maker.h"
#include "frame/connect.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "handset/caller_transport.h"
#include "kral/connection.h"
#include "kral/diag.h"
#include "kral/text_log.h"
#include "kral/transport.h"
#include "tests/support/fake_clock.h"
#include "tests/support/handset_ports.h"
#include "tests/support/phone_log.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using Ports = std::vector<uint16_t>;

constexpr uint16_t kPort = 12;
constexpr uint16_t kNoHandset = 13;

class Connection : public testing::Test {
 protected:
  ~Connection() override {
    KRAL_DisconnectAllServers();
    KRAL_SetTargetType(0);
    SetThreadMaker({});
  }

  KRAL_HANDLE ConnectThroughCable() {
    return KRAL_ConnectServer_UserDefinedTransport(200, cable_.handle_value(), cable_.context(),
                                                   handset::CallerTransport::Send, handset::CallerTransport::Receive,
                                                   handset::CallerTransport::Flush);
  }

  // Whether the row of the port lives on after one release.
  static bool IsSharedRow(KRAL_HANDLE handle) {
    KRAL_DisconnectServer(handle);
    uint16_t port = 0;
    return KRAL_GetComPortNumber(handle, &port) == 1;
  }

  test::HandsetPorts ports_;
  handset::VirtualHandset& handset_ = ports_.Add(kPort);
  handset::CallerTransport cable_{handset_};
};

TEST_F(Connection, ConnectGivesItsHandleWhetherOrNotThePortOpened) {
  const KRAL_HANDLE present = KRAL_ConnectServer(kPort);
  const KRAL_HANDLE absent = KRAL_ConnectServer(kNoHandset);
  EXPECT_NE(absent, 0u);
  EXPECT_EQ(KRAL_IsPhoneConnected(present), 1);
  EXPECT_EQ(KRAL_IsPhoneConnected(absent), 0);
  ports_.Add(kNoHandset);
  EXPECT_EQ(KRAL_IsPhoneConnected(absent), 1) << "found by the liveness check";
  const KRAL_HANDLE out_of_range = KRAL_ConnectServer(256);
  EXPECT_NE(out_of_range, 0u);
  EXPECT_EQ(KRAL_IsPhoneConnected(out_of_range), 0);
  EXPECT_EQ(KRAL_ConnectServer(0xABCD0000u + kPort), present) << "the low 16 bits count";
}

TEST_F(Connection, ThreadsThatStartLateCostNothing) {
  std::promise<void> gate;
  SetThreadMaker([opened = gate.get_future().share()](std::function<void()> body) {
    return std::thread([opened, body = std::move(body)] {
      opened.wait();
      body();
    });
  });
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  gate.set_value();
  EXPECT_EQ(KRAL_GetTimeOut(handle, 0), 4000);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
}

TEST_F(Connection, WithoutADispatcherThreadConnectsFailAndSaySo) {
  SetThreadMaker([](std::function<void()>) -> std::thread {
    throw std::system_error(std::make_error_code(std::errc::resource_unavailable_try_again));
  });
  EXPECT_EQ(KRAL_ConnectServerWithVerify(kPort), 0u);
  EXPECT_EQ(ports_.opens().size(), 0u);
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 0), 4000);
  test::PhoneLog log(handle);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 0);
  EXPECT_TRUE(log.Has("16 Error. No thread for the dispatcher of port 12."));
  SetThreadMaker({});
  KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_LIVENESS, kAnswerInTimeMs);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1) << "as soon as there are threads again";
}

TEST_F(Connection, VerifyGivesZeroAndKeepsTheContextWhenThePortDoesNotOpen) {
  EXPECT_EQ(KRAL_ConnectServerWithVerify(kNoHandset), 0u);
  EXPECT_TRUE(IsSharedRow(KRAL_ConnectServer(kNoHandset))) << "the failed connect still counts";
  const KRAL_HANDLE handle = KRAL_ConnectServerWithVerify(kPort);
  EXPECT_NE(handle, 0u);
  EXPECT_FALSE(IsSharedRow(handle));
}

TEST_F(Connection, WaitOfZeroMakesOneAttempt) {
  EXPECT_EQ(KRAL_ConnectServerWithWait(kNoHandset, 0), 0u);
  EXPECT_GT(ports_.opens().size(), 0u);
  EXPECT_FALSE(IsSharedRow(KRAL_ConnectServer(kNoHandset))) << "its only connect was released";
}

TEST_F(Connection, EachAttemptOfAWaitCounts) {
  test::FakeClock clock;
  Kral_ResourceManager::SetDeviceOpener([&](int, DeviceResult& result) {
    clock.Advance(10);
    result.error = DeviceError::kNoSuchPort;
    return std::unique_ptr<SerialDevice>();
  });
  EXPECT_EQ(ConnectWithWait(kNoHandset, 35, clock), 0u);
  EXPECT_TRUE(IsSharedRow(KRAL_ConnectServer(kNoHandset))) << "one release for several attempts";
}

TEST_F(Connection, WaitEndsThoughTheTickCountWrapsInItsLastAttempt) {
  test::FakeClock clock(0xFFFFFF00);
  int attempts = 0;
  Kral_ResourceManager::SetDeviceOpener([&](int, DeviceResult& result) {
    clock.Advance(++attempts < 1000 ? 250 : 0xFFFFFFD0 - clock.TickMs());  // an end for what would have none
    result.error = DeviceError::kNoSuchPort;
    return std::unique_ptr<SerialDevice>();
  });
  EXPECT_EQ(ConnectWithWait(kNoHandset, 200, clock), 0u);
  EXPECT_LT(attempts, 10);
}

TEST_F(Connection, WaitEndsWithTheFirstAnswer) {
  handset_.faults().Add(handset::Ignore(), When::Nth(1));  // the first attempt gets no answer
  const KRAL_HANDLE handle = KRAL_ConnectServerWithWait(kPort, 5000);
  EXPECT_NE(handle, 0u);
  EXPECT_TRUE(IsSharedRow(handle));
  EXPECT_EQ(handset_.request_count(), 3u) << "loopback; loopback and version";
}

TEST_F(Connection, NullPortCountsAsConnectedAndEveryRequestFails) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(KRAL_PORT_NULL);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
  auto& phone = *Kral_ResourceManager::GetPhone(handle);
  phone.packet().Reset();
  phone.packet().Append8(0);
  test::PhoneLog log(handle);
  EXPECT_FALSE(phone.Send(phone.packet()));
  EXPECT_EQ(log.Count("16 Send Sync skipped for NULL port"), 1u);
  const uint8_t request = 0;
  uint16_t size = 0;
  EXPECT_EQ(KRAL_SendASync(handle, 1, &request, 10, 0), 0);
  EXPECT_EQ(KRAL_SendRAW(handle, 1, &request, &size, nullptr, 10), 0);
  EXPECT_TRUE(ports_.opens().empty());
}

// --- Liveness -------------------------------------------------------------------------------------------------------

struct Liveness {
  const char* name;
  const char* loopback;  // the reply; null: silence
  const char* version;
  uint8_t connected;
};

const Liveness kLiveness[] = {
    {"a whole loopback", "7B 00 01 02 03 04 05 06 07 08 09", "00 31", 1},
    {"only the third byte counts", "7B FF 01 FF FF FF FF FF FF FF FF", "00 31", 1},
    {"the third byte differs", "7B 00 02 02 03 04 05 06 07 08 09", nullptr, 0},
    {"a byte short", "7B 00 01 02 03 04 05 06 07 08", nullptr, 0},
    {"a byte long", "7B 00 01 02 03 04 05 06 07 08 09 0A", nullptr, 0},
    {"refused", "13 7B 00 01 02 03 04 05 06 07 08 09", nullptr, 0},
    {"silence", nullptr, nullptr, 0},
    {"a version of one byte", "7B 00 01 02 03 04 05 06 07 08 09", "00", 0},
    {"version refused", "7B 00 01 02 03 04 05 06 07 08 09", "13 00", 0},
};

TEST_F(Connection, LivenessAsksForLoopbackAndVersion) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  for (const auto& row : kLiveness) {
    SCOPED_TRACE(row.name);
    auto loopback = handset_.Expect("7B 00 01 02 03 04 05 06 07 08 09");
    if (row.loopback != nullptr) loopback.Reply(row.loopback);
    if (row.version != nullptr) handset_.Expect("00").Reply(row.version);
    EXPECT_EQ(KRAL_IsPhoneConnected(handle), row.connected);
    EXPECT_TRUE(handset_.ScriptConsumed());
    EXPECT_EQ(handset_.script().Problems(), "");
  }
}

TEST_F(Connection, LivenessTellsWhatItAsks) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  const test::PhoneLog log(handle, KRAL_LOG_RET | KRAL_LOG_C_HIGH_LEVEL_START);
  KRAL_IsPhoneConnected(handle);
  EXPECT_TRUE(log.Has("512 KRAL_IsPhoneConnected"));
  EXPECT_TRUE(log.Has("4 KRAL_IsPhoneConnected() -- pinging phone with loopback command, 0x7B"));
  EXPECT_TRUE(log.Has("4 KRAL_IsPhoneConnected() -- pinging phone with version command, 0x0"));
}

const std::pair<const char*, uint8_t> kServiceReplies[] = {
    {"4B 32 03 00 01", 1},
    {"4B 32 03 00", 0},  // not longer than the echo
    {"4B 32 04 00 01", 0},
    {"13 4B 32 03 00", 0},
};

TEST_F(Connection, ApplicationTargetAsksForTheDiagnosticService) {
  KRAL_SetTargetType(1);
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_LIVENESS, kAnswerInTimeMs);
  const test::PhoneLog log(handle, KRAL_LOG_IO);
  for (const auto& [reply, connected] : kServiceReplies) {
    handset_.Expect("4B 32 03 00 00 00 00 00 00 00 00 00").Reply(reply);
    EXPECT_EQ(KRAL_IsPhoneConnected(handle), connected) << reply;
    EXPECT_TRUE(handset_.ScriptConsumed());
  }
  EXPECT_TRUE(log.Has("1 Diag_FTM::IsDiagServiceAlive() -- pinging phone with version command, 0x4B 0x32 0x3 0x0"));
}

// --- Requests -------------------------------------------------------------------------------------------------------

const std::pair<const char*, const char*> kRefusals[] = {
    {"13 26", "16 ERROR:\tDIAG_BAD_CMD_F (19) received, bad command"},
    {"14 26", "16 ERROR:\tDIAG_BAD_PARM_F (20) received, bad parameter"},
    {"15 26", "16 ERROR:\tDIAG_BAD_LEN_F (21) received, bad request length"},
    {"18 26", "16 ERROR:\tDIAG_BAD_MODE_F (24) received, command is invalid for the current mode"},
};

TEST_F(Connection, RefusalsAreNamedAndNothingElseIs) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  auto& phone = *Kral_ResourceManager::GetPhone(handle);
  test::PhoneLog log(handle, KRAL_LOG_ERR);
  const auto send = [&](uint8_t code, uint32_t time_out) {
    phone.packet().Reset();
    phone.packet().Append8(code);
    return static_cast<bool>(phone.Send(phone.packet(), time_out));
  };
  for (const auto& [reply, line] : kRefusals) {
    handset_.Expect("26").Reply(reply);
    EXPECT_FALSE(send(0x26, 1000));
    EXPECT_EQ(log.Count(line), 1u) << line;
  }
  log.Take();
  handset_.Expect("13").Reply("13");  // a request of that code: an answer, no refusal
  EXPECT_TRUE(send(0x13, 1000));
  const auto requests = handset_.request_count();
  phone.packet().Reset();
  EXPECT_FALSE(phone.Send(phone.packet())) << "an empty one";
  EXPECT_EQ(handset_.request_count(), requests);
  EXPECT_EQ(log.Take(), test::PhoneLog::Lines{});
  // The caller's buffer may hold anything: a time-out is not taken for a refusal.
  handset_.Expect("26");
  std::array<uint8_t, 4> response = {19, 19, 19, 19};
  EXPECT_EQ(phone.SendSync(std::array<uint8_t, 1>{0x26}, response, 0x26, 20).kind(), ReplyKind::kNone);
  EXPECT_EQ(log.Count(kRefusals[0].second), 0u);
  // And where it happens to hold the same refusal as the reply, the reply is one all the same.
  for (int i = 0; i < 3; ++i) {
    handset_.Expect("26").Reply("13 26 00 00");
    EXPECT_EQ(phone.SendSync(std::array<uint8_t, 1>{0x26}, response, 0x26, 1000).refusal(), refusal::kCommand);
  }
  EXPECT_EQ(log.Count(kRefusals[0].second), 3u);
}

TEST_F(Connection, PortClosedByATimeOutIsReopenedByTheNextRequest) {
  handset_.faults().Add(handset::Ignore(), When::Always());
  const KRAL_HANDLE handle = KRAL_ConnectServerWithHandShake(kPort);
  EXPECT_EQ(KRAL_SetDTR_State(handle, 1), 1);
  EXPECT_EQ(KRAL_SetRTS_State(handle, 0), 1);
  KRAL_ConfigureTimeOut(handle, 1, 20);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 0);
  int32_t state = -1;
  EXPECT_EQ(KRAL_GetPortState(handle, &state), 1);
  EXPECT_EQ(state, KRAL_PORT_CLOSED);
  EXPECT_EQ(KRAL_SetDTR_State(handle, 1), 0) << "the lines do not reopen it";
  EXPECT_EQ(KRAL_SetRTS_State(handle, 1), 0);
  EXPECT_EQ(KRAL_FlushRxBuffer(handle), 0);
  EXPECT_FALSE(ports_.IsOpen(kPort));
  handset_.faults().Clear();
  KRAL_ConfigureTimeOut(handle, 1, 1000);
  const size_t before = handset_.received().size();
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1);
  EXPECT_EQ(ports_.opens(), (Ports{kPort, kPort}));
  EXPECT_EQ(handset_.received().size() - before, 14u + 4)
      << "loopback and version: the answers to another handshake would be taken for theirs";
}

TEST_F(Connection, DisconnectOfASharedRowClosesThePortAndTheNextRequestReopensIt) {
  const KRAL_HANDLE com = KRAL_ConnectServer(kPort);
  KRAL_ConnectServer(kPort);
  KRAL_DisconnectServer(com);
  EXPECT_FALSE(ports_.IsOpen(kPort));
  uint32_t serial = 0;
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(com, &serial), 1);
  EXPECT_TRUE(ports_.IsOpen(kPort));
  KRAL_DisconnectServer(com);

  const KRAL_HANDLE callers = ConnectThroughCable();
  EXPECT_EQ(ConnectThroughCable(), callers);
  KRAL_DisconnectServer(callers);
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(callers, &serial), 1) << "with the same functions";
  EXPECT_EQ(ports_.opens(), (Ports{kPort, kPort, kPort}));
}

TEST_F(Connection, CallersTransportForcesDirectModeAndTurnsTheSearchOff) {
  KRAL_SetLibraryMode(1);
  const KRAL_HANDLE handle = ConnectThroughCable();
  EXPECT_FALSE(Kral_ResourceManager::server_mode());
  KRAL_SetLibraryMode(1);
  EXPECT_EQ(KRAL_IsPhoneConnected(handle), 1) << "open connections keep their mode";
  KRAL_SetLibraryMode(0);
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  EXPECT_FALSE(phone->data_to_diagnostic_search());
  EXPECT_EQ(KRAL_SetData2DiagSearch(handle, 1), 1);
  EXPECT_TRUE(phone->data_to_diagnostic_search());
}

TEST_F(Connection, OpenAndCloseAreTold) {
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  KRAL_ConnectServer(kPort);
  const test::PhoneLog log(handle, KRAL_LOG_FN);
  KRAL_ConnectServer(kPort);
  EXPECT_EQ(log.Count("2 VARN Internal: OpenPort()"), 1u);
  KRAL_DisconnectServer(handle);
  EXPECT_EQ(log.Count("2 VARN Internal: ClosePort()"), 1u);
  KRAL_DisconnectServer(handle);
  EXPECT_EQ(log.Count("2 VARN Internal: ClosePort()"), 1u) << "it was closed already";
}

}  // namespace
}  // namespace kral
