// The command engine over a scripted far side: what a request gives back, what it writes to the log, and what becomes
// of the port.
#include "base/hex_dump.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/test.h"
#include "tests/support/test_wire.h"

namespace kral {
namespace {

using handset::Bytes;

constexpr uint32_t kLong = 5000;
constexpr uint32_t kShort = 20;
constexpr uint32_t kBusy = 500;  // plenty for a reply, and soon over where none comes

struct Taken {
  bool succeeded;
  size_t size;  // the room, when nothing came
  Bytes bytes;  // the whole buffer
};

class Engine : public testing::Test {
 protected:
  Engine() { engine_->transport.SetReceiveMode(ReceiveMode::kWakeOnData); }

  void Open() { ASSERT_TRUE(engine_->OpenDevice()); }
  void OpenUser() { ASSERT_TRUE(engine_->OpenUser(wire_.AsUserTransport())); }
  void AnswerWith(Bytes payload) {
    wire_.OnWrite([frame = PlainFrame(payload)](const Bytes&) { return frame; });
  }
  Taken Ask(const Bytes& request, uint16_t room = 16, uint32_t time_out_ms = kLong) {
    Bytes buffer(room, 0xEE);
    return ToTaken(engine_->transport.SendSync(request, buffer, request[0], time_out_ms, 0), buffer);
  }
  Taken AskRaw(const Bytes& request, uint16_t room = 16, uint32_t time_out_ms = kLong) {
    Bytes buffer(room, 0xEE);
    return ToTaken(engine_->transport.SendRaw(request, buffer, time_out_ms), buffer);
  }
  static Taken ToTaken(const Reply& reply, const Bytes& buffer) {
    return {static_cast<bool>(reply), reply.came() ? reply.bytes().size() : buffer.size(), buffer};
  }
  // The lines of the calling thread's part of the engine, without those of the threads, and without times.
  LogLines::Lines EngineLines() {
    LogLines::Lines lines;
    for (std::string line : engine_->log.Take()) {
      const auto time = line.find("STACK TIME (ms):\t");
      if (time != std::string::npos) line.erase(line.find('\t') + 1);
      const bool wanted = line.find("SEND") != std::string::npos || line.find("Send Sync") != std::string::npos ||
                          line.find("Error.") != std::string::npos || line.find("OK\t") != std::string::npos ||
                          line.find("SendSync =") != std::string::npos || time != std::string::npos ||
                          line.find("timed out") != std::string::npos || line.find("different") != std::string::npos;
      if (wanted) lines.push_back(line);
    }
    return lines;
  }

