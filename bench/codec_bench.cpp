// FCS, framing and de-framing beside plain code and memcpy. The three take turns within every iteration, so that a
// busy machine slows all of them, and the ratios are medians over the iterations:
//   x_plain   how many times faster than the plain code
//   x_memcpy  the time of copying the same bytes, as a part of ours
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <memory>
#include <random>
#include <vector>

#include "base/text_log.h"
#include "bench/support/plain_hdlc.h"
#include "transport/line/fcs16.h"
#include "transport/line/hdlc_deframer.h"
#include "transport/line/hdlc_frame.h"

namespace {

using Bytes = std::vector<uint8_t>;

constexpr int kIterations = 300;
constexpr size_t kPoolSize = 128 * 1024;
constexpr size_t kChunk = 509;  // a prime, so that reads end anywhere in a frame

// Payloads enough that no branch predictor learns where their special bytes are.
class Payloads {
 public:
  static Payloads Random(size_t size) {
    std::mt19937 random(1);
    Payloads pool(size);
    for (uint8_t& byte : pool.bytes_) byte = static_cast<uint8_t>(random());
    // A code whose FCS is checked.
    for (size_t i = 0; i < pool.count(); ++i) pool.bytes_[i * size] = 75;
    return pool;
  }
  static Payloads AllFlags(size_t size) {
    Payloads pool(size);
    std::ranges::fill(pool.bytes_, uint8_t{0x7E});
    return pool;
  }
  // The worst for a processor that guesses: every other byte special, and nothing to tell which.
  static Payloads HalfFlags(size_t size) {
    Payloads pool = Random(size);
    for (uint8_t& byte : pool.bytes_) byte = (byte & 1) != 0 ? uint8_t{0x7E} : uint8_t{0x33};
    return pool;
  }

  size_t size() const { return size_; }
  size_t count() const { return bytes_.size() / size_; }
  const uint8_t* at(size_t index) const { return bytes_.data() + index * size_; }
  const Bytes& bytes() const { return bytes_; }

 private:
  explicit Payloads(size_t size) : size_(size), bytes_(kPoolSize / size * size) {}
  size_t size_;
  Bytes bytes_;
};

double Median(std::vector<double>& values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::ranges::nth_element(values, middle);
  return *middle;
}

template <class Work>
double SecondsOf(const Work& work) {
  const auto start = std::chrono::steady_clock::now();
  work();
  benchmark::ClobberMemory();
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

// Each function goes once through all `bytes` bytes.
template <class Ours, class Plain, class Copy>
void Compare(benchmark::State& state, size_t bytes, const Ours& ours, const Plain& plain, const Copy& copy) {
  std::vector<double> times;
  std::vector<double> by_plain;
  std::vector<double> by_copy;
  for (auto _ : state) {
    const double seconds = SecondsOf(ours);
    by_plain.push_back(SecondsOf(plain) / seconds);
    by_copy.push_back(SecondsOf(copy) / seconds);
    times.push_back(seconds);
    state.SetIterationTime(seconds);
  }
  state.counters["GB/s"] = static_cast<double>(bytes) / Median(times) / 1e9;
  state.counters["x_plain"] = Median(by_plain);
  state.counters["x_memcpy"] = Median(by_copy);
}

void Fcs(benchmark::State& state, const Payloads& payloads) {
  const size_t size = payloads.size();
  Bytes copy(size);
  Compare(
      state, payloads.bytes().size(),
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          benchmark::DoNotOptimize(kral::ComputeFcs16(payloads.at(i), static_cast<uint16_t>(size * 8)));
        }
      },
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          benchmark::DoNotOptimize(kral::bench::PlainFcs(payloads.at(i), size));
        }
      },
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          std::memcpy(copy.data(), payloads.at(i), size);
          benchmark::DoNotOptimize(copy.data());
        }
      });
}

void Framing(benchmark::State& state, const Payloads& payloads) {
  const size_t size = payloads.size();
  const auto frame = std::make_unique<kral::FrameBuffer>();
  Compare(
      state, payloads.bytes().size(),
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          benchmark::DoNotOptimize(kral::BuildFrame({payloads.at(i), size}, false, *frame));
        }
      },
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          benchmark::DoNotOptimize(kral::bench::PlainFrame(payloads.at(i), size, frame->data()));
        }
      },
      [&] {
        for (size_t i = 0; i < payloads.count(); ++i) {
          std::memcpy(frame->data(), payloads.at(i), size);
          benchmark::DoNotOptimize(frame->data());
        }
      });
}

