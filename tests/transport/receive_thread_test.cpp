// The receive thread's life: both receive modes, pausing, stopping, and a caller's function that does not come back.
#include "tests/support/engine_bundle.h"
#include "tests/support/failing_allocation.h"
#include "tests/support/fake_clock.h"
#include "tests/support/test.h"
#include "tests/support/test_wire.h"

namespace kral {
namespace {

using handset::Bytes;
using std::chrono::milliseconds;

constexpr uint32_t kNoTraffic = 0xFFFFFFFF & ~(kLogIo | kLogInfAhdlc);

bool Has(const LogLines::Lines& lines, const std::string& line) {
  return std::ranges::find(lines, line) != lines.end();
}

struct Modes : testing::TestWithParam<std::tuple<ReceiveMode, bool>> {
  Modes() { engine->transport.SetReceiveMode(std::get<0>(GetParam())); }
  bool Open() { return std::get<1>(GetParam()) ? engine->OpenUser(wire.AsUserTransport()) : engine->OpenDevice(); }
  bool Answers() {
    wire.OnWrite([](const Bytes&) { return PlainFrame({5, 6}); });
    Bytes response(8);
    return static_cast<bool>(engine->transport.SendSync(Bytes{5}, response, 5, 5000, 0));
  }

  TestWire wire;
  EngineGuard engine{EngineBundle::Make(wire.AsDevice(), SystemClock(), kNoTraffic)};
};

INSTANTIATE_TEST_SUITE_P(ReceiveThread, Modes,
                         testing::Combine(testing::Values(ReceiveMode::kAsWritten, ReceiveMode::kWakeOnData),
                                          testing::Bool()),
                         [](const auto& instance) {
                           return std::string(std::get<0>(instance.param) == ReceiveMode::kAsWritten ? "AsWritten"
                                                                                                     : "WakeOnData") +
                                  (std::get<1>(instance.param) ? "CallersTransport" : "Device");
                         });

TEST_P(Modes, PauseStopsTheReadingUntilResume) {
  ASSERT_TRUE(Open());
  ASSERT_TRUE(Answers());
  engine->log.Take();
  ASSERT_TRUE(engine->transport.PauseThread());
  const uint64_t reads = wire.reads();
  wire.ToHost(PlainFrame({1, 2}));
  std::this_thread::sleep_for(milliseconds(20));
  EXPECT_EQ(wire.reads(), reads);
  EXPECT_TRUE(engine->transport.PauseThread());
  const auto lines = engine->log.Take();
  EXPECT_TRUE(Has(lines, "2 THREAD: Pause Detected, Pause ACK event set attempt"));
  EXPECT_TRUE(Has(lines, "2 CKralThreadInterface::PauseThread - Thread Pause event ack succeeded"));
  EXPECT_EQ(lines.back(), "2 CKralThreadInterface::PauseThread - thread is already paused");
  engine->transport.ResumeThread();
  EXPECT_TRUE(Eventually([this] { return engine->responses.size() == 1; }));
}

TEST_P(Modes, PauseAfterPauseIsAcknowledgedEachTime) {
  ASSERT_TRUE(Open());
  for (int i = 0; i < 50; ++i) {
    ASSERT_TRUE(engine->transport.PauseThread()) << i;
    engine->transport.ResumeThread();
  }
  EXPECT_TRUE(Answers());
}

TEST_P(Modes, StopsAtOnceAndStartsAgain) {
  for (int i = 0; i < 10; ++i) {
    ASSERT_TRUE(Open());
    ASSERT_TRUE(Answers());
    const auto start = std::chrono::steady_clock::now();
    ASSERT_TRUE(engine->transport.StopThread());
    EXPECT_LT(std::chrono::steady_clock::now() - start, milliseconds(500));
    EXPECT_FALSE(engine->transport.connected());
  }
  EXPECT_TRUE(Has(engine->log.Take(), "2 CKralThreadInterface::StopThread - thread stop event was received"));
  EXPECT_TRUE(engine->transport.StopThread()) << "nothing runs";
}

TEST_P(Modes, ModeChangesWhileTheThreadRuns) {
  ASSERT_TRUE(Open());
  for (const ReceiveMode mode : {ReceiveMode::kWakeOnData, ReceiveMode::kAsWritten, ReceiveMode::kWakeOnData}) {
    engine->transport.SetReceiveMode(mode);
    EXPECT_TRUE(Answers());
  }
}

TEST_P(Modes, FrameInPiecesAcrossReadsIsOnePacket) {
  ASSERT_TRUE(Open());
  for (const uint8_t byte : PlainFrame({1, 0x7E, 0x7D, 2})) wire.ToHost({byte});
  EXPECT_TRUE(Eventually([this] { return engine->responses.size() == 1; }));
  EXPECT_EQ(engine->responses.Pop(), test::WithFcs({1, 0x7E, 0x7D, 2}));
}

// --- Sleeping and waiting -------------------------------------------------------------------------------------------

TEST(ReceiveThread, SleepRuleSleepsEveryTurnOrOnlyOnce) {
  for (const uint32_t divisor : {1u, 7u}) {
    TestWire wire;
    FakeClock clock;
    EngineGuard engine(EngineBundle::Make(wire.AsDevice(), clock, 0));
    engine->transport.SetSleepDivisor(divisor);
    ASSERT_TRUE(engine->OpenDevice());
    ASSERT_TRUE(Eventually([&wire] { return wire.reads() > 100; }));
    ASSERT_TRUE(engine->transport.StopThread());
    if (divisor == 1) {
      EXPECT_GE(clock.slept(), wire.reads());
    } else {
      EXPECT_EQ(clock.slept(), 1u);
    }
  }
}

TEST(ReceiveThread, WakeOnDataReadsOnlyWhatIsThereAndLeavesAVanishedDeviceAlone) {
  TestWire wire;
  EngineGuard engine(EngineBundle::Make(wire.AsDevice(), SystemClock(), 0));
  engine->transport.SetReceiveMode(ReceiveMode::kWakeOnData);
  ASSERT_TRUE(engine->OpenDevice());
  std::this_thread::sleep_for(milliseconds(20));
  EXPECT_LE(wire.reads(), 1u);
  wire.ToHost(PlainFrame({1, 2}));
  ASSERT_TRUE(Eventually([&] { return engine->responses.size() == 1; }));
  EXPECT_LE(wire.reads(), 3u);
  wire.Vanish(true);
  std::this_thread::sleep_for(milliseconds(20));
  EXPECT_LE(wire.reads(), 5u);
  wire.Vanish(false);
  ASSERT_TRUE(engine->OpenDevice());
  wire.ToHost(PlainFrame({1, 2}));
  EXPECT_TRUE(Eventually([&] { return engine->responses.size() == 2; })) << "the reopened one is read";
}

// --- Replies read by who awaits them ---------------------------------------------------------------------------------

struct Conversation : testing::Test {
  Conversation() {
    engine->transport.SetReceiveMode(ReceiveMode::kWakeOnData);
    wire.OnWrite([](const Bytes&) { return PlainFrame({5, 6}); });
  }
  Reply Ask() { return engine->transport.SendSync(Bytes{5}, room, 5, 60000, 0); }
  bool IsReader() const { return wire.last_reader() == std::this_thread::get_id(); }
  bool Begins() {
    return engine->OpenDevice() && Eventually([this] { return Ask() && IsReader(); });
  }
  // Of a request that is not answered at first.
  Reply AskWhile(const std::function<void()>& happens) {
    wire.OnWrite({});
    const size_t before = wire.Written().size();
    std::thread other([&] {
      Eventually([&] { return wire.Written().size() > before; });
      std::this_thread::sleep_for(milliseconds(10));
      happens();
    });
    const Reply reply = Ask();
    other.join();
    return reply;
  }

