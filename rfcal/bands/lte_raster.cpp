// The LTE channel raster, after 3GPP TS 36.101, clause 5.7.3.
#include <algorithm>
#include <array>

#include "rfcal/bands/channel_raster.h"

namespace kral {
namespace {

// F = F_low + 0.1 MHz * (EARFCN - N_offs), table 5.7.3-1. The low edges are in steps of 100 kHz.
struct LteRow {
  uint16_t band;
  int32_t uplink_low;
  int32_t uplink_first;
  int32_t downlink_low;
  int32_t downlink_first;
};

// A TDD band has one raster for both directions.
constexpr LteRow Tdd(uint16_t band, int32_t low, int32_t first) {
  return {band, low, first, low, first};
}

constexpr auto kLteRows = std::to_array<LteRow>({
    {900, 19200, 18000, 21100, 0},     // band 1
    {901, 18500, 18600, 19300, 600},   // 2
    {902, 17100, 19200, 18050, 1200},  // 3
    {903, 17100, 19950, 21100, 1950},  // 4
    {904, 8240, 20400, 8690, 2400},    // 5
    {905, 8300, 20650, 8750, 2650},    // 6
    {906, 25000, 20750, 26200, 2750},  // 7
    {907, 8800, 21450, 9250, 3450},    // 8
    {908, 17499, 21800, 18449, 3800},  // 9
    {909, 17100, 22150, 21100, 4150},  // 10
    {910, 14279, 22750, 14759, 4750},  // 11
    // Band 12 began at 5000 (728 MHz) before the table cut its first 1 MHz: same raster, and the list still has it.
    {911, 6990, 23010, 7290, 5010},    // 12
    {912, 7770, 23180, 7460, 5180},    // 13
    {913, 7880, 23280, 7580, 5280},    // 14
    {916, 7040, 23730, 7340, 5730},    // 17
    {917, 8150, 23850, 8600, 5850},    // 18
    {918, 8300, 24000, 8750, 6000},    // 19
    {919, 8320, 24150, 7910, 6150},    // 20
    {920, 14479, 24450, 14959, 6450},  // 21
    {921, 34100, 24600, 35100, 6600},  // 22
    {922, 20000, 25500, 21800, 7500},  // 23
    {923, 16265, 25700, 15250, 7700},  // 24
    {924, 18500, 26040, 19300, 8040},  // 25
    {925, 8140, 26690, 8590, 8690},    // 26
    {926, 8070, 27040, 8520, 9040},    // 27
    {927, 7030, 27210, 7580, 9210},    // 28
    // Band 29 is downlink only: both directions give its downlink carrier.
    {928, 7170, 9660, 7170, 9660},     // 29
    {929, 23050, 27660, 23500, 9770},  // 30
    {930, 4525, 27760, 4625, 9870},    // 31
    Tdd(932, 19000, 36000),            // 33
    Tdd(933, 20100, 36200),            // 34
    Tdd(934, 18500, 36350),            // 35
    Tdd(935, 19300, 36950),            // 36
    Tdd(936, 19100, 37550),            // 37
    Tdd(937, 25700, 37750),            // 38
    Tdd(938, 18800, 38250),            // 39
    Tdd(939, 23000, 38650),            // 40
    Tdd(940, 24960, 39650),            // 41
});

static_assert(std::ranges::is_sorted(kLteRows, std::ranges::less_equal{}, &LteRow::band));

}  // namespace

std::optional<double> LteCarrier(uint16_t band, int32_t channel, LinkDirection direction) {
  const auto* row = std::ranges::lower_bound(kLteRows, band, {}, &LteRow::band);
  if (row == kLteRows.end() || row->band != band) return std::nullopt;
  const bool up = direction == LinkDirection::kUplink;
  const int64_t steps = int64_t{channel} - (up ? row->uplink_first : row->downlink_first);
  // One division of whole numbers: the double nearest to the decimal fraction, on every machine.
  return static_cast<double>((up ? row->uplink_low : row->downlink_low) + steps) / 10.0;
}

}  // namespace kral
