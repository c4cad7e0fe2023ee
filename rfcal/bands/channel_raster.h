// The channel rasters of WCDMA and LTE: what carrier a channel number stands for in its band.
#ifndef KRAL_RFCAL_BANDS_CHANNEL_RASTER_H
#define KRAL_RFCAL_BANDS_CHANNEL_RASTER_H

#include <cstdint>
#include <optional>

namespace kral {

enum class LinkDirection { kUplink, kDownlink };

// The carrier in MHz, correctly rounded; nothing for a band without a row. The direction tells how the number is
// read: some bands use the same numbers for uplink and downlink channels. The number is not checked against the
// lists of the band.
std::optional<double> WcdmaCarrier(uint16_t band, int32_t channel, LinkDirection direction);
std::optional<double> LteCarrier(uint16_t band, int32_t channel, LinkDirection direction);

}  // namespace kral

#endif
