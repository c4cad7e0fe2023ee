// Round trips against the same ones of a plain loop, in one run and by turns: their ratios mean something on a machine
// that has other work, too.
#include <benchmark/benchmark.h>

#include <array>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <thread>

#include "bench/support/station.h"
#include "handset/line/frame_codec.h"
#include "platform/serial_device.h"

namespace {

using namespace kral;
using bench::Cable;
using bench::Percentile;
using bench::Station;
using std::chrono::steady_clock;

constexpr int kPort = 220;
constexpr int kTurns = 40;
constexpr int kInTurn = 50;

// A handset at the other end of a terminal, and the least that a program can do to ask it: write, wait, read.
class PlainLoop {
 public:
  explicit PlainLoop(int port) : variable_("KRAL_COM" + std::to_string(port)) {
    phone_.KeepTrace(false);
    std::string error;
    cable_ = handset::PtyCable::Attach(phone_, "", error);
    if (!cable_) return;
    SetEnvironmentValue(variable_.c_str(), cable_->device_path());
    DeviceResult result;
    device_ = OpenComPort(port, result);
  }
  ~PlainLoop() { SetEnvironmentValue(variable_.c_str(), std::nullopt); }
  PlainLoop(const PlainLoop&) = delete;
  PlainLoop& operator=(const PlainLoop&) = delete;

  double RoundTrip() {
    if (!device_) return -1;
    const auto start = steady_clock::now();
    device_->Write(request_, 1000);
    std::array<uint8_t, 512> buffer;
    for (;;) {
      if (!device_->WaitReadable(1000)) return -1;
      const size_t count = device_->Read(buffer);
      if (count > 0 && buffer[count - 1] == 0x7E) break;
    }
    return std::chrono::duration<double, std::micro>(steady_clock::now() - start).count();
  }

 private:
  const std::string variable_;
  handset::VirtualHandset phone_;
  std::unique_ptr<handset::PtyCable> cable_;
  std::unique_ptr<SerialDevice> device_;
  const handset::Bytes request_ = handset::EncodeFrame(handset::Bytes{0});
};

struct Pair {
  std::vector<double> times;
  std::vector<double> peer;
};

template <class First, class Second>
bool TakeTurns(First& first, Second& second, Pair& pair) {
  for (int i = 0; i < kTurns * kInTurn; ++i) {
    const bool is_first = i / kInTurn % 2 == 0;
    const double time = is_first ? first.RoundTrip() : second.RoundTrip();
    if (time < 0) return false;
    (is_first ? pair.times : pair.peer).push_back(time);
  }
  return true;
}

template <class First, class Second>
void Compare(benchmark::State& state, First& first, Second& second) {
  Pair pair;
  for (auto _ : state) {
    if (TakeTurns(first, second, pair)) continue;
    state.SkipWithError("no answer");
    return;
  }
  state.counters["p50_us"] = Percentile(pair.times, 0.5);
  state.counters["p99_us"] = Percentile(pair.times, 0.99);
  state.counters["peer_p50_us"] = Percentile(pair.peer, 0.5);
  state.counters["p50_ratio"] = Percentile(pair.times, 0.5) / Percentile(pair.peer, 0.5);
}

// The peer is the plain loop.
void RoundTripBesidePlainLoop(benchmark::State& state) {
  Station station(kPort, Cable::kPty, static_cast<uint8_t>(state.range(0)));
  PlainLoop plain(kPort + 1);
  Compare(state, station, plain);
}
BENCHMARK(RoundTripBesidePlainLoop)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(3)->UseRealTime();

// The peer is the terminal in receive mode 1.
void RoundTripOfCaller(benchmark::State& state, Cable cable) {
  Station station(kPort, cable, 1);
  Station peer(kPort + 1, Cable::kPty, 1);
  Compare(state, station, peer);
}
void RoundTripOfCallerPolled(benchmark::State& state) {
  RoundTripOfCaller(state, Cable::kPolled);
}
void RoundTripOfCallerNotifying(benchmark::State& state) {
  RoundTripOfCaller(state, Cable::kNotifying);
}
void RoundTripOfCallerWaiting(benchmark::State& state) {
  RoundTripOfCaller(state, Cable::kWaiting);
}
BENCHMARK(RoundTripOfCallerPolled)->Iterations(1)->UseRealTime();
BENCHMARK(RoundTripOfCallerNotifying)->Iterations(3)->UseRealTime();
BENCHMARK(RoundTripOfCallerWaiting)->Iterations(3)->UseRealTime();

// --- Under a flood --------------------------------------------------------------------------------------------------

// Log packets at a rate, in small groups as a cable brings them.
class Flood {
 public:
  explicit Flood(handset::VirtualHandset& phone) : phone_(phone), thread_([this] { Run(); }) {}
  ~Flood() {
    stop_ = true;
    thread_.join();
  }
  Flood(const Flood&) = delete;
  Flood& operator=(const Flood&) = delete;

