// A 64 MiB image through the whole library over a wire of 40 MB/s whose other end acknowledges after 2 ms: how busy the
// wire is, and how near a narrow window comes to what it allows.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <deque>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <random>
#include <span>
#include <string>
#include <thread>
#include <vector>

#include "bench/support/station.h"
#include "handset/line/frame_codec.h"
#include "kral/download.h"

namespace {

using namespace kral;
using Clock = std::chrono::steady_clock;
using Seconds = std::chrono::duration<double>;

constexpr uint32_t kPort = 300;
constexpr int kPtyPort = 241;
constexpr double kBytesPerSecond = 40e6;
constexpr Seconds kLatency{0.002};
constexpr Seconds kPolls{0.002};       // one millisecond each of the receive thread and of the response thread
constexpr Seconds kWriteAhead{0.004};  // what the system's buffers take
constexpr uint32_t kBlockSize = 16376;

Clock::duration Span(Seconds seconds) {
  return std::chrono::duration_cast<Clock::duration>(seconds);
}

// Every write comes as one frame. It takes its time on the wire, is compared with the image and acknowledged.
class Wire {
 public:
  explicit Wire(const std::vector<uint8_t>& image) : image_(image) {}

  uintptr_t context() const { return reinterpret_cast<uintptr_t>(this); }
  // What share of the time from the first byte to the last acknowledgement bytes were on the wire.
  double Busy() const { return busy_.count() / Elapsed(); }
  double Elapsed() const { return Seconds(last_taken_ - first_byte_).count(); }
  bool intact() const { return intact_ && verified_ == image_.size(); }

  static uint32_t KRAL_CALL Send(uintptr_t context, uintptr_t, uint32_t count, const uint8_t* data, uint32_t* written) {
    *written = count;
    reinterpret_cast<Wire*>(context)->Take({data, count});
    return 0;
  }
  static uint32_t KRAL_CALL Receive(uintptr_t context, uintptr_t, uint32_t* count, uint8_t* buffer) {
    *count = reinterpret_cast<Wire*>(context)->Give({buffer, *count});
    return 0;
  }
  static uint32_t KRAL_CALL Flush(uintptr_t, uintptr_t) { return 0; }

 private:
  struct Reply {
    Clock::time_point due;
    handset::Bytes frame;
  };

  void Take(std::span<const uint8_t> frame) {
    Clock::time_point returns;
    {
      const std::lock_guard lock(mutex_);
      const auto now = Clock::now();
      if (verified_ == 0) first_byte_ = free_ = now;
      const Seconds time(static_cast<double>(frame.size()) / kBytesPerSecond);
      free_ = std::max(free_, now) + Span(time);
      busy_ += time;
      Acknowledge(Unstuff(frame), free_ + Span(kLatency));
      returns = free_ - Span(kWriteAhead);
    }
    std::this_thread::sleep_until(returns);
  }

  static std::vector<uint8_t> Unstuff(std::span<const uint8_t> frame) {
    std::vector<uint8_t> packet;
    packet.reserve(frame.size());
    const uint8_t* at = frame.data() + 1;  // behind the leading flag
    const uint8_t* const end = frame.data() + frame.size() - 1;
    while (at != end) {
      const auto* escape =
          static_cast<const uint8_t*>(std::memchr(at, handset::kEscape, static_cast<size_t>(end - at)));
      packet.insert(packet.end(), at, escape == nullptr ? end : escape);
      if (escape == nullptr) break;
      packet.push_back(escape[1] ^ 0x20);
      at = escape + 2;
    }
    return packet;
  }

  void Acknowledge(const std::vector<uint8_t>& packet, Clock::time_point due) {
    const uint32_t address = handset::GetU32(packet, 1);
    const size_t size = packet.size() - 5 - 2;
    intact_ = intact_ && packet[0] == 7 && address + size <= image_.size() &&
              std::memcmp(packet.data() + 5, image_.data() + address, size) == 0;
    verified_ += size;
    handset::Bytes reply(packet.begin(), packet.begin() + 5);
    reply[0] = 8;
    replies_.push_back({due, handset::EncodeFrame(reply)});
  }

