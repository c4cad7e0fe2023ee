// Collection through the exported functions: queues, counters, callbacks, capture and playback, and a flood.
#include "handset/log_generator.h"
#include "kral/diag.h"
#include "kral/log.h"
#include "kral/transport.h"
#include "platform/environment.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/handset_connection.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::LogGenerator;
using std::chrono::steady_clock;

KRAL_TRAFFIC_COUNTERS CountersOf(KRAL_HANDLE handle) {
  KRAL_TRAFFIC_COUNTERS counters{};
  EXPECT_EQ(KRAL_GetTrafficCounters(handle, &counters), 1);
  return counters;
}

// The next packet without its FCS; empty when none came.
handset::Bytes NextLog(KRAL_HANDLE handle, uint32_t time_out_ms = 0) {
  std::array<uint8_t, KRAL_LONGEST_PACKET> buffer{};
  uint16_t size = 0;
  const uint8_t taken = time_out_ms == 0 ? KRAL_DIAG_GetNextPhoneLog(handle, &size, buffer.data())
                                         : KRAL_DIAG_WaitNextPhoneLog(handle, &size, buffer.data(), time_out_ms);
  if (taken == 0 || size < 2) return {};
  return {buffer.begin(), buffer.begin() + size - 2};
}

class Collection : public HandsetTest {
 protected:
  void Send(size_t count, uint64_t first = 0) {
    for (size_t i = 0; i < count; ++i) handset().SendPacket(LogGenerator::MakeLog(0x1001, first + i, 20));
  }
  void SendAllForms(size_t events) {
    handset::ByteWriter writer;
    for (size_t i = 0; i < events; ++i) {
      LogGenerator::AddEvent(writer, static_cast<uint16_t>(100 + i), static_cast<unsigned>(i), i);
    }
    handset().SendPacket(LogGenerator::MakeReport(writer.Take()));
  }
  bool AwaitPackets(uint64_t count) {
    return Eventually([&] { return CountersOf(handle()).packets_received >= count; }) && Settle();
  }
  // A request that is answered: what came before it has been sorted.
  bool Settle() {
    uint16_t switches = 0;
    return KRAL_DIAG_GET_DIPSW_F(handle(), &switches) == 1;
  }

  test::TempFolder folder_;
};

TEST_F(Collection, WhatComesWhileItIsOffIsDroppedAndCounted) {
  Send(3);
  ASSERT_TRUE(AwaitPackets(3));
  uint32_t waiting = 7;
  EXPECT_EQ(KRAL_DIAG_GetPhoneLogQueueSize(handle(), &waiting), 0);
  EXPECT_EQ(waiting, 0u);
  EXPECT_TRUE(NextLog(handle()).empty());
  EXPECT_EQ(CountersOf(handle()).dropped_off, 3u);

  KRAL_StartLogging(handle(), folder_.Path("log").c_str());
  EXPECT_EQ(KRAL_DIAG_SetPhoneLoggingState(handle(), 1), 1);
  EXPECT_TRUE(HasLine(512, "KRAL_DIAG_SetPhoneLoggingState(bEnableLogging=1)"));
  Send(2, 10);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).collected == 2; }));
  EXPECT_EQ(KRAL_DIAG_GetPhoneLogQueueSize(handle(), &waiting), 1);
  EXPECT_EQ(waiting, 2u);
  std::array<uint8_t, KRAL_LONGEST_PACKET> buffer{};
  uint16_t size = 0;
  ASSERT_EQ(KRAL_DIAG_GetNextPhoneLog(handle(), &size, buffer.data()), 1);
  const handset::Bytes sent = LogGenerator::MakeLog(0x1001, 10, 20);
  const uint16_t check = handset::FrameCheck(sent);
  ASSERT_EQ(size, 22);
  EXPECT_EQ(handset::Bytes(buffer.begin(), buffer.begin() + 20), sent);
  EXPECT_EQ(buffer[20] | buffer[21] << 8, check) << "the two FCS bytes of its frame";
  EXPECT_EQ(KRAL_DIAG_ClearPhoneLogQueue(handle()), 1);
  EXPECT_EQ(KRAL_DIAG_SetPhoneLoggingState(handle(), 2), 1) << "every other value: off";
  Send(1);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).dropped_off == 4; }));
}