  TestWire wire;
  Bytes room = Bytes(8);
  EngineGuard engine{EngineBundle::Make(wire.AsDevice(), SystemClock(), 0)};
};

TEST_F(Conversation, TakesNoReplyThatCameBetweenTheRequests) {
  ASSERT_TRUE(Begins());
  for (int i = 0; i < 20; ++i) {
    wire.ToHost(PlainFrame({5, 9}));
    ASSERT_TRUE(Ask());
    ASSERT_EQ(room[1], 6) << i;
  }
}

TEST_F(Conversation, LeavesOtherTrafficToTheReceiveThread) {
  engine->sorter.SetCollection(true);
  const Bytes log = PlainFrame({16, 1, 2, 3});
  ASSERT_TRUE(Begins());
  wire.ToHost(log);
  EXPECT_TRUE(Eventually([this] { return engine->asynchronous.size() == 1; })) << "nobody asks for anything";
  wire.OnWrite([&log](const Bytes&) {
    Bytes both = log;
    const Bytes reply = PlainFrame({5, 6});
    both.insert(both.end(), reply.begin(), reply.end());
    return both;
  });
  ASSERT_TRUE(Ask());
  ASSERT_TRUE(Ask());
  EXPECT_FALSE(IsReader());
  EXPECT_TRUE(Eventually([this] { return engine->asynchronous.size() == 3; }));
}

TEST_F(Conversation, IsEndedByAnAbort) {
  ASSERT_TRUE(Begins());
  std::atomic<bool> abort{false};
  engine->transport.SetAbort(&abort);
  const Reply reply = AskWhile([&] {
    abort = true;
    engine->transport.WakeWaiter();
  });
  EXPECT_EQ(reply.kind(), ReplyKind::kAborted);
}

TEST_F(Conversation, IsEndedByAnAbortWhileOtherAnswersCome) {
  constexpr int kMost = 400;
  ASSERT_TRUE(Begins());
  wire.OnWrite({});
  std::atomic<bool> abort{false};
  std::atomic<int> told{0};
  engine->transport.SetAbort(&abort);
  std::thread other([&] {
    for (; told < kMost; ++told) {
      wire.ToHost(PlainFrame({5, 9}));
      if (told > 4) abort = true;
      std::this_thread::sleep_for(milliseconds(5));
    }
  });
  const Reply reply =
      engine->transport.SendSync(Bytes{5}, room, 5, 60000, 0, [](std::span<const uint8_t>) { return false; });
  EXPECT_LT(told, kMost);
  told = kMost;
  other.join();
  EXPECT_EQ(reply.kind(), ReplyKind::kAborted);
}

TEST_F(Conversation, IsEndedByTheDevicesEnd) {
  ASSERT_TRUE(Begins());
  EXPECT_EQ(AskWhile([this] { wire.Vanish(true); }).kind(), ReplyKind::kGone);
}

TEST_F(Conversation, GoesOnInAnotherReceiveMode) {
  ASSERT_TRUE(Begins());
  EXPECT_TRUE(AskWhile([this] {
    engine->transport.SetReceiveMode(ReceiveMode::kAsWritten);
    wire.ToHost(PlainFrame({5, 6}));
  }));
  wire.OnWrite([](const Bytes&) { return PlainFrame({5, 6}); });
  EXPECT_TRUE(Ask());
  EXPECT_FALSE(IsReader());
}

// --- Caller's transports that tell of bytes, or wait for them -------------------------------------------------------

struct CallersTransport : testing::Test {
  CallersTransport() {
    engine->transport.SetReceiveMode(ReceiveMode::kWakeOnData);
    wire.OnWrite([](const Bytes&) { return PlainFrame({5, 6}); });
  }
  bool Asks(uint32_t time_out_ms = 60000) {
    Bytes response(8);
    return static_cast<bool>(engine->transport.SendSync(Bytes{5}, response, 5, time_out_ms, 0));
  }
  // Calls of the receive function in a millisecond without traffic.
  static double IdleReads(const std::function<uint64_t()>& reads) {
    const uint64_t before = reads();
    const auto start = std::chrono::steady_clock::now();
    std::this_thread::sleep_for(milliseconds(30));
    const std::chrono::duration<double, std::milli> passed = std::chrono::steady_clock::now() - start;
    return static_cast<double>(reads() - before) / passed.count();
  }

