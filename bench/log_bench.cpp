// A flood of log packets from a port into a capture file while a reader drains the queue, the same bytes read and
// thrown away, and what a command's round trip costs under the flood and under a trace.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <mutex>
#include <thread>
#include <vector>

#include "bench/support/station.h"
#include "frame/resource_manager.h"
#include "handset/line/frame_codec.h"
#include "kral/connection.h"
#include "kral/log.h"
#include "kral/transport.h"
#include "tests/support/fake_device.h"

namespace {

using namespace kral;
using std::chrono::microseconds;
using std::chrono::steady_clock;

constexpr uint16_t kPort = 210;
constexpr size_t kPacketSize = 200;  // FCS included
constexpr double kFloodRate = 100000;
constexpr double kPatienceSeconds = 60;
// What a USB port hands over at a time.
constexpr microseconds kPiece{1000};

// A serial device on which frames of log packets come at a rate, in pieces of a millisecond, or all at once; what is
// written to it is answered at once with itself.
class FloodLine {
 public:
  FloodLine() {
    handset::Bytes payload(kPacketSize - 2);
    for (size_t i = 0; i < payload.size(); ++i) payload[i] = static_cast<uint8_t>(i * 37);
    payload[0] = 16;
    frame_ = handset::EncodeFrame(payload);
    while (frames_.size() < (size_t{64} << 10)) frames_.insert(frames_.end(), frame_.begin(), frame_.end());
  }

  // So many packets from now on; a rate of 0 is all at once.
  void Release(uint64_t packets, double rate) {
    const std::lock_guard lock(mutex_);
    total_ = packets;
    rate_ = rate;
    sent_ = 0;
    begin_ = steady_clock::now();
    changed_.notify_all();
  }
  uint64_t left() {
    const std::lock_guard lock(mutex_);
    return total_ - sent_;
  }

  uint64_t sent() {
    const std::lock_guard lock(mutex_);
    return sent_;
  }

  size_t Write(std::span<const uint8_t> bytes) {
    const std::lock_guard lock(mutex_);
    answer_.insert(answer_.end(), bytes.begin(), bytes.end());
    changed_.notify_all();
    return bytes.size();
  }
  size_t Read(std::span<uint8_t> buffer) {
    const std::lock_guard lock(mutex_);
    const size_t room = (std::min(buffer.size(), frames_.size()) - answer_.size()) / frame_.size();
    const auto packets = static_cast<size_t>(std::min<uint64_t>(DueLocked(), room));
    std::copy_n(frames_.begin(), packets * frame_.size(), buffer.begin());
    sent_ += packets;
    const size_t count = packets * frame_.size() + answer_.size();
    std::ranges::copy(answer_, buffer.begin() + static_cast<std::ptrdiff_t>(packets * frame_.size()));
    answer_.clear();
    return count;
  }
  bool Wait(uint32_t milliseconds) {
    std::unique_lock lock(mutex_);
    const auto end = steady_clock::now() + std::chrono::milliseconds(milliseconds);
    while (answer_.empty() && DueLocked() == 0 && !woken_ && steady_clock::now() < end) {
      const auto next = sent_ < total_ && rate_ > 0 ? steady_clock::now() + kPiece / 4 : end;
      changed_.wait_until(lock, std::min(end, next));
    }
    woken_ = false;
    return !answer_.empty() || DueLocked() > 0;
  }
  void Wake() {
    const std::lock_guard lock(mutex_);
    woken_ = true;
    changed_.notify_all();
  }

 private:
  uint64_t DueLocked() const {
    if (sent_ >= total_ || rate_ <= 0) return total_ - sent_;
    const auto pieces = (steady_clock::now() - begin_) / kPiece;
    const auto due = static_cast<uint64_t>(static_cast<double>(pieces) * rate_ * 1e-6 * kPiece.count());
    return std::min(due, total_) - std::min(sent_, std::min(due, total_));
  }

  handset::Bytes frame_;
  handset::Bytes frames_;
  std::mutex mutex_;
  std::condition_variable changed_;
  handset::Bytes answer_;
  uint64_t total_ = 0;
  uint64_t sent_ = 0;
  double rate_ = 0;
  steady_clock::time_point begin_;
  bool woken_ = false;
};

class FloodDevice final : public test::FakeDevice {
 public:
  explicit FloodDevice(FloodLine& line) : line_(line) {}
  size_t Write(std::span<const uint8_t> bytes, uint32_t) override { return line_.Write(bytes); }
  size_t Read(std::span<uint8_t> buffer) override { return line_.Read(buffer); }
  bool WaitReadable(uint32_t milliseconds) override { return line_.Wait(milliseconds); }
  void Wake() override { line_.Wake(); }