TEST_F(Collection, EventsArriveOneByOneTextAndAll) {
  ASSERT_EQ(KRAL_LoadNameTable(handle(), KRAL_TABLE_EVENT_TEXTS, folder_.Add("t", "103 Handover").c_str()), 1);
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  SendAllForms(8);
  KRAL_EVENT event{};
  for (uint16_t i = 0; i < 8; ++i) {
    ASSERT_EQ(KRAL_DIAG_WaitNextEvent(handle(), &event, 5000), 1);
    EXPECT_EQ(event.event_id[0] | event.event_id[1] << 8, 100 + i);
    EXPECT_EQ(event.time_stamp_length, i < 4 ? 8 : 2);
    EXPECT_EQ(event.payload_length, i % 4 == 3 ? i : 0);
    EXPECT_EQ(event.payload[0], i % 4 == 0 ? 0 : i);
  }
  EXPECT_EQ(KRAL_DIAG_GetNextEvent(handle(), &event), 0);
  EXPECT_TRUE(HasLine(4, "KRAL_DIAG_WaitNextEvent() : event 107 removed from queue"));
  EXPECT_TRUE(HasLine(8, "Event ID: 103, Handover"));
  EXPECT_TRUE(HasLine(8, "Event ID: 104, no text"));
  EXPECT_EQ(NextLog(handle(), 5000).front(), 96) << "the report itself is in the log queue";
  SendAllForms(2);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).events == 10; }));
  EXPECT_EQ(KRAL_DIAG_GetNextEvent(handle(), &event), 1);
  EXPECT_TRUE(HasLine(4, "KRAL_DIAG_GetNextEvent() : event 100 removed from queue"));
  EXPECT_EQ(KRAL_DIAG_ClearEventQueue(handle()), 1);
  EXPECT_EQ(KRAL_DIAG_GetNextEvent(handle(), &event), 0);
}

TEST_F(Collection, CallbacksSeeCollectedTrafficOnly) {
  struct Seen {
    std::atomic<int> packets{0}, events{0};
  } seen;
  const auto value = reinterpret_cast<uintptr_t>(&seen);
  EXPECT_EQ(KRAL_ConfigureCollectionCallBacks(
                handle(),
                [](uint32_t length, const uint8_t* bytes, uintptr_t v) {
                  reinterpret_cast<Seen*>(v)->packets += length > 2 && bytes[0] == 96 ? 1 : 100;
                },
                [](const KRAL_EVENT* event, uintptr_t v) {
                  reinterpret_cast<Seen*>(v)->events += event->event_id[0] >= 100 ? 1 : 100;
                },
                value),
            1);
  Send(1);
  ASSERT_TRUE(AwaitPackets(1));
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  SendAllForms(5);
  EXPECT_TRUE(Eventually([&] { return seen.packets == 1 && seen.events == 5; }));
  EXPECT_EQ(KRAL_ConfigureCollectionCallBacks(handle(), nullptr, nullptr, 0), 1);
  SendAllForms(1);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).events == 6; }));
  EXPECT_EQ(seen.events, 5);
}

TEST_F(Collection, WaitEndsWithAPacketWithItsTimeAndWithTheHandle) {
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  EXPECT_TRUE(NextLog(handle(), 1).empty());
  std::thread sender([&] {
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
    Send(1);
  });
  EXPECT_FALSE(NextLog(handle(), 60000).empty());
  sender.join();
  const auto begin = steady_clock::now();
  std::thread reader([waiting_on = handle()] { NextLog(waiting_on, 60000); });
  std::this_thread::sleep_for(std::chrono::milliseconds(5));
  Disconnect();
  reader.join();
  EXPECT_LT(steady_clock::now() - begin, std::chrono::seconds(30));
}

TEST_F(Collection, MissingArgumentsGiveZero) {
  uint8_t buffer[KRAL_LONGEST_PACKET];
  uint16_t size = 1;
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  Send(1);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).collected == 1; }));
  EXPECT_EQ(KRAL_DIAG_GetNextPhoneLog(handle(), nullptr, buffer), 0);
  EXPECT_EQ(KRAL_DIAG_GetNextPhoneLog(handle(), &size, nullptr), 0);
  EXPECT_FALSE(NextLog(handle()).empty()) << "nothing was taken";
  EXPECT_EQ(KRAL_GetTrafficCounters(handle(), nullptr), 0);
  EXPECT_EQ(KRAL_StartCapture(handle(), nullptr), 0);
  EXPECT_EQ(KRAL_StopCapture(handle()), 0) << "none runs";
  EXPECT_EQ(KRAL_StartPlayback(handle(), nullptr, 0), 0);
  EXPECT_EQ(KRAL_StartPlayback(handle(), folder_.Add("f", "").c_str(), 4), 0) << "no such pace";
}