  TestWire wire;
  TestWire other;
  EngineGuard engine{EngineBundle::Make({}, SystemClock(), 0)};
};

TEST_F(CallersTransport, IsAskedWhenItTellsAndOtherwiseNotAtAll) {
  ASSERT_TRUE(engine->OpenUser(wire.AsUserTransport()));
  EXPECT_TRUE(Eventually([this] { return wire.reads() > 5; })) << "again and again until it tells for the first time";
  EXPECT_TRUE(engine->transport.NotifyReceived());
  EXPECT_TRUE(Eventually([this] { return IdleReads([this] { return wire.reads(); }) == 0; }));
  wire.ToHost(PlainFrame({1, 2}));
  EXPECT_TRUE(engine->transport.NotifyReceived());
  EXPECT_TRUE(Eventually([this] { return engine->responses.size() == 1; }));
  EXPECT_TRUE(Asks()) << "it tells no more: while an answer is awaited it is asked all the same";
  Bytes room(8);
  EXPECT_TRUE(engine->transport.SendRaw(Bytes{5}, room, 60000));

  ASSERT_TRUE(engine->OpenUser(other.AsUserTransport()));
  EXPECT_TRUE(Eventually([&] { return other.reads() > 5; })) << "another one has told nothing yet";
}

TEST_F(CallersTransport, MayTellFarTooOften) {
  ASSERT_TRUE(engine->OpenUser(wire.AsUserTransport()));
  std::atomic<bool> stop{false};
  std::thread noise([&] {
    while (!stop) engine->transport.NotifyReceived();
  });
  for (int i = 0; i < 50; ++i) EXPECT_TRUE(Asks()) << i;
  EXPECT_TRUE(engine->transport.PauseThread());
  engine->transport.ResumeThread();
  EXPECT_TRUE(engine->transport.StopThread());
  stop = true;
  noise.join();
}

TEST_F(CallersTransport, TellsNothingFromInsideItsReceiveFunction) {
  struct Self {
    CKralThreadInterface& transport;
    std::atomic<uint64_t> reads{0};
  } self{engine->transport};
  const auto receive = [](uintptr_t context, uintptr_t, uint32_t* count, uint8_t*) -> uint32_t {
    auto& me = *reinterpret_cast<Self*>(context);
    ++me.reads;
    me.transport.NotifyReceived();
    *count = 0;
    return 0;
  };
  const auto send = [](uintptr_t, uintptr_t, uint32_t, const uint8_t*, uint32_t*) -> uint32_t { return 0; };
  const auto flush = [](uintptr_t, uintptr_t) -> uint32_t { return 0; };
  ASSERT_TRUE(engine->OpenUser({0, reinterpret_cast<uintptr_t>(&self), send, receive, flush}));
  ASSERT_TRUE(Eventually([&] { return self.reads > 5; })) << "it is asked as if it had told nothing";
  EXPECT_LE(IdleReads([&] { return self.reads.load(); }), 3) << "and no more often";
  EXPECT_TRUE(engine->transport.StopThread());
}

TEST_F(CallersTransport, ThatWaitsItselfIsAskedAgainAtOnce) {
  // One that is held up waits; let go, it comes back with nothing at once.
  wire.HoldReceive(true);
  ASSERT_TRUE(engine->OpenUser(wire.AsUserTransport()));
  engine->transport.SetCallersWait(100);
  ASSERT_TRUE(wire.WaitUntilHeld());
  EXPECT_EQ(IdleReads([this] { return wire.reads(); }), 0);
  wire.HoldReceive(false);
  EXPECT_LE(IdleReads([this] { return wire.reads(); }), 3) << "one that does not wait does not keep a processor busy";
  EXPECT_TRUE(Asks());
}

// --- Opening --------------------------------------------------------------------------------------------------------

TEST(ReceiveThread, FailedOpenLeavesThePortClosedAndSaysSo) {
  const auto refuse = [](int, DeviceResult& result) {
    result.error = DeviceError::kBusy;
    return std::unique_ptr<SerialDevice>();
  };
  const auto explode = [](int, DeviceResult&) -> std::unique_ptr<SerialDevice> { throw 1; };
  const std::pair<DeviceOpener, const char*> cases[] = {{refuse, "16 Port open failed"},
                                                        {explode, "16 Port open failed with exception"}};
  for (const auto& [opener, line] : cases) {
    EngineGuard engine(EngineBundle::Make(opener));
    EXPECT_FALSE(engine->OpenDevice());
    EXPECT_FALSE(engine->transport.connected());
    EXPECT_TRUE(Has(engine->log.Take(), line)) << line;
  }
}

TEST(ReceiveThread, NeedsNoMemoryOnceItRuns) {
  TestWire wire;
  EngineGuard engine(EngineBundle::Make(wire.AsDevice(), SystemClock(), 0));
  constexpr size_t kChunk = 40960;
  const test::ScarceMemory none(kChunk);
  ASSERT_TRUE(engine->OpenDevice());
  wire.ToHost(PlainFrame({1, 2}));
  EXPECT_TRUE(Eventually([&] { return engine->responses.size() == 1; }));
}

TEST(WorkerThread, IsParkedWithoutMemory) {
  ManualResetEvent leave("leave");
  auto worker = std::make_unique<WorkerThread>();
  ASSERT_TRUE(worker->Start([&leave] { leave.WaitFor(60000); }, nullptr));
  {
    const test::ScarceMemory none(1);
    worker.reset();
  }
  EXPECT_EQ(ReapParkedThreads(), 1u);
  leave.Set();
  EXPECT_TRUE(Eventually([] { return ReapParkedThreads() == 0; }));
}

TEST(ReceiveThread, BlockedReceiveFunctionBoundsTheStopAndTheThreadEndsLater) {
  TestWire wire;
  auto bundle = EngineBundle::Make();
  ASSERT_TRUE(bundle->OpenUser(wire.AsUserTransport()));
  wire.HoldReceive(true);
  ASSERT_TRUE(wire.WaitUntilHeld());

  EXPECT_TRUE(bundle->OpenUser(wire.AsUserTransport())) << "a second connect with the same functions";
  EXPECT_TRUE(bundle->transport.Close());
  EXPECT_FALSE(bundle->transport.StopThread());
  EXPECT_TRUE(Has(bundle->log.Take(), "16 CKralThreadInterface::StopThread - thread stop event was not received"));
  EXPECT_FALSE(bundle->OpenUser(wire.AsUserTransport())) << "the former thread is still inside";

  wire.ToHost(PlainFrame({1, 2}));
  wire.HoldReceive(false);
  EXPECT_TRUE(Eventually([&] { return bundle->OpenUser(wire.AsUserTransport()); })) << "it has ended meanwhile";
  EXPECT_EQ(bundle->transport.counters().bytes_received, 0u) << "nobody waits for what came after the stop";
  EXPECT_TRUE(bundle->Shut());

  // The owner goes while the thread is held: it lives until the thread ends.
  ASSERT_TRUE(bundle->OpenUser(wire.AsUserTransport()));
  wire.HoldReceive(true);
  ASSERT_TRUE(wire.WaitUntilHeld());
  EXPECT_FALSE(bundle->transport.StopThread());
  bundle->dispatcher.Stop();
  const std::weak_ptr<bool> watched = bundle->presence;
  bundle.reset();
  EXPECT_FALSE(watched.expired());
  wire.HoldReceive(false);
  EXPECT_TRUE(Eventually([&] { return watched.expired(); }));
  EXPECT_TRUE(Eventually([] { return ReapParkedThreads() == 0; }));
}

}  // namespace
}  // namespace kral
