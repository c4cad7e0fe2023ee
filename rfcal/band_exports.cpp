// The exported band functions. They check the channel lists; the rules are CBandHelper's.
#include "kral/band.h"

#include "rfcal/bands/band_channels.h"
#include "rfcal/bands/band_helper.h"

namespace kral {
namespace {

constexpr double kNotAChannel = 0.0;

const CChannelDefinition* ListOf(uint16_t band, uint8_t direction) {
  const BandChannels* row = FindBandChannels(band);
  if (row == nullptr) return nullptr;
  switch (direction) {
    case KRAL_BAND_ANY_DIRECTION:
      return &row->any;
    case KRAL_BAND_UPLINK:
      return &row->uplink;
    case KRAL_BAND_DOWNLINK:
      return &row->downlink;
    default:
      return nullptr;
  }
}

}  // namespace
}  // namespace kral

using namespace kral;

extern "C" double KRAL_CALL KRAL_Band_Helper_CalculateULFrequency(uint16_t band, int32_t channel) try {
  const CBandHelper& helper = CBandHelper::Instance();
  return helper.IsULChannel(band, channel) ? helper.CalculateULFrequency(band, channel) : kNotAChannel;
} catch (...) {
  return kNotAChannel;
}

extern "C" double KRAL_CALL KRAL_Band_Helper_CalculateDLFrequency(uint16_t band, int32_t channel) try {
  const CBandHelper& helper = CBandHelper::Instance();
  return helper.IsDLChannel(band, channel) ? helper.CalculateDLFrequency(band, channel) : kNotAChannel;
} catch (...) {
  return kNotAChannel;
}

extern "C" uint32_t KRAL_CALL KRAL_Band_Helper_GetBandCount(void) {
  return static_cast<uint32_t>(AllBandChannels().size());
}

extern "C" uint8_t KRAL_CALL KRAL_Band_Helper_GetBand(uint32_t index, uint16_t* band) {
  if (band == nullptr || index >= AllBandChannels().size()) return 0;
  *band = AllBandChannels()[index].band;
  return 1;
}

extern "C" uint8_t KRAL_CALL KRAL_Band_Helper_GetBandName(uint16_t band, char* name, uint32_t size) {
  if (name == nullptr) return 0;
  return BandName(band, {name, size}) ? 1 : 0;
}

extern "C" uint8_t KRAL_CALL KRAL_Band_Helper_GetBandRange(uint16_t band, uint8_t direction, uint32_t index,
                                                           int32_t* first, int32_t* last) {
  const CChannelDefinition* list = ListOf(band, direction);
  if (list == nullptr || index >= list->ranges().size() || first == nullptr || last == nullptr) return 0;
  *first = list->ranges()[index].first;
  *last = list->ranges()[index].last;
  return 1;
}