// --- Capture and playback -------------------------------------------------------------------------------------------

TEST_F(Collection, CapturedTrafficPlaysBackAsItCame) {
  const std::string file = folder_.Path("capture");
  EXPECT_EQ(KRAL_StartCapture(handle(), folder_.Path("no/such/folder").c_str()), 0);
  Send(1, 500);
  ASSERT_TRUE(AwaitPackets(1));
  ASSERT_EQ(KRAL_StartCapture(handle(), file.c_str()), 1);
  EXPECT_EQ(KRAL_StartCapture(handle(), file.c_str()), 0) << "one at a time";
  EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1001), 1);
  EXPECT_EQ(KRAL_DIAG_SetEntireEventMaskState(handle(), 1), 1);
  EXPECT_EQ(KRAL_ExtendedTextMessage_SetCategoryEnable(handle(), 5, 1), 1);
  // More than the queues hold, so that a playback that did not wait for its reader would lose some.
  LogGenerator generator(handset(), {.logs = 1000, .reports = 1000, .messages = 1000, .burst = 3, .log_size = 100});
  for (int i = 0; i < 5; ++i) generator.Advance(1000);
  const auto sent = generator.sent();
  ASSERT_GE(sent.packets(), 14900u);
  std::vector<handset::Bytes> live;
  while (live.size() < sent.packets()) {
    live.push_back(NextLog(handle(), 5000));
    ASSERT_FALSE(live.back().empty()) << live.size() << " of " << sent.packets() << ", dropped "
                                      << CountersOf(handle()).dropped_logs;
    if (CountersOf(handle()).dropped_logs != 0) break;
  }
  const auto counters = CountersOf(handle());
  EXPECT_EQ(counters.dropped_off, 1u) << "what came before the collection is not in the file";
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).collected == sent.packets(); }));
  EXPECT_TRUE(Eventually([&] { return KRAL_StopCapture(handle()) == 1; })) << "as long as the disk needs";
  EXPECT_EQ(CountersOf(handle()).captured, sent.packets());
  EXPECT_EQ(CountersOf(handle()).events, sent.events);

  // An analysis needs no handset: port 65534 has nothing behind it.
  const KRAL_HANDLE offline = KRAL_ConnectServer(65534);
  ASSERT_EQ(KRAL_StartPlayback(offline, file.c_str(), KRAL_PLAY_FOR_LOG_READER), 1);
  std::vector<handset::Bytes> played;
  while (played.size() < sent.packets()) {
    played.push_back(NextLog(offline, 5000));
    ASSERT_FALSE(played.back().empty()) << played.size();
  }
  EXPECT_EQ(CountersOf(offline).dropped_logs, 0u);
  if (counters.dropped_logs == 0) {
    EXPECT_EQ(played, live);
  }
  int32_t state = 0;
  uint64_t packets = 0;
  EXPECT_TRUE(Eventually(
      [&] { return KRAL_GetPlaybackState(offline, &state, &packets, nullptr) == 1 && state == KRAL_PLAYBACK_DONE; }));
  EXPECT_EQ(packets, sent.packets());
  EXPECT_EQ(CountersOf(offline).packets_received, sent.packets()) << "played ones count as received";

  KRAL_DIAG_ClearEventQueue(offline);
  ASSERT_EQ(KRAL_StartPlayback(offline, file.c_str(), KRAL_PLAY_FOR_EVENT_READER), 1);
  const uint64_t dropped_before = CountersOf(offline).dropped_events;
  KRAL_EVENT event{};
  for (uint64_t i = 0; i < sent.events; ++i) ASSERT_EQ(KRAL_DIAG_WaitNextEvent(offline, &event, 5000), 1) << i;
  EXPECT_EQ(CountersOf(offline).dropped_events, dropped_before);
  KRAL_DisconnectServer(offline);
}

