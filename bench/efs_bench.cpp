// File transfers and listings, as a share of what their packets cost when each is sent and awaited by itself: "share"
// is the time of the bare packets over that of the transfer, 1 being perfect.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <fstream>
#include <string>
#include <vector>

#include "bench/support/station.h"
#include "kral/efs.h"

namespace {

using namespace kral;
using handset::Bytes;
using handset::ByteView;
using handset::ByteWriter;
using std::chrono::steady_clock;

constexpr int kPort = 240;
constexpr uint32_t kFileSize = 1 << 20;
constexpr uint32_t kTimeOutMs = 4000;
constexpr uint32_t kEntries = 10000;

struct PacketSizes {
  uint16_t read;
  uint16_t write;
};
constexpr PacketSizes kSizes[] = {{536, 524}, {4091, 6143}};  // the defaults, and what is found by itself

class Station : public bench::Station {
 public:
  Station(int64_t receive_mode, bool over_pty)
      : bench::Station(kPort, over_pty ? bench::Cable::kPty : bench::Cable::kPolled,
                       static_cast<uint8_t>(receive_mode)) {}

  // One packet sent and awaited by itself.
  bool Exchange(const Bytes& request) {
    auto size = static_cast<uint16_t>(reply_.size());
    return KRAL_SendSync(handle(), static_cast<uint16_t>(request.size()), request.data(), &size, reply_.data(),
                         kTimeOutMs) != 0;
  }

 private:
  Bytes reply_ = Bytes(4096);
};

template <class Work>
double SecondsOf(benchmark::State& state, const Work& work) {
  const auto start = steady_clock::now();
  if (!work()) state.SkipWithError("a request failed");
  return std::chrono::duration<double>(steady_clock::now() - start).count();
}

Bytes Contents() {
  Bytes bytes(kFileSize);
  uint32_t state = 1;
  for (uint8_t& byte : bytes) byte = static_cast<uint8_t>((state = state * 1664525u + 1013904223u) >> 24);
  return bytes;
}

ByteWriter Request(uint8_t command) {
  return ByteWriter().U8(75).U8(19).U16(command);
}

// Runs a transfer and the same packets bare, one after the other, so that both see the same machine.
template <class Transfer>
void Compare(benchmark::State& state, Station& station, const std::vector<Bytes>& packets, const Transfer& transfer) {
  double bare = 0;
  double whole = 0;
  for (auto _ : state) {
    bare += SecondsOf(state, [&] {
      return std::ranges::all_of(packets, [&](const Bytes& packet) { return station.Exchange(packet); });
    });
    const uint64_t before = station.phone().request_count();
    whole += SecondsOf(state, transfer);
    if (station.phone().request_count() - before != packets.size()) state.SkipWithError("another number of packets");
  }
  const auto count = static_cast<double>(packets.size());
  state.counters["share"] = bare / whole;
  state.counters["packets"] = count;
  state.counters["round_trip_us"] = bare * 1e6 / count / static_cast<double>(state.iterations());
}

// --- Transfers: receive mode, packet sizes, cable
// --------------------------------------------------------------------------

// A new handset gives descriptor 0, time and again.
void Put(benchmark::State& state) {
  Station station(state.range(0), state.range(2) != 0);
  const PacketSizes sizes = kSizes[state.range(1)];
  KRAL_SetEfsAutomaticPacketSize(station.handle(), static_cast<uint8_t>(state.range(1)));
  const Bytes contents = Contents();
  std::vector<Bytes> packets{Request(19).Terminated("/").Take(), Request(15).Terminated("/file").Take(),
                             Request(2).U32(0x241).U32(0666).Terminated("/file").Take()};
  const uint32_t chunk = sizes.write - 12u;
  for (uint32_t offset = 0; offset < kFileSize; offset += chunk) {
    const auto data = ByteView(contents).subspan(offset, std::min(chunk, kFileSize - offset));
    packets.push_back(Request(5).U32(0).U32(offset).Raw(data).Take());
  }
  packets.push_back(Request(3).U32(0).Take());
  Compare(state, station, packets,
          [&] { return KRAL_EfsWriteMem(station.handle(), contents.data(), kFileSize, "/file") == 1; });
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * kFileSize);
}

void Get(benchmark::State& state) {
  Station station(state.range(0), state.range(2) != 0);
  const PacketSizes sizes = kSizes[state.range(1)];
  KRAL_SetEfsAutomaticPacketSize(station.handle(), static_cast<uint8_t>(state.range(1)));
  station.phone().efs().AddFile("/file", Contents());
  std::vector<Bytes> packets{Request(15).Terminated("/file").Take(),
                             Request(2).U32(0).U32(0444).Terminated("/file").Take()};
  const uint32_t chunk = sizes.read - 20u;
  for (uint32_t offset = 0; offset <= kFileSize; offset += chunk) {
    packets.push_back(Request(4).U32(0).U32(chunk).U32(offset).Take());
  }
  packets.push_back(Request(3).U32(0).Take());
  Bytes back(kFileSize);
  Compare(state, station, packets, [&] {
    uint32_t size = kFileSize;
    return KRAL_EfsReadMem(station.handle(), "/file", back.data(), &size) == 1 && size == kFileSize;
  });
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * kFileSize);
}

void InAllModes(benchmark::internal::Benchmark* transfer) {
  transfer->ArgNames({"mode", "largest", "pty"})->ArgsProduct({{0, 1}, {0, 1}, {0, 1}})->Iterations(2)->UseRealTime();
}
BENCHMARK(Put)->Apply(InAllModes);
BENCHMARK(Get)->Apply(InAllModes);

// --- Listing --------------------------------------------------------------------------------------------------------

// What the system says that this process has in memory; negative where it keeps no such account.
double ResidentKib() {
  std::ifstream status("/proc/self/status");
  for (std::string line; std::getline(status, line);) {
    if (line.starts_with("VmRSS:")) return std::stod(line.substr(6));
  }
  return -1;
}

void ListTenThousand(benchmark::State& state) {
  Station station(state.range(0), false);
  for (uint32_t i = 0; i < kEntries; ++i) station.phone().efs().AddFile("/d/" + std::to_string(100000 + i), {});
  std::vector<Bytes> packets{Request(11).Terminated("/d").Take()};
  // The handset numbers its directory handles from 1.
  for (uint32_t sequence = 1; sequence <= kEntries + 1; ++sequence) {
    packets.push_back(Request(12).U32(1).U32(sequence).Take());
  }
  packets.push_back(Request(13).U32(1).Take());
  std::vector<KRAL_EFS_ENTRY> entries(kEntries);
  const double before = ResidentKib();
  Compare(state, station, packets, [&] {
    uint32_t count = kEntries;
    return KRAL_EfsDirectory(station.handle(), "/d", KRAL_EFS_FILTER_ALL, entries.data(), &count) == 1 &&
           count == kEntries;
  });
  if (before >= 0) state.counters["KiB_grown"] = ResidentKib() - before;
  state.SetItemsProcessed(static_cast<int64_t>(state.iterations()) * kEntries);
}
BENCHMARK(ListTenThousand)->ArgName("mode")->Arg(0)->Arg(1)->Iterations(1)->UseRealTime();

}  // namespace
