// Which channels each band has: in any direction, for an uplink and for a downlink calculation.
#ifndef KRAL_RFCAL_BANDS_BAND_CHANNELS_H
#define KRAL_RFCAL_BANDS_BAND_CHANNELS_H

#include <cstdint>
#include <span>

#include "rfcal/bands/channel_definition.h"

namespace kral {

struct BandChannels {
  uint16_t band;
  CChannelDefinition any;
  CChannelDefinition uplink;
  CChannelDefinition downlink;

  constexpr BandChannels(uint16_t id, CChannelDefinition any_direction, CChannelDefinition up, CChannelDefinition down)
      : band(id), any(any_direction), uplink(up), downlink(down) {}
  // A band whose channel number names a channel pair, or one carrier: the same list in all three places.
  constexpr BandChannels(uint16_t id, CChannelDefinition all) : BandChannels(id, all, all, all) {}
};

// Every band, in rising order of its id.
std::span<const BandChannels> AllBandChannels();

// The row of a band; null for a band without channels.
const BandChannels* FindBandChannels(uint16_t band);

// Writes a readable name ("LTE band 4") into `name`, cut to fit and terminated; nothing for a band without channels.
bool BandName(uint16_t band, std::span<char> name);

}  // namespace kral

#endif