  uint32_t Give(std::span<uint8_t> room) {
    const std::lock_guard lock(mutex_);
    size_t count = 0;
    const auto now = Clock::now();
    while (!replies_.empty() && replies_.front().due <= now && replies_.front().frame.size() <= room.size() - count) {
      std::copy(replies_.front().frame.begin(), replies_.front().frame.end(),
                room.begin() + static_cast<std::ptrdiff_t>(count));
      count += replies_.front().frame.size();
      replies_.pop_front();
      last_taken_ = now;
    }
    return static_cast<uint32_t>(count);
  }

  const std::vector<uint8_t>& image_;
  std::mutex mutex_;
  std::deque<Reply> replies_;
  Clock::time_point free_;  // when the wire has sent all it was given
  Clock::time_point first_byte_;
  Clock::time_point last_taken_;
  Seconds busy_{0};
  size_t verified_ = 0;
  bool intact_ = true;
};

// The pipeline holds `state.range(0)` writes of the `state.range(1)` MiB image; the programmer announces one more.
void StreamImage(benchmark::State& state) {
  std::vector<uint8_t> image(static_cast<size_t>(state.range(1)) << 20);
  std::mt19937_64 random(3);
  for (uint8_t& byte : image) byte = static_cast<uint8_t>(random());
  const auto path = (std::filesystem::temp_directory_path() / "kral-bench.bin").string();
  std::ofstream(path, std::ios::binary)
      .write(reinterpret_cast<const char*>(image.data()), static_cast<std::streamsize>(image.size()));

  const auto window = static_cast<uint32_t>(state.range(0));
  for (auto _ : state) {
    Wire wire(image);
    const KRAL_HANDLE handle =
        KRAL_ConnectServer_UserDefinedTransport(kPort, 0, wire.context(), &Wire::Send, &Wire::Receive, &Wire::Flush);
    uint32_t result = 0;
    const uint8_t written =
        KRAL_STREAM_WriteImageFile(handle, path.c_str(), KRAL_IMAGE_FORMAT_BINARY, 0, nullptr, KRAL_STREAM_NOR,
                                   kBlockSize, static_cast<uint16_t>(window + 1), &result);
    KRAL_DisconnectServer(handle);
    if (written == 0 || !wire.intact()) {
      state.SkipWithError("the image did not arrive");
      break;
    }
    const double rate = static_cast<double>(image.size()) / wire.Elapsed();
    const double allowed = window * double{kBlockSize} / (kLatency + kPolls).count();
    state.counters["wire_busy"] = wire.Busy();
    state.counters["of_window_limit"] = rate / allowed;
    state.counters["MB_per_s"] = rate / 1e6;
  }
  std::remove(path.c_str());
}
BENCHMARK(StreamImage)
    ->ArgNames({"window", "MiB"})
    ->Args({32, 64})
    ->Args({4, 64})
    ->Iterations(1)
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

// --- Over a terminal ------------------------------------------------------------------------------------------------

// To the virtual handset's own programmer, in blocks as it announces them.
void StreamImageOverPty(benchmark::State& state) {
  bench::Station station(kPtyPort, bench::Cable::kPty, static_cast<uint8_t>(state.range(0)));
  handset::ProgrammerSettings settings;
  settings.block_size = static_cast<uint32_t>(state.range(1));
  settings.window = 16;
  station.phone().programmer().Set(settings);
  station.phone().EnterMode(station.phone().programmer_mode());
  uint32_t block_size = 0;
  uint16_t window = 0;
  if (KRAL_STREAM_HELLO(station.handle(), KRAL_STREAM_HELLO_VARIANT, &block_size, &window) == 0) {
    return state.SkipWithError("no programmer");
  }
  std::vector<uint8_t> image(size_t{4} << 20);
  std::mt19937_64 random(3);
  for (uint8_t& byte : image) byte = static_cast<uint8_t>(random());
  const auto size = static_cast<uint32_t>(image.size());
  for (auto _ : state) {
    uint32_t result = 0;
    if (KRAL_STREAM_WriteImageMem(station.handle(), image.data(), size, 0, 7, nullptr, 0, KRAL_STREAM_MULTI_IMAGE,
                                  block_size, window, &result) == 0) {
      return state.SkipWithError("the image did not arrive");
    }
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * size);
}
BENCHMARK(StreamImageOverPty)
    ->ArgNames({"mode", "block"})
    ->ArgsProduct({{0, 1}, {1024, 8188}})
    ->Iterations(2)
    ->MeasureProcessCPUTime()
    ->UseRealTime()
    ->Unit(benchmark::kMillisecond);

}  // namespace