  void Open(bool open) { open_ = open; }

 private:
  static constexpr int kPerSecond = 100000;
  static constexpr int kInGroup = 100;

  void Run() {
    handset::Bytes packet(20, 0x33);
    packet[0] = 16;
    const handset::Bytes frame = handset::EncodeFrame(packet);
    handset::Bytes group;
    for (int i = 0; i < kInGroup; ++i) group.insert(group.end(), frame.begin(), frame.end());
    for (auto next = steady_clock::now(); !stop_; next += std::chrono::microseconds(1000000 / kPerSecond * kInGroup)) {
      std::this_thread::sleep_until(next);
      if (open_) phone_.SendUnframed(group);
    }
  }

  handset::VirtualHandset& phone_;
  std::atomic<bool> stop_{false};
  std::atomic<bool> open_{false};
  std::thread thread_;
};

void RoundTripInFlood(benchmark::State& state) {
  Station station(kPort, Cable::kPty, 1);
  Flood flood(station.phone());
  Pair pair;
  for (auto _ : state) {
    for (int turn = 0; turn < kTurns; ++turn) {
      flood.Open(turn % 2 == 0);
      for (int i = 0; i < 2 * kInTurn; ++i) {
        const double time = station.RoundTrip();
        if (time < 0) return state.SkipWithError("no answer");
        (turn % 2 == 0 ? pair.times : pair.peer).push_back(time);
      }
    }
  }
  state.counters["p50_us"] = Percentile(pair.times, 0.5);
  state.counters["p99_us"] = Percentile(pair.times, 0.99);
  state.counters["idle_p99_us"] = Percentile(pair.peer, 0.99);
  state.counters["p99_ratio"] = Percentile(pair.times, 0.99) / Percentile(pair.peer, 0.99);
}
BENCHMARK(RoundTripInFlood)->Iterations(3)->UseRealTime();

// --- Idle -----------------------------------------------------------------------------------------------------------

// How often each thread of this process has gone to sleep, by thread; empty where the system keeps no such account.
std::map<std::string, double> Sleeps() {
  std::map<std::string, double> sleeps;
  std::error_code none;
  for (const auto& task : std::filesystem::directory_iterator("/proc/self/task", none)) {
    std::ifstream status(task.path() / "status");
    for (std::string line; std::getline(status, line);) {
      if (line.starts_with("voluntary_ctxt_switches:"))
        sleeps[task.path().filename().string()] = std::stod(line.substr(24));
    }
  }
  return sleeps;
}

// Of the library's own threads: those that are there before the connection is made do not count.
void IdleWakeUps(benchmark::State& state) {
  handset::VirtualHandset phone;
  std::string error;
  const auto cable = handset::PtyCable::Attach(phone, "", error);
  if (!cable || Sleeps().empty()) return state.SkipWithError("this platform does not tell");
  const auto others = Sleeps();
  const std::string variable = "KRAL_COM" + std::to_string(kPort);
  SetEnvironmentValue(variable.c_str(), cable->device_path());
  KRAL_SetDefaultReceiveMode(static_cast<uint8_t>(state.range(0)));
  const KRAL_HANDLE handle = KRAL_ConnectServer(kPort);
  if (KRAL_IsPhoneConnected(handle) == 0) state.SkipWithError("no answer");
  for (auto _ : state) {
    constexpr int kSeconds = 4;
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    auto before = Sleeps();
    std::this_thread::sleep_for(std::chrono::seconds(kSeconds));
    double count = 0;
    for (const auto& [thread, sleeps] : Sleeps()) {
      if (!others.contains(thread)) count += sleeps - before[thread];
    }
    state.counters["per_second"] = count / kSeconds;
  }
  KRAL_DisconnectServer(handle);
  SetEnvironmentValue(variable.c_str(), std::nullopt);
}
BENCHMARK(IdleWakeUps)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(1)->UseRealTime();

}  // namespace
