// The rules from channel to frequency of every band but the WCDMA and LTE rasters, which have their own files.
#include "rfcal/bands/band_helper.h"

#include <algorithm>
#include <array>
#include <functional>
#include <limits>
#include <optional>
#include <string>

#include "rfcal/bands/band_channels.h"
#include "rfcal/bands/channel_raster.h"

namespace kral {
namespace {

constexpr int32_t kLowest = std::numeric_limits<int32_t>::min();
constexpr int32_t kHighest = std::numeric_limits<int32_t>::max();

// One straight piece of a band's uplink rule: base + step * (channel - origin).
struct UplinkPiece {
  uint16_t band;
  ChannelRange channels;
  double base;
  double step;
  int32_t origin;
};

constexpr ChannelRange kAll{kLowest, kHighest};

// The origins are uneven in places (200, 205, 211): not a slip, keep them. Bands with one piece take any number here;
// bands with several throw between the pieces. Bands at 0.0 have no uplink calculation.
constexpr auto kUplinkPieces = std::to_array<UplinkPiece>({
    {0, {kLowest, 124}, 890, 0.2, 0},
    {0, {975, 1023}, 890, 0.2, 1024},
    {1, kAll, 890, 0.2, 0},
    {2, kAll, 1710.2, 0.2, 512},
    {3, kAll, 1850.2, 0.2, 512},
    {4, kAll, 824.2, 0.2, 128},
    {200, {1, 799}, 825, 0.03, 0},
    {200, {991, 1023}, 825, 0.03, 1023},
    {200, {1024, 1323}, 815.04, 0.03, 1024},
    {201, kAll, 1850, 0.05, 0},
    {202, kAll, 0, 0, 0},
    {203, {1, 799}, 915, 0.0125, 0},
    {203, {801, 1039}, 898, 0.0125, 800},
    {203, {1041, 1199}, 887, 0.0125, 1040},
    {203, {1201, 1600}, 893, 0.0125, 1200},
    {204, kAll, 1750, 0.05, 0},
    {205, {1, 400}, 450, 0.025, 1},
    {205, {472, 871}, 410, 0.025, 472},
    {205, {1039, 1473}, 451.01, 0.02, 1024},
    {205, {1536, 1715}, 479, 0.025, 1536},
    {205, {1792, 2016}, 479, 0.02, 1792},
    {206, kAll, 1920, 0.05, 0},
    {207, kAll, 0, 0, 0},
    {208, kAll, 0, 0, 0},
    {209, kAll, 0, 0, 0},
    {210, {kLowest, 719}, 806, 0.025, 0},
    {210, {720, 919}, 896, 0.025, 720},
    {211, {1, 400}, 450, 0.025, 1},
    {211, {539, 871}, 411, 0.025, 512},
    {211, {1536, 1715}, 479, 0.025, 1536},
    {214, kAll, 1850, 0.05, 0},
    {215, kAll, 1710, 0.05, 0},
    {300, kAll, 2402, 1, 0},
    {700, kAll, 1575.42, 0, 0},
});

// By band, and within a band by channel without overlap.
constexpr bool Precedes(const UplinkPiece& a, const UplinkPiece& b) {
  return a.band != b.band ? a.band < b.band : a.channels.last < b.channels.first;
}
static_assert(std::ranges::adjacent_find(kUplinkPieces, std::not_fn(Precedes)) == kUplinkPieces.end());

// What the downlink carrier lies above the uplink carrier.
struct Duplex {
  uint16_t band;
  double offset;
};

constexpr double kNoDownlink = 0;  // 202, 207, 208, 209: the uplink value, 0.0, stays

constexpr auto kDuplex = std::to_array<Duplex>({
    {0, 45},
    {1, 45},
    {2, 95},
    {3, 80},
    {4, 45},
    {200, 45},
    {201, 80},
    {202, kNoDownlink},
    {203, -55},
    {204, 90},
    {205, 10},
    {206, 190},
    {207, kNoDownlink},
    {208, kNoDownlink},
    {209, kNoDownlink},
    {210, 45},
    {211, 10},
    {214, 80},
    {215, 400},
    {300, 0},
    {700, 0},
});

static_assert(std::ranges::is_sorted(kDuplex, std::ranges::less_equal{}, &Duplex::band));

constexpr bool Within(uint16_t band, uint16_t first, uint16_t last) {
  return first <= band && band <= last;
}

constexpr bool IsWcdma(uint16_t band) {
  return Within(band, 100, 110) || band == 118;
}
constexpr bool IsLte(uint16_t band) {
  return Within(band, 900, 930) || Within(band, 932, 940);
}
// One frequency for both directions.
constexpr bool IsTdScdma(uint16_t band) {
  return Within(band, 1000, 1010);
}
constexpr bool IsLookup(uint16_t band) {
  return Within(band, 1100, 1101);
}
constexpr bool IsReceiveOnly(uint16_t band) {
  return Within(band, 400, 403) || Within(band, 600, 611) || Within(band, 800, 801);
}

// The channel list of bands 1100 and 1101 is empty.
constexpr double kNotListed = -1.0;
double LookUpChannel(uint16_t, int32_t) {
  return kNotListed;
}

std::string InvalidChannel(uint16_t band, int32_t channel) {
  return "Invalid frequency band \"" + std::to_string(band) + "\" or channel \"" + std::to_string(channel) + "\"";
}

// Nothing for a band that has no pieces.
std::optional<double> PieceFrequency(uint16_t band, int32_t channel) {
  const auto* piece = std::ranges::lower_bound(kUplinkPieces, band, {}, &UplinkPiece::band);
  if (piece == kUplinkPieces.end() || piece->band != band) return std::nullopt;
  for (; piece != kUplinkPieces.end() && piece->band == band; ++piece) {
    if (piece->channels.Holds(channel))
      return piece->base + piece->step * (static_cast<double>(channel) - piece->origin);
  }
  throw CBandHelper::Exception(InvalidChannel(band, channel));
}

// Television channels below 13, in two ranges of 6 MHz steps.
constexpr double LowTelevisionChannel(int32_t channel) {
  return 6.0 * channel + (channel <= 7 ? 149.143 : 147.143);
}

// Numbers of a million and more are the frequency itself in steps of 50 Hz.
constexpr double kDirectStep = 0.00005;
constexpr double DirectOrRaster(int32_t channel) {
  return channel >= 1'000'000 ? channel * kDirectStep : 470 + 0.05 * channel;
}

// Three bands share a raster; the second and the third lie one and two sixths of a MHz above the first.
constexpr double ThirdsRaster(uint16_t band, uint16_t first_band, double base, double step, int32_t channel,
                              int32_t first_channel) {
  return base + step * (static_cast<double>(channel) - first_channel) + (band - first_band) / 6.0;
}

double ReceiveFrequency(uint16_t band, int32_t channel) {
  switch (band) {
    case 401:
      return channel <= 12 ? LowTelevisionChannel(channel) : channel * kDirectStep;
    case 403:
      return channel <= 23 ? 1451.248 + 1.712 * channel : DirectOrRaster(channel);
    case 800:
      return channel <= 12 ? LowTelevisionChannel(channel) : 6.0 * channel + 395.143;
    case 801:
      return 6.0 * channel + (channel <= 13 ? 135.143 : 389.143);
    default:
      break;
  }
  if (band <= 402) return DirectOrRaster(channel);
  if (band <= 602) return ThirdsRaster(band, 600, 474, 8, channel, 21);
  if (band <= 605) return ThirdsRaster(band, 603, 529.5, 7, channel, 28);
  if (band <= 608) return ThirdsRaster(band, 606, 473, 6, channel, 14);
  return ThirdsRaster(band, 609, 473, 5, channel, 14);
}

}  // namespace

const CBandHelper& CBandHelper::Instance() {
  static constinit const CBandHelper helper;
  return helper;
}

bool CBandHelper::IsChannel(uint16_t band, int32_t channel) const {
  const BandChannels* row = FindBandChannels(band);
  return row != nullptr && row->any.Holds(channel);
}

bool CBandHelper::IsULChannel(uint16_t band, int32_t channel) const {
  const BandChannels* row = FindBandChannels(band);
  return row != nullptr && row->uplink.Holds(channel);
}

bool CBandHelper::IsDLChannel(uint16_t band, int32_t channel) const {
  const BandChannels* row = FindBandChannels(band);
  return row != nullptr && row->downlink.Holds(channel);
}

double CBandHelper::CalculateULFrequency(uint16_t band, int32_t channel) const {
  if (IsWcdma(band)) return WcdmaCarrier(band, channel, LinkDirection::kUplink).value_or(kNoFrequency);
  if (IsLte(band)) return LteCarrier(band, channel, LinkDirection::kUplink).value_or(kNoFrequency);
  if (IsReceiveOnly(band)) return 0.0;
  if (IsTdScdma(band)) return channel / 5.0;
  if (IsLookup(band)) {
    const double frequency = LookUpChannel(band, channel);
    if (frequency == kNotListed) throw Exception("CBandHelper::CalculateULFrequency " + InvalidChannel(band, channel));
    return frequency;
  }
  return PieceFrequency(band, channel).value_or(kNoFrequency);
}

double CBandHelper::CalculateDLFrequency(uint16_t band, int32_t channel) const {
  // A downlink channel of these names the downlink carrier, which is the paired uplink carrier plus the duplex offset
  // of the band.
  if (IsWcdma(band)) return WcdmaCarrier(band, channel, LinkDirection::kDownlink).value_or(kNoFrequency);
  if (IsLte(band)) return LteCarrier(band, channel, LinkDirection::kDownlink).value_or(kNoFrequency);
  if (IsReceiveOnly(band)) return ReceiveFrequency(band, channel);
  const double uplink = CalculateULFrequency(band, channel);
  if (IsTdScdma(band) || IsLookup(band)) return uplink;
  const auto* duplex = std::ranges::lower_bound(kDuplex, band, {}, &Duplex::band);
  if (duplex == kDuplex.end() || duplex->band != band) {
    throw Exception("Invalid/unsupported band enumeration: " + std::to_string(band));
  }
  // The upper part of band 210 has a duplex offset of its own.
  if (band == 210 && channel >= 720) return uplink + 39;
  return uplink + duplex->offset;
}

}  // namespace kral
