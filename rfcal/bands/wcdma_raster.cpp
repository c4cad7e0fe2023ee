// The WCDMA channel raster, after 3GPP TS 25.101, clause 5.4.3.
#include <algorithm>
#include <array>

#include "rfcal/bands/channel_raster.h"

namespace kral {
namespace {

// F = 0.2 MHz * UARFCN + F_offset. The offsets, in MHz, are those of table 5.1A (general UARFCN), which gives each
// band its own for both directions; the duplex offset is thereby a property of the band.
struct WcdmaRow {
  uint16_t band;
  int16_t uplink_offset;
  int16_t downlink_offset;
};

constexpr auto kWcdmaRows = std::to_array<WcdmaRow>({
    {100, 0, 0},        // I, duplex 190 MHz
    {101, 0, 0},        // II, 80
    {102, 1525, 1575},  // III, 95
    {103, 1450, 1805},  // IV, 400
    {104, 0, 0},        // V, 45
    {105, 0, 0},        // VI, 45
    {106, 2100, 2175},  // VII, 120
    {107, 340, 340},    // VIII, 45
    {108, 0, 0},        // IX, 95
    {109, 1135, 1490},  // X, 400
    {110, 733, 736},    // XI, 48
    {118, 770, 735},    // XIX, 45
});

static_assert(std::ranges::is_sorted(kWcdmaRows, std::ranges::less_equal{}, &WcdmaRow::band));

}  // namespace

std::optional<double> WcdmaCarrier(uint16_t band, int32_t channel, LinkDirection direction) {
  const auto* row = std::ranges::lower_bound(kWcdmaRows, band, {}, &WcdmaRow::band);
  if (row == kWcdmaRows.end() || row->band != band) return std::nullopt;
  const int64_t offset = direction == LinkDirection::kUplink ? row->uplink_offset : row->downlink_offset;
  // One division of whole numbers: the double nearest to the decimal fraction, on every machine.
  return static_cast<double>(channel + 5 * offset) / 5.0;
}

}  // namespace kral
