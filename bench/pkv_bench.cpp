// Backups and restores against what their round trips take, and PKV files of growing size.
#include <benchmark/benchmark.h>

#include <array>
#include <chrono>
#include <filesystem>
#include <string>

#include "bench/support/station.h"
#include "kral/nv.h"
#include "kral/pkv.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/temp_folder.h"

namespace {

using namespace kral;
using std::chrono::steady_clock;

constexpr uint16_t kItems = 3000;
constexpr uint16_t kPerPacket = 9;
constexpr int kPort = 210;
constexpr size_t kRecord = 128;

double SecondsSince(steady_clock::time_point start) {
  return std::chrono::duration<double>(steady_clock::now() - start).count();
}

// A handset with a value in every item.
class Station : public bench::Station {
 public:
  Station(uint8_t receive_mode, bool over_pty)
      : bench::Station(kPort, over_pty ? bench::Cable::kPty : bench::Cable::kPolled, receive_mode) {
    for (uint16_t id = 1; id < kItems; ++id) {
      phone().nv().Set(id, handset::Bytes{static_cast<uint8_t>(id), static_cast<uint8_t>(id >> 8), 1});
    }
    KRAL_PKV_ConfigureBackup(handle(), 0, kItems - 1, 1);
  }

  uint64_t requests() { return phone().request_count(); }

  // What the same requests take one by one, through the functions for single ones.
  double SecondsOfReads(int count) const {
    std::array<uint8_t, kRecord> data{};
    const auto start = steady_clock::now();
    for (int i = 0; i < count; ++i) {
      uint16_t status = 0;
      KRAL_DIAG_NV_READ_F(handle(), static_cast<uint16_t>(1 + i % kPerPacket), data.data(), kRecord, &status);
    }
    return SecondsSince(start);
  }
  double SecondsOfBatches(int count) const {
    const std::array<uint8_t, kRecord> data{1};
    const auto start = steady_clock::now();
    for (int i = 0; i < count; ++i) {
      KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
      for (uint16_t id = 1; id <= kPerPacket; ++id) {
        uint16_t status = 0;
        KRAL_DIAG_NV_WRITE_F(handle(), 40000u + id, data.data(), kRecord, &status);
      }
      KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle(), nullptr, nullptr, nullptr);
    }
    return SecondsSince(start);
  }
};

using Job = uint8_t(KRAL_CALL*)(KRAL_HANDLE handle, const char* file, uint32_t* status);

// The share of the time that its round trips alone would have taken. Those are measured before and after.
void Run(benchmark::State& state, Job job, bool batches) {
  const test::TempFolder folder;
  const std::string path = folder.Path("phone.pkv");
  Station station(static_cast<uint8_t>(state.range(0)), state.range(1) != 0);
  uint32_t status = 0;
  if (KRAL_BackupNVFromMobileToPKV(station.handle(), path.c_str(), &status) == 0) state.SkipWithError("no backup");
  const int packets = batches ? (kItems + kPerPacket - 1) / kPerPacket : 0;
  double ideal = 0;
  double taken = 0;
  uint64_t requests = 0;
  for (auto _ : state) {
    const double before = station.SecondsOfReads(kItems / 2) + station.SecondsOfBatches(packets / 2);
    const uint64_t count = station.requests();
    const auto start = steady_clock::now();
    if (job(station.handle(), path.c_str(), &status) == 0) state.SkipWithError("the job failed");
    const double seconds = SecondsSince(start);
    requests = station.requests() - count;
    taken += seconds;
    ideal += before + station.SecondsOfReads(kItems / 2) + station.SecondsOfBatches(packets - packets / 2);
    state.SetIterationTime(seconds);
  }
  state.counters["share"] = ideal / taken;
  state.counters["requests"] = static_cast<double>(requests);
  state.SetItemsProcessed(state.iterations() * kItems);
}

void BackupOf3000(benchmark::State& state) {
  Run(state, KRAL_BackupNVFromMobileToPKV, false);
}
void RestoreOf3000(benchmark::State& state) {
  Run(state, KRAL_RestoreNVFromPKV, true);
}
void InAllModes(benchmark::internal::Benchmark* job) {
  job->ArgNames({"mode", "pty"})->ArgsProduct({{0, 1}, {0, 1}})->UseManualTime()->Unit(benchmark::kMillisecond);
}
BENCHMARK(BackupOf3000)->Apply(InAllModes);
BENCHMARK(RestoreOf3000)->Apply(InAllModes);

// --- Files ----------------------------------------------------------------------------------------------------------

pkv::PkvSet SetOf(int64_t count) {
  pkv::PkvSet set;
  for (int64_t i = 0; i < count; ++i) {
    pkv::PkvNvItem item{.id = static_cast<uint16_t>(i)};
    item.data.fill(static_cast<uint8_t>(i));
    set.items.push_back(item);
  }
  return set;
}

// A program loads a backup once: nothing of it is in the caches, whether it is small enough for them or not.
void EmptyCaches() {
  constexpr size_t kMoreThanCaches = size_t{64} << 20;
  static std::vector<uint8_t> other(kMoreThanCaches);
  for (size_t at = 0; at < other.size(); at += 64) ++other[at];
}

void LoadFile(benchmark::State& state, pkv::PkvWriter writer) {
  const test::TempFolder folder;
  const std::string path = folder.Path("items.pkv");
  if (!pkv::WritePkv(path, SetOf(state.range(0)), nullptr, writer).done()) state.SkipWithError("not written");
  for (auto _ : state) {
    EmptyCaches();
    pkv::PkvSet set;
    const auto start = std::chrono::steady_clock::now();
    if (!pkv::ReadPkv(path, set).done() || static_cast<int64_t>(set.items.size()) != state.range(0))
      state.SkipWithError("not read");
    state.SetIterationTime(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
  state.SetComplexityN(state.range(0));
}

void LoadArray(benchmark::State& state) {
  LoadFile(state, pkv::PkvWriter::kStorageClasses);
}
void LoadNumberedItems(benchmark::State& state) {
  LoadFile(state, pkv::PkvWriter::kVarnPkvFile);
}
void OfManyItems(benchmark::internal::Benchmark* job) {
  job->Arg(5000)->Arg(10000)->Arg(20000)->Arg(60000)->UseManualTime()->Unit(benchmark::kMillisecond)->Complexity();
}
BENCHMARK(LoadArray)->Apply(OfManyItems);
BENCHMARK(LoadNumberedItems)->Apply(OfManyItems);

void WriteFile(benchmark::State& state, pkv::PkvWriter writer) {
  const test::TempFolder folder;
  const pkv::PkvSet set = SetOf(state.range(0));
  for (auto _ : state) {
    if (!pkv::WritePkv(folder.Path("items.pkv"), set, nullptr, writer).done()) state.SkipWithError("not written");
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}

void WriteArray(benchmark::State& state) {
  WriteFile(state, pkv::PkvWriter::kStorageClasses);
}
void WriteNumberedItems(benchmark::State& state) {
  WriteFile(state, pkv::PkvWriter::kVarnPkvFile);
}
BENCHMARK(WriteArray)->Arg(20000)->Unit(benchmark::kMillisecond);
BENCHMARK(WriteNumberedItems)->Arg(20000)->Unit(benchmark::kMillisecond);

}  // namespace
