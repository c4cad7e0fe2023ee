// What a channel lookup costs: through the exported calls, over shuffled channels of every band.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <vector>

#include "kral/band.h"

namespace {

struct Query {
  uint16_t band;
  int32_t channel;
};

// Shuffled, so that no branch or row can be foreseen: the worst order for a search.
std::vector<Query> AllQueries(uint8_t direction) {
  std::vector<Query> queries;
  std::mt19937 random(1);
  for (uint32_t index = 0; index < KRAL_Band_Helper_GetBandCount(); ++index) {
    uint16_t band = 0;
    KRAL_Band_Helper_GetBand(index, &band);
    int32_t first = 0;
    int32_t last = 0;
    for (uint32_t range = 0; KRAL_Band_Helper_GetBandRange(band, direction, range, &first, &last); ++range) {
      std::uniform_int_distribution<int32_t> channel(first, last);
      for (int i = 0; i < 32; ++i) queries.push_back({band, channel(random)});
    }
  }
  std::ranges::shuffle(queries, random);
  return queries;
}

void Run(benchmark::State& state, uint8_t direction, double(KRAL_CALL* calculate)(uint16_t, int32_t)) {
  const std::vector<Query> queries = AllQueries(direction);
  size_t next = 0;
  for (auto _ : state) {
    const Query& query = queries[next];
    benchmark::DoNotOptimize(calculate(query.band, query.channel));
    if (++next == queries.size()) next = 0;
  }
  state.SetItemsProcessed(state.iterations());
}

void BandUplink(benchmark::State& state) {
  Run(state, KRAL_BAND_UPLINK, KRAL_Band_Helper_CalculateULFrequency);
}
BENCHMARK(BandUplink);

void BandDownlink(benchmark::State& state) {
  Run(state, KRAL_BAND_DOWNLINK, KRAL_Band_Helper_CalculateDLFrequency);
}
BENCHMARK(BandDownlink);

}  // namespace
