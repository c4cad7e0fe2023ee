// Many handsets and many threads at once: nothing is mixed up, nothing waits for what is not its own, and a
// connection may be let go of while somebody uses it.
#include <future>

#include "frame/diag_ftm.h"
#include "frame/export_call.h"
#include "frame/resource_manager.h"
#include "handset/caller_transport.h"
#include "kral/connection.h"
#include "kral/text_log.h"
#include "tests/support/handset_ports.h"
#include "tests/support/test.h"

namespace kral {
namespace {

constexpr uint16_t kFirstPort = 1;
constexpr uint16_t kHandsets = 50;
constexpr int kRounds = 3;
constexpr int32_t kPatientMs = 20000;  // a loaded machine under a sanitizer is no reason to fail
constexpr int32_t kShortMs = 30;

void InParallel(uint16_t count, const std::function<void(uint16_t)>& work) {
  std::vector<std::thread> threads;
  for (uint16_t i = 0; i < count; ++i) threads.emplace_back(work, i);
  for (auto& thread : threads) thread.join();
}

// A request that is answered by the handset of that port only.
bool AnswersAs(KRAL_HANDLE handle, uint8_t code, uint32_t time_out) {
  return ExportCall(handle, "AnswersAs").Unlogged().Run([=](Diag_FTM& phone) {
    phone.packet().Reset();
    phone.packet().Append8(200);
    uint8_t answer = 0;
    return phone.Send(phone.packet(), time_out) && phone.packet().ResponseAt8(1, answer) && answer == code;
  }) == 1;
}

// Connects, asks, times out, asks again and disconnects, over and over.
void UseHandset(handset::VirtualHandset& handset, uint8_t name, const std::function<KRAL_HANDLE()>& connect) {
  for (int round = 0; round < kRounds; ++round) {
    const KRAL_HANDLE handle = connect();
    ASSERT_NE(handle, 0u);
    // A late write has failed, and among so many threads any may be late.
    EXPECT_EQ(KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_PORT_WRITE, kPatientMs), 1);
    EXPECT_TRUE(AnswersAs(handle, name, kPatientMs)) << int{name};
    handset.faults().Add(handset::Ignore(), When::Nth(1));
    EXPECT_FALSE(AnswersAs(handle, name, kShortMs)) << int{name};
    EXPECT_TRUE(AnswersAs(handle, name, kPatientMs)) << int{name} << " after a time-out";
    // From here on the value may be that of another thread's connection: Windows hands mutex handles out again.
    KRAL_DisconnectServer(handle);
  }
}

void AnswerWithName(handset::VirtualHandset& handset, uint8_t name) {
  handset.On(200, handset::Length::Exactly(1), [name](handset::ByteView, handset::Wire& wire) {
    wire.Send(handset::Bytes{200, name});
  });
}

class Parallel : public testing::TestWithParam<ReceiveMode> {
 protected:
  Parallel() { Kral_ResourceManager::SetDefaultReceiveMode(GetParam()); }
  ~Parallel() override {
    KRAL_DisconnectAllServers();
    Kral_ResourceManager::SetDefaultReceiveMode(ReceiveMode::kAsWritten);
  }
  test::HandsetPorts ports_;
};

TEST_P(Parallel, FiftyHandsetsOnPorts) {
  std::vector<handset::VirtualHandset*> handsets;
  for (uint16_t i = 0; i < kHandsets; ++i) {
    handsets.push_back(&ports_.Add(static_cast<uint16_t>(kFirstPort + i)));
    AnswerWithName(*handsets.back(), static_cast<uint8_t>(i));
  }
  InParallel(kHandsets, [&](uint16_t i) {
    UseHandset(*handsets[i], static_cast<uint8_t>(i), [i] { return KRAL_ConnectServer(kFirstPort + i); });
  });
  EXPECT_TRUE(ports_.open().empty());
}

TEST_P(Parallel, FiftyHandsetsThroughFunctionsOfTheCaller) {
  std::vector<std::unique_ptr<handset::VirtualHandset>> handsets;
  std::vector<std::unique_ptr<handset::CallerTransport>> cables;
  for (uint16_t i = 0; i < kHandsets; ++i) {
    handsets.push_back(std::make_unique<handset::VirtualHandset>());
    cables.push_back(std::make_unique<handset::CallerTransport>(*handsets.back()));
    AnswerWithName(*handsets.back(), static_cast<uint8_t>(i));
  }
  InParallel(kHandsets, [&](uint16_t i) {
    UseHandset(*handsets[i], static_cast<uint8_t>(i), [&, i] {
      return KRAL_ConnectServer_UserDefinedTransport(kFirstPort + i, cables[i]->handle_value(), cables[i]->context(),
                                                     handset::CallerTransport::Send, handset::CallerTransport::Receive,
                                                     handset::CallerTransport::Flush);
    });
  });
}

TEST_P(Parallel, RequestsOfManyThreadsOnOneHandleAreAnsweredOneByOne) {
  AnswerWithName(ports_.Add(kFirstPort), 7);
  const KRAL_HANDLE handle = KRAL_ConnectServer(kFirstPort);
  InParallel(8, [&](uint16_t) {
    for (int i = 0; i < 5; ++i) EXPECT_TRUE(AnswersAs(handle, 7, kPatientMs));
  });
}

TEST_P(Parallel, LogAndTimeOutCallsDoNotWaitForARunningRequest) {
  auto& handset = ports_.Add(kFirstPort);
  handset.faults().Add(handset::Ignore(), When::Always());
  const KRAL_HANDLE handle = KRAL_ConnectServer(kFirstPort);
  auto request = std::async(std::launch::async, [=] { return AnswersAs(handle, 7, 1500); });
  ASSERT_TRUE(handset.WaitForRequests(1, kPatientMs));
  EXPECT_EQ(KRAL_ConfigureTimeOut(handle, 8, 500), 1);
  EXPECT_EQ(KRAL_GetTimeOut(handle, 8), 500);
  EXPECT_EQ(KRAL_SetLogFlags(handle, 0xFFFFFFFF), 1);
  EXPECT_EQ(KRAL_StartLogging(handle, ""), 1);
  EXPECT_EQ(KRAL_AddUserMessageToTextLog(handle, 1, "text", 0), 1);
  EXPECT_EQ(KRAL_StopLogging(handle), 1);
  EXPECT_EQ(KRAL_SetReceiveMode(handle, 0), 1);
  EXPECT_EQ(request.wait_for(std::chrono::seconds(0)), std::future_status::timeout) << "the request is still running";
  EXPECT_FALSE(request.get());
}

TEST_P(Parallel, DisconnectDuringARequestLeavesNothingOpen) {
  auto& handset = ports_.Add(kFirstPort);
  AnswerWithName(handset, 7);
  handset.faults().Add(handset::Ignore(), When::Nth(1));
  const KRAL_HANDLE handle = KRAL_ConnectServer(kFirstPort);
  std::thread running([=] { EXPECT_FALSE(AnswersAs(handle, 7, 100)); });
  ASSERT_TRUE(handset.WaitForRequests(1, kPatientMs));
  // Waits behind the running request, and may then find the handset still connected or gone.
  std::thread waiting([=] { AnswersAs(handle, 7, kPatientMs); });
  KRAL_DisconnectServer(handle);
  running.join();
  waiting.join();
  EXPECT_FALSE(ports_.IsOpen(kFirstPort));
  const KRAL_HANDLE again = KRAL_ConnectServer(kFirstPort);
  EXPECT_TRUE(AnswersAs(again, 7, kPatientMs));
}

std::string ModeName(const testing::TestParamInfo<ReceiveMode>& mode) {
  return mode.param == ReceiveMode::kAsWritten ? "AsWritten" : "WakeOnData";
}

INSTANTIATE_TEST_SUITE_P(ReceiveModes, Parallel, testing::Values(ReceiveMode::kAsWritten, ReceiveMode::kWakeOnData),
                         ModeName);

}  // namespace
}  // namespace kral
