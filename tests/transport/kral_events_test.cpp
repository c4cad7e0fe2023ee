// The dispatcher: who is called with what, in which order, and how its thread begins and ends.
#include "transport/engine/kral_events.h"

#include "tests/support/engine_bundle.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class Recorder final : public PacketListener {
 public:
  Recorder(std::vector<std::string>& calls, std::mutex& mutex, std::string name)
      : calls_(calls), mutex_(mutex), name_(std::move(name)) {}
  void OnPacket(std::span<const uint8_t> packet) override {
    {
      const std::lock_guard lock(mutex_);
      calls_.push_back(name_ + std::to_string(packet[0]));
    }
    if (then) then();
  }
  void OnBatchEnd() override {
    if (at_end) at_end();
  }
  bool IsPrompt() const override { return prompt; }
  bool prompt = true;
  std::function<void()> then;
  std::function<void()> at_end;

 private:
  std::vector<std::string>& calls_;
  std::mutex& mutex_;
  std::string name_;
};

class OddOnly final : public PacketFilter {
 public:
  bool Accepts(std::span<const uint8_t> packet) const override { return packet[0] % 2 == 1; }
};

class KralEvents : public testing::Test {
 protected:
  void Push(uint8_t number) { events_->Push(std::array<uint8_t, 1>{number}); }
  std::vector<std::string> Calls(size_t expected) {
    Eventually([&] {
      const std::lock_guard lock(mutex_);
      return calls_.size() >= expected;
    });
    const std::lock_guard lock(mutex_);
    return calls_;
  }

  std::mutex mutex_;
  std::vector<std::string> calls_;
  std::shared_ptr<CKralEvents> events_ = std::make_shared<CKralEvents>();
  Recorder a_{calls_, mutex_, "a"};
  Recorder b_{calls_, mutex_, "b"};
  Recorder last_{calls_, mutex_, "last"};
};

using Names = std::vector<std::string>;

TEST_F(KralEvents, CallsListenersInTheirOrderAndFiltersByPacket) {
  const OddOnly odd;
  events_->RegisterListener(&a_, &odd, events_);
  events_->RegisterListener(&b_, nullptr, events_);
  Push(1);
  Push(2);
  EXPECT_EQ(Calls(3), (Names{"a1", "b1", "b2"}));
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, UnregisteringRemovesTheFirstPairOnly) {
  for (PacketListener* listener : {&a_, &b_, &a_}) events_->RegisterListener(listener, nullptr, events_);
  events_->UnregisterListener(&a_);
  Push(1);
  EXPECT_EQ(Calls(2), (Names{"b1", "a1"}));
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, ListenerMayUnregisterAndFailInItsCall) {
  a_.then = [this] { events_->UnregisterListener(&a_); };
  b_.then = [] { throw std::runtime_error("listener"); };
  for (PacketListener* listener : {&a_, &b_, &last_}) events_->RegisterListener(listener, nullptr, events_);
  Push(1);
  Push(2);
  EXPECT_EQ(Calls(5), (Names{"a1", "b1", "last1", "b2", "last2"}));
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, ListenerMayUnregisterAtTheEndOfABatch) {
  std::atomic<int> ends{0};
  a_.at_end = [this] { events_->UnregisterListener(&a_); };
  b_.at_end = [&ends] { ++ends; };
  for (PacketListener* listener : {&a_, &b_}) events_->RegisterListener(listener, nullptr, events_);
  Push(1);
  EXPECT_TRUE(Eventually([&] { return ends == 1; })) << "not passed over";
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, DispatchesHereOnlyWhatOvertakesNothingAndHoldsUpNobody) {
  const auto here = [this](uint8_t number, size_t count = 1) {
    std::vector<Packet> packets(count, Packet{number});
    const bool done = events_->DispatchHere(packets);
    EXPECT_EQ(packets.empty(), done);
    return done;
  };
  EXPECT_FALSE(here(1)) << "there is no dispatcher";
  events_->RegisterListener(&a_, nullptr, events_);
  Push(1);
  EXPECT_TRUE(events_->WaitUntilDispatched(60000)) << "the thread has begun, and waits";
  EXPECT_TRUE(here(2));
  EXPECT_EQ(Calls(2), (Names{"a1", "a2"})) << "before it returned";
  EXPECT_FALSE(here(3, 1000)) << "many";

  ManualResetEvent entered;
  ManualResetEvent leave;
  a_.then = [&] {
    entered.Set();
    leave.WaitFor(60000);
  };
  Push(4);
  ASSERT_TRUE(entered.WaitFor(60000));
  Push(5);
  EXPECT_FALSE(here(6)) << "another is with a listener";
  leave.Set();
  EXPECT_TRUE(events_->WaitUntilDispatched(60000));
  a_.then = nullptr;
  EXPECT_TRUE(here(7));
  a_.prompt = false;
  EXPECT_FALSE(here(8)) << "a listener that may take long";
  EXPECT_TRUE(events_->Stop());
  a_.prompt = true;
  EXPECT_FALSE(here(9)) << "after the stop";
  EXPECT_EQ(Calls(5), (Names{"a1", "a2", "a4", "a5", "a7"}));
}

