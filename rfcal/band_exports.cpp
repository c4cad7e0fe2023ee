// The exported band functions. They check the channel lists; the rules are CBandHelper's.
#include "kral/band.h"

#include "frame/export_call.h"
#include "rfcal/bands/band_channels.h"
#include "rfcal/bands/band_helper.h"

namespace kral {
namespace {

constexpr double kNotAChannel = 0.0;
constexpr const char* kNoOutput = "an output is missing";

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
  return ExportCall(__func__).Require(band != nullptr, kNoOutput).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    const auto all = AllBandChannels();
    if (index >= all.size())
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "there are %zu bands, none at index %u", all.size(), index));
    *band = all[index].band;
    return 1;
  });
}

extern "C" uint8_t KRAL_CALL KRAL_Band_Helper_GetBandName(uint16_t band, char* name, uint32_t size) {
  return ExportCall(__func__).Require(name != nullptr, kNoOutput).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    return BandName(band, {name, size}) ||
           Fail(Failure(KRAL_ERROR_ARGUMENT, "no band %u, or no room for its name in %u bytes", band, size));
  });
}

extern "C" uint8_t KRAL_CALL KRAL_Band_Helper_GetBandRange(uint16_t band, uint8_t direction, uint32_t index,
                                                           int32_t* first, int32_t* last) {
  return ExportCall(__func__)
      .Require(first != nullptr && last != nullptr, kNoOutput)
      .Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
        const CChannelDefinition* list = ListOf(band, direction);
        if (list == nullptr || index >= list->ranges().size()) {
          return Fail(Failure(KRAL_ERROR_ARGUMENT, "band %u has no range %u in direction %u", band, index, direction));
        }
        *first = list->ranges()[index].first;
        *last = list->ranges()[index].last;
        return 1;
      });
}
