// What a host does with its threads and ours: it ends them inside its own functions, and handles signals on its own.
#include <pthread.h>

#include <csignal>

#include "tests/support/engine_bundle.h"
#include "tests/support/test.h"
#include "tests/support/test_wire.h"

namespace kral {
namespace {

std::atomic<int> ended_threads;
std::thread::id spared;

// Counts the thread when its stack has been unwound: how long that takes is the machine's.
struct CountedAtExit {
  ~CountedAtExit() { ++ended_threads; }
};

// As the callbacks of an interpreter that is going down do.
void EndThread() {
  if (std::this_thread::get_id() == spared) return;
  static thread_local const CountedAtExit counted;
  static_cast<void>(counted);
  pthread_exit(nullptr);
}

class HostThreads : public testing::Test {
 protected:
  HostThreads() {
    ended_threads = 0;
    spared = std::this_thread::get_id();
  }
  // The process has gone on this far; the thread has announced its end, and the connection can be ended.
  static void ExpectEnded(EngineGuard& engine) {
    ASSERT_TRUE(Eventually([] { return ended_threads == 1; }, std::chrono::seconds(60)));
    EXPECT_TRUE(engine->Shut());
    EXPECT_TRUE(Eventually([] { return ReapParkedThreads() == 0; }));
  }

  TestWire wire_;
};

TEST_F(HostThreads, DispatcherEndsInACallback) {
  EngineGuard engine(EngineBundle::Make(wire_.AsDevice()));
  engine->sorter.SetRawPacketCallback([](uint32_t, const uint8_t*, uintptr_t) { EndThread(); }, 0);
  ASSERT_TRUE(engine->OpenDevice());
  wire_.ToHost(PlainFrame({1, 2}));
  ExpectEnded(engine);
}

TEST_F(HostThreads, ReceiveThreadEndsInTheTextLogCallback) {
  EngineGuard engine(EngineBundle::Make(wire_.AsDevice()));
  engine->dispatcher.Stop();
  engine->log.log()->SetCallback([](uint32_t, const void*, uint32_t) { EndThread(); }, 0);
  ASSERT_TRUE(engine->OpenDevice());
  wire_.ToHost(PlainFrame({1, 2}));
  ExpectEnded(engine);
}

TEST_F(HostThreads, ReceiveThreadEndsInTheReceiveFunction) {
  EngineGuard engine(EngineBundle::Make());
  const UserTransport user{1, 1, [](uintptr_t, uintptr_t, uint32_t, const uint8_t*, uint32_t*) { return 0u; },
                           [](uintptr_t, uintptr_t, uint32_t*, uint8_t*) {
                             EndThread();
                             return 0u;
                           },
                           [](uintptr_t, uintptr_t) { return 0u; }};
  ASSERT_TRUE(engine->OpenUser(user));
  ExpectEnded(engine);
}

// What is undone on the thread's way out has lines of its own, which the host's function is not given any more.
TEST_F(HostThreads, CallersThreadEndsInTheTextLogCallback) {
  DataLogFileHandler log;
  log.SetFlags(kLogFn);
  log.SetCallback([](uint32_t, const void*, uint32_t) { EndThread(); }, 0);
  struct Undone {
    DataLogFileHandler& log;
    ~Undone() { log.WriteLine(kLogFn, "on the way out"); }
  };
  std::atomic<bool> returned{false};
  std::thread([&] {
    const Undone undone{log};
    log.WriteLine(kLogFn, "text");
    returned = true;
  }).join();
  EXPECT_FALSE(returned);
  EXPECT_EQ(ended_threads, 1);
}

TEST_F(HostThreads, SignalsAreHandledOnNoThreadOfTheLibrary) {
  sigset_t mine, ours, after;
  ManualResetEvent asked("asked");
  WorkerThread worker;
  pthread_sigmask(SIG_BLOCK, nullptr, &mine);
  ASSERT_TRUE(worker.Start(
      [&] {
        pthread_sigmask(SIG_BLOCK, nullptr, &ours);
        asked.Set();
      },
      nullptr));
  pthread_sigmask(SIG_BLOCK, nullptr, &after);
  ASSERT_TRUE(asked.WaitFor(60000));
  worker.Join();
  for (const int signal : {SIGHUP, SIGINT, SIGTERM, SIGALRM, SIGCHLD, SIGUSR1, SIGPIPE}) {
    EXPECT_EQ(sigismember(&ours, signal), 1) << signal;
    EXPECT_EQ(sigismember(&after, signal), sigismember(&mine, signal)) << signal;
  }
  // A fault is handled where it happens, or by nobody; and a thread that has called into a runtime is stopped by
  // others.
  for (const int signal : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGPWR, SIGXCPU, SIGRTMIN, SIGRTMAX})
    EXPECT_EQ(sigismember(&ours, signal), 0) << signal;
}

}  // namespace
}  // namespace kral
