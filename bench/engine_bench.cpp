// What an idle connection costs, and how many packets per second go from a port into the queue. Requests are in
// latency_bench.cpp.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <ctime>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "bench/support/station.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "handset/caller_transport.h"
#include "handset/line/frame_codec.h"
#include "handset/virtual_handset.h"
#include "kral/connection.h"
#include "kral/transport.h"

namespace {

using namespace kral;
using bench::Station;
using handset::CallerTransport;
using handset::VirtualHandset;
using std::chrono::steady_clock;

constexpr int kFirstPort = 200;

KRAL_HANDLE ConnectInProcess(uint32_t port, CallerTransport& transport) {
  return KRAL_ConnectServer_UserDefinedTransport(port, transport.handle_value(), transport.context(),
                                                 &CallerTransport::Send, &CallerTransport::Receive,
                                                 &CallerTransport::Flush);
}

// --- Idle connections -----------------------------------------------------------------------------------------------

// A figure of the system's own account of this process; negative where it keeps none.
double ProcessFigure(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with(name + ":")) return std::stod(line.substr(name.size() + 1));
  }
  return -1;
}

using Handsets = std::vector<std::unique_ptr<VirtualHandset>>;

// The handsets are there before the first look: only the library's side is counted.
void IdleMemory(benchmark::State& state) {
  if (ProcessFigure("VmRSS") < 0) {
    state.SkipWithError("this platform does not tell");
    return;
  }
  const auto count = static_cast<size_t>(state.range(0));
  KRAL_SetDefaultReceiveMode(1);
  for (auto _ : state) {
    Handsets phones;
    std::vector<std::unique_ptr<CallerTransport>> transports;
    for (size_t i = 0; i < count; ++i) {
      phones.push_back(std::make_unique<VirtualHandset>());
      transports.push_back(std::make_unique<CallerTransport>(*phones.back()));
    }
    const double memory = ProcessFigure("VmRSS");
    const double threads = ProcessFigure("Threads");
    std::vector<KRAL_HANDLE> handles;
    for (size_t i = 0; i < count; ++i) {
      handles.push_back(ConnectInProcess(static_cast<uint32_t>(i + 1), *transports[i]));
      if (KRAL_IsPhoneConnected(handles.back()) == 0) state.SkipWithError("no answer");
    }
    const auto connections = static_cast<double>(count);
    state.counters["KiB_each"] = (ProcessFigure("VmRSS") - memory) / connections;
    state.counters["threads_each"] = (ProcessFigure("Threads") - threads) / connections;
    for (const KRAL_HANDLE handle : handles) KRAL_DisconnectServer(handle);
  }
}
BENCHMARK(IdleMemory)->ArgName("connections")->Arg(1)->Arg(50)->Iterations(1);

// Processor time of the whole process, the handsets' side of the cables included.
void IdleProcessorOverPty(benchmark::State& state) {
  std::vector<std::unique_ptr<Station>> stations;
  for (int i = 0; i < 50; ++i) {
    stations.push_back(
        std::make_unique<Station>(kFirstPort + i, bench::Cable::kPty, static_cast<uint8_t>(state.range(0))));
  }
  for (const auto& station : stations) {
    if (KRAL_IsPhoneConnected(station->handle()) == 0) {
      state.SkipWithError("no answer");
      return;
    }
  }
  for (auto _ : state) {
    const std::clock_t processor = std::clock();
    const auto start = steady_clock::now();
    std::this_thread::sleep_for(std::chrono::seconds(3));
    const double used = static_cast<double>(std::clock() - processor) * 1e6 / CLOCKS_PER_SEC;
    const double passed = std::chrono::duration<double, std::micro>(steady_clock::now() - start).count();
    state.counters["percent_of_a_core"] = 100 * used / passed;
  }
}
BENCHMARK(IdleProcessorOverPty)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(1)->UseRealTime();

// --- Flood ----------------------------------------------------------------------------------------------------------

// Log packets of 200 bytes, as fast as they are read; a number of them at a time.
class FloodSource {
 public:
  FloodSource() {
    handset::Bytes payload(198);
    for (size_t i = 0; i < payload.size(); ++i) payload[i] = static_cast<uint8_t>(i * 37);
    payload[0] = 16;
    const handset::Bytes frame = handset::EncodeFrame(payload);
    frame_size_ = frame.size();
    while (frames_.size() + frame.size() <= 40960) frames_.insert(frames_.end(), frame.begin(), frame.end());
  }

  void Release(size_t packets) { left_ = packets; }
  uintptr_t context() const { return reinterpret_cast<uintptr_t>(this); }

  static uint32_t KRAL_CALL Send(uintptr_t, uintptr_t, uint32_t, const uint8_t*, uint32_t*) { return 0; }
  static uint32_t KRAL_CALL Receive(uintptr_t context, uintptr_t, uint32_t* count, uint8_t* buffer) {
    auto& source = *reinterpret_cast<FloodSource*>(context);
    const size_t packets =
        std::min<size_t>(source.left_, std::min<size_t>(*count, source.frames_.size()) / source.frame_size_);
    source.left_ -= packets;
    *count = static_cast<uint32_t>(packets * source.frame_size_);
    std::copy_n(source.frames_.begin(), *count, buffer);
    return 0;
  }
  static uint32_t KRAL_CALL Flush(uintptr_t, uintptr_t) { return 0; }

 private:
  handset::Bytes frames_;
  size_t frame_size_ = 0;
  std::atomic<size_t> left_{0};
};

void Flood(benchmark::State& state) {
  constexpr int64_t kPackets = 100000;
  KRAL_SetDefaultReceiveMode(static_cast<uint8_t>(state.range(0)));
  FloodSource source;
  const KRAL_HANDLE handle = KRAL_ConnectServer_UserDefinedTransport(
      kFirstPort, 0, source.context(), &FloodSource::Send, &FloodSource::Receive, &FloodSource::Flush);
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  phone->sorter().SetCollection(true);
  PacketQueue& queue = phone->asynchronous();
  for (auto _ : state) {
    source.Release(static_cast<size_t>(kPackets));
    // The reader drains as the flood comes; what it is late for counts as arrived, and is told.
    uint64_t taken = 0;
    const uint64_t dropped = queue.dropped();
    while (taken + (queue.dropped() - dropped) < static_cast<uint64_t>(kPackets)) {
      if (queue.PopWithin(std::chrono::milliseconds(100))) ++taken;
    }
    state.counters["dropped"] = static_cast<double>(queue.dropped() - dropped);
  }
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations()) * kPackets);
  KRAL_DisconnectServer(handle);
}
BENCHMARK(Flood)->ArgName("mode")->Arg(0)->Arg(1)->UseRealTime();

}  // namespace