 private:
  FloodLine& line_;
};

// A connection over the line, collecting, with a thread that drains the log queue.
class Station {
 public:
  explicit Station(uint8_t receive_mode) {
    KRAL_SetDefaultReceiveMode(receive_mode);
    Kral_ResourceManager::SetDeviceOpener([this](int, DeviceResult&) { return std::make_unique<FloodDevice>(line_); });
    handle_ = KRAL_ConnectServer(kPort);
    KRAL_DIAG_SetPhoneLoggingState(handle_, 1);
    reader_ = std::thread([this] {
      std::array<uint8_t, KRAL_LONGEST_PACKET> buffer;
      uint16_t size = 0;
      while (!stop_) KRAL_DIAG_WaitNextPhoneLog(handle_, &size, buffer.data(), 20);
    });
  }
  ~Station() {
    stop_ = true;
    reader_.join();
    KRAL_DisconnectServer(handle_);
    Kral_ResourceManager::SetDeviceOpener({});
  }
  Station(const Station&) = delete;
  Station& operator=(const Station&) = delete;

  FloodLine& line() { return line_; }
  KRAL_HANDLE handle() const { return handle_; }
  KRAL_TRAFFIC_COUNTERS counters() const {
    KRAL_TRAFFIC_COUNTERS counters{};
    KRAL_GetTrafficCounters(handle_, &counters);
    return counters;
  }

