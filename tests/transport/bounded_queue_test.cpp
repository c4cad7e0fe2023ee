// The bounded queue: order, the dropping of the oldest, and waiting.
#include "transport/bounded_queue.h"

#include <gtest/gtest.h>

#include <thread>

namespace kral {
namespace {

using std::chrono::milliseconds;

Packet Numbered(size_t number) {
  return {static_cast<uint8_t>(number), static_cast<uint8_t>(number >> 8)};
}

TEST(BoundedQueue, KeepsTheNewestWhenFull) {
  PacketQueue queue;
  for (size_t i = 0; i < kQueueCapacity; ++i) EXPECT_TRUE(queue.Push(Numbered(i)));
  EXPECT_FALSE(queue.Push(Numbered(kQueueCapacity)));
  EXPECT_EQ(queue.size(), kQueueCapacity);
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
  queue.Clear();
  EXPECT_EQ(queue.size(), 0u);
  EXPECT_EQ(queue.PopWithin(milliseconds(5)), std::nullopt);
}

TEST(BoundedQueue, WaitEndsWithTheFirstRecord) {
  PacketQueue queue;
  std::thread pusher([&queue] {
    std::this_thread::sleep_for(milliseconds(5));
    queue.Push(Numbered(7));
  });
  EXPECT_EQ(queue.PopWithin(milliseconds(5000)), Numbered(7));
  pusher.join();
}

}  // namespace
}  // namespace kral
