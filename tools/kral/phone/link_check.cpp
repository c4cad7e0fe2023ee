// Sends loopbacks that hold every byte value that a frame escapes.
#include "tools/kral/phone/link_check.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <vector>

namespace kral::tool {
namespace {

using std::chrono::steady_clock;

constexpr std::uint8_t kLoopback = 123;
constexpr std::size_t kSize = 128;
constexpr std::uint32_t kPatienceMs = 500;

std::uint64_t BadFrames(KRAL_HANDLE handle) {
  KRAL_TRAFFIC_COUNTERS counters{};
  return KRAL_GetTrafficCounters(handle, &counters) == 0 ? 0 : counters.bad_fcs + counters.oversized;
}

std::uint32_t At(const std::vector<std::uint32_t>& sorted, std::size_t percent) {
  return sorted.empty() ? 0 : sorted[std::min(sorted.size() - 1, sorted.size() * percent / 100)];
}

}  // namespace

Json LinkFigures::ToJson() const {
  return {{"count", count}, {"p50_us", half_us}, {"p99_us", most_us}, {"lost", lost}, {"garbled", garbled}};
}

LinkFigures CheckLink(Session& session, double seconds) {
  std::array<std::uint8_t, kSize> request{};
  for (std::size_t i = 0; i < request.size(); ++i) request[i] = static_cast<std::uint8_t>(i + 1);  // 7D, 7E included
  request[0] = kLoopback;
  LinkFigures figures;
  std::vector<std::uint32_t> times;
  const auto bad_before = BadFrames(session.handle());
  const auto end = steady_clock::now() + std::chrono::duration<double>(seconds);
  while (steady_clock::now() < end) {
    session.Begin();
    request[1] = static_cast<std::uint8_t>(figures.count++);
    std::array<std::uint8_t, 2 * kSize> reply{};
    auto size = static_cast<std::uint16_t>(reply.size());
    const auto start = steady_clock::now();
    const bool answered = KRAL_SendSync(session.handle(), static_cast<std::uint16_t>(request.size()), request.data(),
                                        &size, reply.data(), kPatienceMs) != 0;
    const auto time = steady_clock::now() - start;
    if (!answered) {
      ++figures.lost;
    } else if (!std::equal(request.begin(), request.end(), reply.begin(), reply.begin() + size)) {
      ++figures.garbled;
    } else {
      times.push_back(static_cast<std::uint32_t>(std::chrono::duration_cast<std::chrono::microseconds>(time).count()));
    }
  }
  figures.garbled += BadFrames(session.handle()) - bad_before;
  std::ranges::sort(times);
  figures.half_us = At(times, 50);
  figures.most_us = At(times, 99);
  return figures;
}

}  // namespace kral::tool