 private:
  FloodLine line_;
  KRAL_HANDLE handle_ = 0;
  std::atomic<bool> stop_{false};
  std::thread reader_;
};

double SecondsSince(steady_clock::time_point start) {
  return std::chrono::duration<double>(steady_clock::now() - start).count();
}

// The line's bytes, read and thrown away.
double SecondsToDiscard(uint64_t packets) {
  FloodLine line;
  line.Release(packets, 0);
  std::vector<uint8_t> buffer(40960);
  const auto start = steady_clock::now();
  while (line.left() > 0) {
    size_t count = line.Read(buffer);
    benchmark::DoNotOptimize(buffer.data());
    benchmark::DoNotOptimize(count);
  }
  return SecondsSince(start);
}

// A rate of 0 is as fast as it goes: the reader may then be too slow for the queue, the capture file must not.
void PortToCapture(benchmark::State& state) {
  const auto rate = static_cast<double>(state.range(1));
  const uint64_t packets = rate > 0 ? static_cast<uint64_t>(rate) : 200000;
  const auto file = std::filesystem::temp_directory_path() / "kral-bench-capture";
  Station station(static_cast<uint8_t>(state.range(0)));
  double seconds = 0;
  for (auto _ : state) {
    const uint64_t before = station.counters().collected;
    if (KRAL_StartCapture(station.handle(), file.string().c_str()) == 0) {
      state.SkipWithError("no capture file");
      return;
    }
    const auto start = steady_clock::now();
    station.line().Release(packets, rate);
    while (station.counters().collected < before + packets) {
      if (SecondsSince(start) > kPatienceSeconds) {
        state.SkipWithError("packets did not arrive");
        return;
      }
      std::this_thread::sleep_for(microseconds(200));
    }
    KRAL_StopCapture(station.handle());
    seconds += SecondsSince(start);
  }
  const auto counters = station.counters();
  const auto total = static_cast<double>(packets) * static_cast<double>(state.iterations());
  state.counters["dropped"] = static_cast<double>(counters.dropped_logs);
  state.counters["lost"] = static_cast<double>(counters.capture_lost);
  state.counters["in_file"] = static_cast<double>(counters.captured) / total;
  if (rate <= 0) state.counters["times_discarding"] = seconds / total * 1e6 / (SecondsToDiscard(1000000));
  state.SetItemsProcessed(static_cast<int64_t>(total));
  std::filesystem::remove(file);
}
BENCHMARK(PortToCapture)->ArgNames({"mode", "rate"})->ArgsProduct({{0, 1}, {0, 100000}})->UseRealTime();

void ReadAndDiscard(benchmark::State& state) {
  constexpr uint64_t kPackets = 1000000;
  for (auto _ : state) SecondsToDiscard(kPackets);
  state.SetItemsProcessed(static_cast<int64_t>(kPackets) * state.iterations());
}
BENCHMARK(ReadAndDiscard)->UseRealTime();

std::vector<double> RoundTrips(KRAL_HANDLE handle, size_t count) {
  std::vector<double> times;
  const uint8_t request = 0x2F;
  std::array<uint8_t, 64> response{};
  for (size_t i = 0; i < count; ++i) {
    uint16_t size = response.size();
    const auto start = steady_clock::now();
    if (KRAL_SendSync(handle, 1, &request, &size, response.data(), 1000) == 0) return {};
    times.push_back(SecondsSince(start) * 1e6);
    std::this_thread::sleep_for(microseconds(100));  // as a station does something between two commands
  }
  std::ranges::sort(times);
  return times;
}

double Percentile(const std::vector<double>& sorted, double part) {
  return sorted[static_cast<size_t>(part * static_cast<double>(sorted.size() - 1))];
}

// The same commands on an idle line and under 100,000 packets a second that are captured.
void CommandUnderFlood(benchmark::State& state) {
  constexpr size_t kCommands = 3000;
  const auto file = std::filesystem::temp_directory_path() / "kral-bench-capture";
  Station station(static_cast<uint8_t>(state.range(0)));
  for (auto _ : state) {
    const auto idle = RoundTrips(station.handle(), kCommands);
    KRAL_StartCapture(station.handle(), file.string().c_str());
    station.line().Release(UINT64_MAX / 2, kFloodRate);
    const auto start = steady_clock::now();
    const auto flooded = RoundTrips(station.handle(), kCommands);
    const double delivered = static_cast<double>(station.line().sent()) / SecondsSince(start);
    station.line().Release(0, 0);
    KRAL_StopCapture(station.handle());
    if (idle.empty() || flooded.empty()) {
      state.SkipWithError("no answer");
      return;
    }
    state.counters["idle_p50_us"] = Percentile(idle, 0.5);
    state.counters["idle_p99_us"] = Percentile(idle, 0.99);
    state.counters["flood_p50_us"] = Percentile(flooded, 0.5);
    state.counters["flood_p99_us"] = Percentile(flooded, 0.99);
    state.counters["flood_per_second"] = delivered;
    if (delivered < 0.95 * kFloodRate) state.SetLabel("the flood was below its rate");
    state.counters["p99_ratio"] = Percentile(flooded, 0.99) / Percentile(idle, 0.99);
  }
  const auto counters = station.counters();
  state.counters["dropped"] = static_cast<double>(counters.dropped_logs);
  state.counters["lost"] = static_cast<double>(counters.capture_lost);
  std::filesystem::remove(file);
}
BENCHMARK(CommandUnderFlood)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(1)->UseRealTime();

// 100,000 packets a second into a trace: each is in the file, or counted as lost.
void PortToTrace(benchmark::State& state) {
  const auto packets = static_cast<uint64_t>(kFloodRate);
  const auto file = std::filesystem::temp_directory_path() / "kral-bench-trace";
  Station station(static_cast<uint8_t>(state.range(0)));
  KRAL_TRACE_COUNTERS traced{};
  for (auto _ : state) {
    const uint64_t before = station.counters().collected;
    KRAL_StartTrace(station.handle(), file.string().c_str());
    station.line().Release(packets, kFloodRate);
    const auto start = steady_clock::now();
    while (station.counters().collected < before + packets && SecondsSince(start) < kPatienceSeconds) {
      std::this_thread::sleep_for(microseconds(200));
    }
    do {
      KRAL_StopTrace(station.handle());
    } while (KRAL_GetTraceCounters(station.handle(), &traced) != 0 && traced.pending != 0);
  }
  const uint64_t total = packets * static_cast<uint64_t>(state.iterations());
  state.counters["lost"] = static_cast<double>(traced.lost);
  state.counters["in_file"] = static_cast<double>(traced.frames) / static_cast<double>(total);
  if (traced.frames + traced.lost != total) state.SkipWithError("packets are lost uncounted");
  state.SetItemsProcessed(static_cast<int64_t>(total));
  std::filesystem::remove(file);
}
BENCHMARK(PortToTrace)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(3)->UseRealTime();

// The same commands over a terminal with and without a trace and a capture, turn by turn, so that both have the same
// machine. Their turns are long: the first hundreds of requests after a start find nothing in the caches.
void CommandUnderTrace(benchmark::State& state) {
  constexpr int kTracedPort = 222;
  constexpr size_t kTurns = 40;
  const size_t commands = state.range(0) == 0 ? 100 : 1000;  // of one each millisecond, or of many
  const auto folder = std::filesystem::temp_directory_path();
  const auto trace = folder / "kral-bench-trace";
  const auto capture = folder / "kral-bench-capture";
  bench::Station station(kTracedPort, bench::Cable::kPty, static_cast<uint8_t>(state.range(0)));
  for (auto _ : state) {
    std::vector<double> plain;
    std::vector<double> traced;
    std::vector<double> ratios;
    for (size_t turn = 0; turn < kTurns; ++turn) {
      const auto without = RoundTrips(station.handle(), commands);
      KRAL_StartTrace(station.handle(), trace.string().c_str());
      KRAL_StartCapture(station.handle(), capture.string().c_str());
      const auto with = RoundTrips(station.handle(), commands);
      KRAL_StopCapture(station.handle());
      KRAL_StopTrace(station.handle());
      if (without.empty() || with.empty()) {
        state.SkipWithError("no answer");
        return;
      }
      plain.push_back(Percentile(without, 0.5));
      traced.push_back(Percentile(with, 0.5));
      ratios.push_back(traced.back() / plain.back());
    }
    std::ranges::sort(plain);
    std::ranges::sort(traced);
    std::ranges::sort(ratios);
    state.counters["plain_p50_us"] = Percentile(plain, 0.5);
    state.counters["traced_p50_us"] = Percentile(traced, 0.5);
    state.counters["p50_ratio"] = Percentile(ratios, 0.5);
  }
  std::filesystem::remove(trace);
  std::filesystem::remove(capture);
}
BENCHMARK(CommandUnderTrace)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(1)->UseRealTime();

}  // namespace