  TestWire wire_;
  EngineGuard engine_{EngineBundle::Make(wire_.AsDevice())};
};

TEST_F(Engine, ReplyOfTheRequestedCodeSucceedsWithoutItsFcsBytesCounted) {
  Open();
  AnswerWith({75, 1, 2, 3});
  engine_->log.Take();
  const Taken reply = Ask({75, 50});
  EXPECT_TRUE(reply.succeeded);
  EXPECT_EQ(reply.size, 4);
  const Bytes record = WithFcs({75, 1, 2, 3});
  EXPECT_TRUE(std::equal(record.begin(), record.end(), reply.bytes.begin())) << "the FCS bytes follow where room is";
  EXPECT_EQ(wire_.Written(), std::vector<Bytes>{PlainFrame({75, 50})});
  EXPECT_EQ(EngineLines(),
            (LogLines::Lines{"1 SEND (2 bytes):4B 32 ", "4 OK\t Timeout=5000", "4 WRITE STACK TIME (ms):\t",
                             "4 READ STACK TIME (ms):\t", "4 CKralThreadInterface::SendSync = result = 1"}));
}

TEST_F(Engine, ResponseIsCutAtTheRoom) {
  struct Case {
    uint16_t room, size;
  };
  Open();
  AnswerWith({75, 1, 2, 3});
  for (const Case& c : {Case{0, 0}, Case{1, 1}, Case{3, 3}, Case{4, 4}, Case{5, 4}, Case{6, 4}, Case{100, 4}}) {
    const Taken reply = Ask({75}, c.room);
    EXPECT_TRUE(reply.succeeded) << c.room;
    EXPECT_EQ(reply.size, c.size) << c.room;
  }
}

TEST_F(Engine, FirstOtherReplyFailsTheRequestAtOnceAndIsGivenOut) {
  Open();
  wire_.OnWrite([](const Bytes&) {
    Bytes both = PlainFrame({19, 75});
    const Bytes right = PlainFrame({75, 1});
    both.insert(both.end(), right.begin(), right.end());
    return both;
  });
  engine_->log.Take();
  const Taken reply = Ask({75});
  EXPECT_FALSE(reply.succeeded);
  EXPECT_EQ(reply.size, 2);
  EXPECT_EQ(reply.bytes[0], 19);
  EXPECT_TRUE(engine_->transport.connected());
  const auto lines = EngineLines();
  const auto expected =
      LogLines::Lines{"16 Received different response command byte (0x13)than was requested (0x4B)",
                      "16 Error. Send Sync Read failed.", "4 CKralThreadInterface::SendSync = result = 0"};
  EXPECT_TRUE(std::equal(expected.rbegin(), expected.rend(), lines.rbegin())) << testing::PrintToString(lines);
}

TEST_F(Engine, LateReplyIsNotTakenForTheNextOnes) {
  Open();
  wire_.ToHost(PlainFrame({75, 0xBA, 0xD0}));
  ASSERT_TRUE(Eventually([this] { return engine_->responses.size() == 1; }));
  AnswerWith({75, 1});
  const Taken reply = Ask({75});
  EXPECT_TRUE(reply.succeeded);
  EXPECT_EQ(reply.bytes[1], 1);
}

TEST_F(Engine, ReplyThatCameTwiceDoesNotFailTheNextRequest) {
  Open();
  wire_.OnWrite([](const Bytes& written) {
    Bytes replies;
    for (int i = 0; i < 20; ++i) {
      const Bytes reply = PlainFrame({written[0], 1});
      replies.insert(replies.end(), reply.begin(), reply.end());
    }
    return replies;
  });
  for (uint8_t code = 1; code < 15; ++code) EXPECT_TRUE(Ask({code}).succeeded) << int{code};
}

TEST_F(Engine, TimeOutClosesThePortAndKeepsTheRequest) {
  Open();
  engine_->log.Take();
  const Taken reply = Ask({75, 9}, 16, kShort);
  EXPECT_FALSE(reply.succeeded);
  EXPECT_EQ(reply.bytes, Bytes(16, 0xEE));
  EXPECT_FALSE(engine_->transport.connected());
  EXPECT_EQ(engine_->transport.port().IsOpen(), 0u);
  const auto kept = engine_->transport.timed_out_request();
  EXPECT_EQ(Bytes(kept.begin(), kept.end()), (Bytes{75, 9}));
  const auto lines = EngineLines();
  EXPECT_NE(std::ranges::find(lines, "16 Request timed out"), lines.end());

  Open();
  AnswerWith({75});
  EXPECT_TRUE(Ask({75}).succeeded) << "the same thread reads on";
  EXPECT_EQ(wire_.opened(), 2);
}

TEST_F(Engine, TimeOutLeavesACallersTransportConnected) {
  OpenUser();
  EXPECT_FALSE(Ask({75}, 16, kShort).succeeded);
  EXPECT_TRUE(engine_->transport.connected());
  AnswerWith({75});
  EXPECT_TRUE(Ask({75}).succeeded);
}

TEST_F(Engine, FailedWriteClosesThePort) {
  Open();
  wire_.FailWrites(true);
  engine_->transport.port().SetWriteTimeout(0);
  engine_->log.Take();
  EXPECT_FALSE(Ask({75}).succeeded);
  EXPECT_FALSE(engine_->transport.connected());
  EXPECT_EQ(EngineLines(), (LogLines::Lines{"1 SEND (1 bytes):4B ", "16 Error. Send data failed.",
                                            "4 CKralThreadInterface::SendSync = result = 0"}));
}

TEST_F(Engine, RawTakesWhateverComesFirstWithItsFcsBytes) {
  Open();
  AnswerWith({19, 1});
  engine_->log.Take();
  const Taken reply = AskRaw({75});
  EXPECT_TRUE(reply.succeeded);
  EXPECT_EQ(reply.size, 4);
  EXPECT_EQ(Bytes(reply.bytes.begin(), reply.bytes.begin() + 4), WithFcs({19, 1}));
  EXPECT_EQ(EngineLines().at(0), "1 SEND RAW (1 bytes):4B ");
  EXPECT_EQ(AskRaw({75}, 3).size, 3);

  wire_.OnWrite({});
  const Taken none = AskRaw({75}, 16, kShort);
  EXPECT_FALSE(none.succeeded);
  EXPECT_EQ(none.size, 16);
  EXPECT_TRUE(engine_->transport.connected()) << "a raw time-out does not close the port";
  EXPECT_EQ(EngineLines().back(), "16 Error. Read failed.");
}

TEST_F(Engine, AtRequestInAnUnframedModeReadsUpToOk) {
  Open();
  ASSERT_TRUE(engine_->transport.SetPacketMode(2));
  const Bytes at = {'A', 'T', 'I', '\r'};
  wire_.OnWrite([this](const Bytes& written) {
    if (written[0] == 'A') {
      wire_.ToHost({'x', '\r', '\n'});
      return Bytes{'O', 'K', '\r', '\n'};
    }
    return Bytes{1, 2, 3};
  });
  const Taken reply = AskRaw(at);
  EXPECT_EQ(reply.size, 5);
  EXPECT_EQ(Bytes(reply.bytes.begin(), reply.bytes.begin() + 5), (Bytes{'x', '\r', '\n', 'O', 'K'}));
  EXPECT_EQ(wire_.Written(), std::vector<Bytes>{at}) << "unframed";
  EXPECT_EQ(AskRaw({'B'}).size, 3) << "chunks are packets again";
}

TEST_F(Engine, SendWithoutReplyOnlyWrites) {
  Open();
  engine_->log.Take();
  EXPECT_TRUE(engine_->transport.SendASync(Bytes{7}, 80, true));
  EXPECT_EQ(wire_.Written(), std::vector<Bytes>{PlainFrame({7}, true)});
  EXPECT_EQ(EngineLines(),
            (LogLines::Lines{"1 SEND_ASYNC (1 bytes):07 ", "4 OK\t Timeout=80", "4 WRITE STACK TIME (ms):\t"}));

  wire_.FailWrites(true);
  engine_->transport.port().SetWriteTimeout(0);
  EXPECT_EQ(engine_->transport.SendASync(Bytes{7}, 80, true).kind(), ReplyKind::kWriteFailed);
  EXPECT_EQ(EngineLines(), (LogLines::Lines{"1 SEND_ASYNC (1 bytes):07 ", "16 Error. Send data failed."}));
}

TEST_F(Engine, PacketModeNeedsTheHandsetsConsentBetweenFramedAndTheFirstUnframedMode) {
  Open();
  EXPECT_FALSE(engine_->transport.SetPacketMode(4));
  EXPECT_EQ(engine_->transport.packet_mode(), PacketMode::kFramed);

  AnswerWith({68, 0});
  EXPECT_FALSE(engine_->transport.SetPacketMode(1)) << "refused by the second byte";
  AnswerWith({68});
  EXPECT_FALSE(engine_->transport.SetPacketMode(1)) << "no second byte";
  AnswerWith({68, 1});
  engine_->log.Take();
  EXPECT_TRUE(engine_->transport.SetPacketMode(1));
  EXPECT_EQ(wire_.Written().back(), PlainFrame({68}));
  // Not the last line for certain: the receive thread may still be telling of the answer.
  EXPECT_EQ(std::ranges::count(engine_->log.Take(), "4 RAW_DATA_FLAG = ON"), 1);

  wire_.OnWrite({});
  const std::string at = "AT$XJDMG\r";
  wire_.OnWrite([&at](const Bytes& written) {
    return written == Bytes(at.begin(), at.end()) ? Bytes{'\r', '\n', 'O', 'K'} : Bytes{};
  });
  EXPECT_TRUE(engine_->transport.SetPacketMode(0)) << "the receive thread leaves the answer alone";
  AnswerWith({75});
  EXPECT_TRUE(Ask({75}).succeeded);

  const size_t writes = wire_.Written().size();
  for (const uint32_t mode : {2u, 3u, 1u, 2u, 0u}) EXPECT_TRUE(engine_->transport.SetPacketMode(mode)) << mode;
  EXPECT_EQ(wire_.Written().size(), writes) << "every other change is made directly";
}

TEST_F(Engine, FlushDropsThePartialPacket) {
  EXPECT_FALSE(engine_->transport.FlushRxBuffer()) << "no port";
  OpenUser();
  const Bytes frame = PlainFrame({75, 1});
  wire_.ToHost(Bytes(frame.begin(), frame.begin() + 1));
  ASSERT_TRUE(Eventually([this] { return engine_->transport.counters().bytes_received == 1; }));
  const uint64_t reads = wire_.reads();
  ASSERT_TRUE(Eventually([&] { return wire_.reads() > reads; })) << "the byte is where packets are made";
  EXPECT_TRUE(engine_->transport.FlushRxBuffer());
  AnswerWith({75, 1});
  EXPECT_TRUE(Ask({75}).succeeded);
}

TEST_F(Engine, WhatBrokeOffBelongsToTheConnectionThatHasEnded) {
  engine_->sorter.SetCollection(true);
  const auto open = [this](bool callers) { callers ? OpenUser() : Open(); };
  // A caller's transport stays open after a time-out.
  enum class Ending { kTimeOut, kStop, kTimeOutOfCallers };
  for (const Ending end : {Ending::kTimeOut, Ending::kStop, Ending::kTimeOutOfCallers}) {
    const bool callers = end != Ending::kTimeOut;
    for (const Bytes& frame : {PlainFrame({75, 1, 2}), PlainFrame({16, 1, 2, 3}), Bytes{0x7D, 0x7D}}) {
      open(callers);
      wire_.OnWrite({});
      const uint64_t before = engine_->transport.counters().bytes_received;
      wire_.ToHost(Bytes(frame.begin(), frame.end() - 1));
      ASSERT_TRUE(Eventually([&] { return engine_->transport.counters().bytes_received > before; }));
      if (end == Ending::kStop) {
        ASSERT_TRUE(engine_->transport.StopThread());
      } else {
        ASSERT_FALSE(Ask({75}, 16, kShort).succeeded);
      }
      if (end != Ending::kTimeOutOfCallers) open(callers);
      AnswerWith({75, 1});
      EXPECT_TRUE(Ask({75}, 16, kBusy).succeeded) << HexDump(frame);
      EXPECT_EQ(engine_->asynchronous.size(), 0u) << "half a packet, and a reply for its other half";
    }
  }
}

TEST_F(Engine, ShowsWhatNoRequestTakesAndTellsDamageFromSilence) {
  Open();
  engine_->responses.Push(Bytes{75, 19, 2, 0, 0xF, 0xC});
  std::vector<Packet> dropped;
  engine_->transport.SetUnclaimed(
      [&](std::span<const uint8_t> late) { dropped.emplace_back(late.begin(), late.end()); });
  // Damaged while the request is still being written.
  wire_.OnWrite([this](const Bytes&) {
    Bytes bad = PlainFrame({75, 3});
    bad[1] ^= 1;
    const uint64_t before = engine_->transport.counters().bad_fcs;
    wire_.ToHost(bad);
    EXPECT_TRUE(Eventually([&] { return engine_->transport.counters().bad_fcs > before; }));
    return Bytes();
  });
  Bytes room(16);
  EXPECT_EQ(engine_->transport.SendSync(Bytes{75}, room, 75, kShort, 0).kind(), ReplyKind::kGarbled);
  EXPECT_EQ(dropped, (std::vector<Packet>{{75, 19, 2, 0}}));

  Open();
  dropped.clear();
  wire_.OnWrite([](const Bytes&) {
    Bytes both = PlainFrame({38, 1});
    const Bytes right = PlainFrame({38, 2});
    both.insert(both.end(), right.begin(), right.end());
    return both;
  });
  const ReplyTest second = [](std::span<const uint8_t> reply) { return reply[1] == 2; };
  EXPECT_TRUE(engine_->transport.SendSync(Bytes{38}, room, 38, kBusy, 0, second));
  AnswerWith({75, 1});
  EXPECT_EQ(engine_->transport.SendSync(Bytes{38}, room, 38, kBusy, 0).kind(), ReplyKind::kOther);
  EXPECT_EQ(dropped, (std::vector<Packet>{{38, 1}, {75, 1}}));
}

TEST_F(Engine, CountsWhatCameAndWhatWasLost) {
  Open();
  Bytes bad = PlainFrame({3, 3});
  bad[0] ^= 1;
  Bytes traffic;
  for (const Bytes& frame : {PlainFrame({16, 1}), PlainFrame({3, 3}), bad, Bytes(5000, 1), Bytes{0x7E}}) {
    traffic.insert(traffic.end(), frame.begin(), frame.end());
  }
  wire_.ToHost(traffic);
  // The threads count while they work: the oversized run is the last that is counted of this chunk.
  TrafficCounters counters;
  ASSERT_TRUE(Eventually([&] {
    counters = engine_->transport.counters();
    return counters.bad_fcs == 2 && counters.oversized == 1 && engine_->responses.size() == 1;
  }));
  EXPECT_EQ(counters.bytes_received, traffic.size());
  EXPECT_EQ(counters.packets_received, 2u);
  const TrafficCounters sorted = engine_->sorter.counters();
  EXPECT_EQ(sorted.dropped_not_collecting, 1u);
  EXPECT_EQ(sorted.dropped_asynchronous + sorted.dropped_responses, 0u);
  EXPECT_EQ(counters.bad_fcs, 2u) << "the tail behind the oversized run is a frame of its own";
  EXPECT_EQ(counters.oversized, 1u);
}

TEST_F(Engine, NothingCountsAsAliveWithoutAnAnswer) {
  EXPECT_EQ(engine_->transport.QueryState(4), 0u);
}

}  // namespace
}  // namespace kral