TEST_F(Collection, CaptureEndsInFrontOfWhatACallbackHoldsUpAndSaysSo) {
  static std::atomic<bool> hold;
  hold = true;
  const auto held_up = [](uint32_t, const uint8_t*, uintptr_t) {
    while (hold) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  };
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  KRAL_ConfigureCollectionCallBacks(handle(), held_up, nullptr, 0);
  ASSERT_EQ(KRAL_StartCapture(handle(), folder_.Path("capture").c_str()), 1);
  Send(3);
  ASSERT_TRUE(Eventually([&] { return CountersOf(handle()).waiting == 3; }));
  EXPECT_EQ(KRAL_StopCapture(handle()), 1) << "nothing that was collected is missing";
  EXPECT_TRUE(HasLine(16, "Capture file: it ends in front of 3 packets that still wait for callbacks"));
  hold = false;
  EXPECT_TRUE(Eventually([&] { return CountersOf(handle()).waiting == 0; }));
  EXPECT_EQ(CountersOf(handle()).most_waiting, 3u);
  EXPECT_EQ(CountersOf(handle()).collected, 3u);
  EXPECT_EQ(CountersOf(handle()).captured, 0u);
}

TEST_F(Collection, SlowCallbackHoldsUpAnswersAndLosesNone) {
  const auto slow = [](uint32_t, const uint8_t*, uintptr_t) {
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
  };
  KRAL_DIAG_SetPhoneLoggingState(handle(), 1);
  EXPECT_EQ(KRAL_ConfigureCollectionCallBacks(handle(), slow, nullptr, 0), 1);
  Send(50);
  const auto begin = steady_clock::now();
  EXPECT_TRUE(Settle());
  EXPECT_GT(steady_clock::now() - begin, std::chrono::milliseconds(50)) << "the answer came behind the packets";
  EXPECT_EQ(CountersOf(handle()).collected, 50u);
}

// In either receive mode.
class Flood : public Collection, public testing::WithParamInterface<uint8_t> {};
INSTANTIATE_TEST_SUITE_P(ReceiveMode, Flood, testing::Values(0, 1));

// With commands in between: every packet sent is collected or counted, and every command is answered.
// KRAL_TEST_FLOOD_SECONDS makes it longer.
TEST_P(Flood, LosesNothingUncounted) {
  const auto seconds_text = EnvironmentValue("KRAL_TEST_FLOOD_SECONDS");
  const auto length = std::chrono::milliseconds(seconds_text ? 1000 * std::stol(*seconds_text) : 250);
  ASSERT_EQ(KRAL_SetReceiveMode(handle(), GetParam()), 1);
  KRAL_SetLogFlags(handle(), 0);
  ASSERT_EQ(KRAL_StartCapture(handle(), folder_.Path("flood").c_str()), 1);
  ASSERT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1001), 1);
  ASSERT_EQ(KRAL_DIAG_SetEventMaskBit(handle(), 7, 1), 1);

  uint64_t taken = 0;
  std::jthread reader([&](const std::stop_token& stop) {
    while (!stop.stop_requested()) taken += NextLog(handle(), 1).empty() ? 0 : 1;
    while (!NextLog(handle()).empty()) ++taken;
  });
  handset::LiveTraffic traffic(handset(), {.logs = 5000, .reports = 500, .burst = 20, .log_size = 198});
  uint64_t commands = 0;
  for (const auto begin = steady_clock::now(); steady_clock::now() - begin < length; ++commands) {
    ASSERT_TRUE(Settle()) << "command " << commands;
    const auto id = static_cast<uint16_t>(0x1002 + commands % 100);
    ASSERT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, id), 1);
    KRAL_EVENT event{};
    while (KRAL_DIAG_GetNextEvent(handle(), &event) == 1) continue;
  }
  const auto sent = traffic.Stop();
  // Logs and events are published one after the other.
  EXPECT_TRUE(Eventually([&] {
    const auto counters = CountersOf(handle());
    return counters.collected == sent.packets() && counters.events == sent.events;
  }));
  reader.request_stop();
  reader.join();
  const auto counters = CountersOf(handle());
  EXPECT_GT(sent.packets(), 0u);
  EXPECT_GT(commands, 0u);
  EXPECT_EQ(counters.collected, sent.packets());
  EXPECT_EQ(counters.events, sent.events);
  EXPECT_EQ(taken + counters.dropped_logs, counters.collected);
  EXPECT_TRUE(Eventually([&] { return KRAL_StopCapture(handle()) == 1; })) << "as long as the disk needs";
  EXPECT_EQ(CountersOf(handle()).captured, sent.packets());
  RecordProperty("packets", std::to_string(sent.packets()));
  RecordProperty("dropped", std::to_string(counters.dropped_logs));
  RecordProperty("commands", std::to_string(2 * commands));
}

}  // namespace
}  // namespace kral
