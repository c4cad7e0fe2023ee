// What families keep for a phone: one object of each type, whoever asks first, for as long as the phone lives.
#include "frame/phone_state.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <thread>
#include <vector>

namespace kral {
namespace {

template <int N>
struct Kept {
  int value = N;
};

template <int... N>
std::array<const void*, sizeof...(N)> AddressesOf(PhoneState& state) {
  return {&state.Get<Kept<N>>()...};
}

TEST(PhoneState, ThreadsThatAskAtOnceGetTheSameObjectOfEveryType) {
  for (int round = 0; round < 200; ++round) {
    PhoneState state;
    std::atomic<bool> go{false};
    std::vector<std::array<const void*, 4>> seen(4);
    std::vector<std::thread> threads;
    for (auto& addresses : seen) {
      threads.emplace_back([&] {
        while (!go) std::this_thread::yield();
        addresses = AddressesOf<1, 2, 3, 4>(state);
      });
    }
    go = true;
    for (std::thread& thread : threads) thread.join();
    for (const auto& addresses : seen) ASSERT_EQ(addresses, seen[0]);
    ASSERT_EQ((AddressesOf<1, 2, 3, 4>(state)), seen[0]);
    ASSERT_EQ(state.Get<Kept<3>>().value, 3);
  }
}

}  // namespace
}  // namespace kral
