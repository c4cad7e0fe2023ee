// The bounded queue: order, the dropping of the oldest, what readers see when, and waiting.
#include "transport/engine/bounded_queue.h"

#include "tests/support/test.h"

namespace kral {
namespace {

using std::chrono::milliseconds;

Packet Numbered(size_t number) {
  return {static_cast<uint8_t>(number), static_cast<uint8_t>(number >> 8)};
}

TEST(BoundedQueue, KeepsTheNewestWhenFull) {
  PacketQueue queue;
  // By both ways in turn: their order is that of the calls.
  for (size_t i = 0; i <= kQueueCapacity; ++i) i % 3 == 0 ? queue.Push(Numbered(i)) : queue.Stage(Numbered(i));
  queue.Publish();
  EXPECT_EQ(queue.size(), kQueueCapacity);
  EXPECT_EQ(queue.pushed(), kQueueCapacity + 1);
  EXPECT_EQ(queue.dropped(), 1u);
  for (size_t i = 1; i <= kQueueCapacity; ++i) ASSERT_EQ(queue.Pop(), Numbered(i));
  EXPECT_EQ(queue.Pop(), std::nullopt);
}

TEST(BoundedQueue, RecordOfTheUnwrittenLengthIsTakenOutButAbsent) {
  PacketQueue queue;
  queue.Push(Packet(kUnwrittenLength));
  queue.Push(Numbered(1));
  EXPECT_EQ(queue.Pop(), std::nullopt);
  EXPECT_EQ(queue.Pop(), Numbered(1));
}

TEST(BoundedQueue, ClearForgetsRecordsAndTheirSignal) {
  PacketQueue queue;
  queue.Push(Numbered(1));
  queue.Stage(Numbered(2));
  queue.Clear();
  queue.Publish();
  EXPECT_EQ(queue.pushed(), 2u);
  EXPECT_EQ(queue.PopWithin(milliseconds(5)), std::nullopt);
}

TEST(BoundedQueue, InterruptEndsTheWaitsUnderWayOrTheNextOneThatFindsNothing) {
  constexpr milliseconds kLong{20000};
  const auto start = std::chrono::steady_clock::now();
  PacketQueue queue;
  std::atomic<int> ended{0};
  std::vector<std::thread> readers;
  for (int i = 0; i < 3; ++i) {
    readers.emplace_back([&] {
      EXPECT_EQ(queue.PopWithin(kLong), std::nullopt);
      ++ended;
    });
  }
  while (ended < 3) {  // again for one that had not begun to wait
    std::this_thread::sleep_for(milliseconds(5));
    queue.Interrupt();
  }
  for (std::thread& reader : readers) reader.join();
  queue.ForgetInterrupt();
  queue.Push(Numbered(1));
  queue.Interrupt();
  EXPECT_EQ(queue.PopWithin(kLong), Numbered(1));
  EXPECT_EQ(queue.PopWithin(kLong), std::nullopt);
  EXPECT_LT(std::chrono::steady_clock::now() - start, kLong / 2);
  const auto rest = std::chrono::steady_clock::now();
  EXPECT_EQ(queue.PopWithin(milliseconds(20)), std::nullopt);
  EXPECT_GE(std::chrono::steady_clock::now() - rest, milliseconds(19)) << "told already";
}

TEST(BoundedQueue, WaitEndsWithWhatIsPushedOrPublished) {
  const auto push = [](PacketQueue& queue) { queue.Push(Numbered(0)); };
  const auto stage_one = [](PacketQueue& queue) {
    queue.Stage(Numbered(0));
    EXPECT_EQ(queue.size(), 0u) << "not seen yet";
    queue.WakeReaders();
  };
  const auto stage_many = [](PacketQueue& queue) {
    for (size_t i = 0; i < kQueueCapacity / 2; ++i) queue.Stage(Numbered(0));
  };
  for (const auto& bring : std::initializer_list<std::function<void(PacketQueue&)>>{push, stage_one, stage_many}) {
    PacketQueue queue;
    std::thread bringer([&] {
      std::this_thread::sleep_for(milliseconds(5));
      bring(queue);
    });
    EXPECT_EQ(queue.PopWithin(milliseconds(60000)), Numbered(0));
    bringer.join();
  }
}

}  // namespace
}  // namespace kral
