// What a command by definition costs beside the function that is written for it, and how long definitions take to load.
#include <benchmark/benchmark.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/support/station.h"
#include "commands/defined/definition_xml.h"
#include "kral/cmd.h"
#include "kral/ftm.h"
#include "platform/file_util.h"
#include "platform/xml_document.h"

namespace {

using namespace kral;
using bench::Cable;
using bench::Microseconds;
using bench::Percentile;
using bench::Station;

constexpr int kPort = 230;
constexpr int kTurns = 40;
constexpr int kInTurn = 100;
constexpr const char* kDefinition =
    "<CommandDefinition><Family name='RF' frame='ftm' mode='current'><Command name='SET_CHAN' id='8'><Request>"
    "<Field name='channel' type='u16'/></Request><Reply longer='1'/></Command></Family></CommandDefinition>";

bool LoadInto(KRAL_HANDLE handle) {
  const std::string path = (std::filesystem::temp_directory_path() / "kral-bench-commands.xml").string();
  const std::string_view text = kDefinition;
  if (ReplaceWholeFile(path, {reinterpret_cast<const uint8_t*>(text.data()), text.size()})) return false;
  const bool loaded = KRAL_CMD_LoadDefinitions(handle, path.c_str(), nullptr) != 0;
  std::filesystem::remove(path);
  return loaded;
}

// By turns with the written function, so that what else the machine does falls on both.
template <class Call>
void BesideTheFunction(benchmark::State& state, Station& station, const Call& call) {
  std::vector<double> times;
  std::vector<double> peer;
  for (auto _ : state) {
    for (int i = 0; i < kTurns * kInTurn; ++i) {
      const bool is_function = i / kInTurn % 2 == 0;
      const auto channel = static_cast<uint16_t>(i);
      const double time = is_function ? Microseconds([&] { return KRAL_FTM_SET_CHAN(station.handle(), channel) != 0; })
                                      : Microseconds([&] { return call(channel); });
      if (time < 0) return state.SkipWithError("no answer");
      (is_function ? peer : times).push_back(time);
    }
  }
  state.counters["p50_us"] = Percentile(times, 0.5);
  state.counters["peer_p50_us"] = Percentile(peer, 0.5);
  state.counters["over_us"] = Percentile(times, 0.5) - Percentile(peer, 0.5);
  state.counters["p50_ratio"] = Percentile(times, 0.5) / Percentile(peer, 0.5);
}

void CallPrepared(benchmark::State& state) {
  Station station(kPort, Cable::kNotifying, 1);
  station.phone().mode().SetState(handset::ModeState::kFactoryTest);
  uint32_t call = 0;
  uint32_t index = 0;
  if (!LoadInto(station.handle()) || KRAL_CMD_Prepare(station.handle(), "RF.SET_CHAN", &call) == 0 ||
      KRAL_CMD_GetFieldIndex(station.handle(), call, 0, "channel", &index) == 0) {
    return state.SkipWithError("not loaded");
  }
  BesideTheFunction(state, station, [&](uint16_t channel) {
    return KRAL_CMD_SetInteger(station.handle(), call, index, 0, channel) != 0 &&
           KRAL_CMD_Send(station.handle(), call) != 0;
  });
}
BENCHMARK(CallPrepared)->Iterations(3)->UseRealTime();

void CallByText(benchmark::State& state) {
  Station station(kPort, Cable::kNotifying, 1);
  station.phone().mode().SetState(handset::ModeState::kFactoryTest);
  if (!LoadInto(station.handle())) return state.SkipWithError("not loaded");
  BesideTheFunction(state, station, [&](uint16_t channel) {
    const std::string fields = "channel=" + std::to_string(channel);
    std::array<char, 64> reply;
    return KRAL_CMD_Call(station.handle(), "RF.SET_CHAN", fields.c_str(), reply.data(), reply.size()) != 0;
  });
}
BENCHMARK(CallByText)->Iterations(3)->UseRealTime();

void LoadCommands(benchmark::State& state) {
  std::string text = "<CommandDefinition><Family name='F' frame='subsystem' subsystem='250'>";
  for (int64_t i = 0; i < state.range(0); ++i) {
    text += "<Command name='C" + std::to_string(i) + "' id='" + std::to_string(i % 65536) +
            "' doc='Sets something, and tells what it was'><Request>"
            "<Field name='channel' type='u16' max='14' doc='Channel number'/><Field name='mode' type='u8' default='1'/>"
            "<Field name='level' type='s16' min='-4000' max='3000' unit='0.01 dBm'/></Request><Reply>"
            "<Field name='status' type='u16' success='0'/><Field name='level' type='s16' unit='0.01 dBm'/></Reply>"
            "</Command>";
  }
  text += "</Family></CommandDefinition>";
  const std::span<const uint8_t> document(reinterpret_cast<const uint8_t*>(text.data()), text.size());
  std::vector<double> times;
  std::vector<double> parsing;
  for (auto _ : state) {
    times.push_back(Microseconds([&] {
      std::vector<defined::CommandPtr> commands;
      defined::Problem problem;
      defined::Definitions definitions;
      if (!defined::ReadDefinitions(document, definitions, commands, problem)) return false;
      definitions.Add(std::move(commands));
      return definitions.count() == static_cast<size_t>(state.range(0));
    }));
    if (times.back() < 0) return state.SkipWithError("the definitions cannot be read");
    state.PauseTiming();
    std::string problem;
    parsing.push_back(Microseconds([&] {
      XmlElement root;
      return ParseXml(document, root, problem) == XmlResult::kOk;
    }));
    state.ResumeTiming();
  }
  state.counters["times_parsing"] = Percentile(times, 0.5) / Percentile(parsing, 0.5);
}
BENCHMARK(LoadCommands)->Arg(1250)->Arg(5000)->Unit(benchmark::kMillisecond);

}  // namespace