TEST_F(KralEvents, KeepsTheOrderOfAFlood) {
  class Counter final : public PacketListener {
   public:
    void OnPacket(std::span<const uint8_t> packet) override {
      in_order = in_order && packet[0] == static_cast<uint8_t>(count);
      ++count;
    }
    std::atomic<bool> in_order{true};
    std::atomic<size_t> count{0};
  } counter;
  events_->RegisterListener(&counter, nullptr, events_);
  constexpr size_t kCount = 20000;
  for (size_t i = 0; i < kCount; ++i) Push(static_cast<uint8_t>(i));
  EXPECT_TRUE(Eventually([&] { return counter.count == kCount; }));
  EXPECT_TRUE(counter.in_order);
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, WithoutAThreadPacketsAreDroppedAndANewRegistrationStartsOne) {
  Push(1);
  events_->RegisterListener(&a_, nullptr, events_);
  Push(2);
  EXPECT_EQ(Calls(1), (Names{"a2"}));
  EXPECT_TRUE(events_->Stop());
  Push(3);
  events_->RegisterListener(&b_, nullptr, events_);
  Push(4);
  EXPECT_EQ(Calls(3), (Names{"a2", "a4", "b4"}));
  EXPECT_TRUE(events_->Stop());
}

TEST_F(KralEvents, HooksRunAroundTheThreadAndTheFirstMayRefuse) {
  class Hooked final : public CKralEvents {
   public:
    ~Hooked() override { Stop(); }
    std::atomic<bool> go{true};
    std::atomic<int> ends{0};

   protected:
    bool OnThreadStart() override { return go; }
    void OnThreadEnd() override { ++ends; }
  } hooked;
  hooked.go = false;
  hooked.RegisterListener(&a_, nullptr, nullptr);
  EXPECT_TRUE(hooked.Stop());
  EXPECT_EQ(hooked.ends, 0);
  hooked.go = true;
  hooked.RegisterListener(&b_, nullptr, nullptr);
  EXPECT_TRUE(hooked.Stop());
  EXPECT_EQ(hooked.ends, 1);
}

TEST_F(KralEvents, BlockedListenerBoundsTheStopAndKeepsItsOwnerAlive) {
  std::atomic<bool> release{false};
  std::atomic<bool> inside{false};
  std::atomic<bool> destroyed{false};
  events_ = {new CKralEvents, [&](CKralEvents* events) {
               delete events;
               destroyed = true;
             }};
  a_.then = [&] {
    inside = true;
    while (!release) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  };
  events_->RegisterListener(&a_, nullptr, events_);
  Push(1);
  ASSERT_TRUE(Eventually([&] { return inside.load(); }));
  EXPECT_FALSE(events_->Stop(10));
  events_.reset();
  EXPECT_FALSE(destroyed);
  release = true;
  // Only a thread that has been parked can be reaped, and only a reaped one uses nothing of the test any more.
  ASSERT_TRUE(Eventually([&] { return destroyed.load(); }));
  EXPECT_TRUE(Eventually([] { return ReapParkedThreads() == 0; }));
}

}  // namespace
}  // namespace kral