Bytes StreamOf(const Payloads& payloads) {
  Bytes stream;
  Bytes frame(2 * payloads.size() + 6);
  for (size_t i = 0; i < payloads.count(); ++i) {
    const size_t length = kral::bench::PlainFrame(payloads.at(i), payloads.size(), frame.data());
    stream.insert(stream.end(), frame.begin(), frame.begin() + static_cast<std::ptrdiff_t>(length));
  }
  return stream;
}

template <class Take>
void InChunks(const Bytes& stream, const Take& take) {
  for (size_t at = 0; at < stream.size(); at += kChunk) {
    take(stream.data() + at, std::min(kChunk, stream.size() - at));
  }
}

struct Counter : kral::PacketListener {
  void OnPacket(std::span<const uint8_t> packet) override { bytes += packet.size(); }
  size_t bytes = 0;
};

// `payload_bytes` tells the rate; `expected` is what every pass must deliver, FCS bytes included.
void Deframing(benchmark::State& state, const Bytes& stream, size_t payload_bytes, size_t expected) {
  Counter ours;
  Counter plain;
  kral::HdlcDeframer deframer(ours, kral::NullLog());
  kral::bench::PlainDeframer plain_deframer(
      [](void* context, const uint8_t* packet, size_t size) {
        static_cast<Counter*>(context)->OnPacket({packet, size});
      },
      &plain);
  Bytes copy(kChunk);
  Compare(
      state, payload_bytes, [&] { InChunks(stream, [&](auto* data, size_t size) {
                                    deframer.Feed({data, size});
                                  }); },
      [&] { InChunks(stream, [&](auto* data, size_t size) { plain_deframer.Feed(data, size); }); },
      [&] {
        InChunks(stream, [&](auto* data, size_t size) {
          std::memcpy(copy.data(), data, size);
          benchmark::DoNotOptimize(copy.data());
        });
      });
  const size_t due = expected * static_cast<size_t>(state.iterations());
  if (ours.bytes != due || plain.bytes != due) state.SkipWithError("packets were lost");
}

void DeframingOf(benchmark::State& state, const Payloads& payloads) {
  const size_t bytes = payloads.bytes().size();
  Deframing(state, StreamOf(payloads), bytes, bytes + 2 * payloads.count());
}

void FcsRandom(benchmark::State& state) {
  Fcs(state, Payloads::Random(static_cast<size_t>(state.range(0))));
}
void FramingRandom(benchmark::State& state) {
  Framing(state, Payloads::Random(static_cast<size_t>(state.range(0))));
}
void FramingFlags(benchmark::State& state) {
  Framing(state, Payloads::AllFlags(static_cast<size_t>(state.range(0))));
}
void FramingHalfFlags(benchmark::State& state) {
  Framing(state, Payloads::HalfFlags(static_cast<size_t>(state.range(0))));
}
void DeframingRandom(benchmark::State& state) {
  DeframingOf(state, Payloads::Random(static_cast<size_t>(state.range(0))));
}
void DeframingFlags(benchmark::State& state) {
  DeframingOf(state, Payloads::AllFlags(static_cast<size_t>(state.range(0))));
}
void DeframingIdleFlags(benchmark::State& state) {
  Deframing(state, Bytes(kPoolSize, 0x7E), kPoolSize, 0);
}

BENCHMARK(FcsRandom)->Arg(4000)->Arg(1024)->Arg(64)->Iterations(kIterations)->UseManualTime();
BENCHMARK(FramingRandom)->Arg(4000)->Arg(1024)->Arg(64)->Iterations(kIterations)->UseManualTime();
BENCHMARK(FramingFlags)->Arg(4000)->Arg(1024)->Iterations(kIterations)->UseManualTime();
BENCHMARK(FramingHalfFlags)->Arg(4000)->Arg(1024)->Iterations(kIterations)->UseManualTime();
BENCHMARK(DeframingRandom)->Arg(4000)->Arg(1024)->Arg(64)->Iterations(kIterations)->UseManualTime();
BENCHMARK(DeframingFlags)->Arg(4000)->Arg(1024)->Iterations(kIterations)->UseManualTime();
BENCHMARK(DeframingIdleFlags)->Iterations(kIterations)->UseManualTime();

}  // namespace
