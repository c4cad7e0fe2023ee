// Channel numbers to carrier frequencies in MHz, for every band the library knows.
#ifndef KRAL_RFCAL_BANDS_BAND_HELPER_H
#define KRAL_RFCAL_BANDS_BAND_HELPER_H

#include <cstdint>
#include <stdexcept>

namespace kral {

class CBandHelper {
 public:
  // A channel outside the ranges of a band that has several, or a band outside all groups on the way down.
  class Exception : public std::runtime_error {
   public:
    using std::runtime_error::runtime_error;
  };

  // "No result" of the two calculations.
  static constexpr double kNoFrequency = -999.0;

  // The one helper of the process. It is a constant: ready before any thread runs, with nothing to lock or to destroy.
  static const CBandHelper& Instance();

  // Whether the band's list for that kind of call holds the channel.
  bool IsChannel(uint16_t band, int32_t channel) const;
  bool IsULChannel(uint16_t band, int32_t channel) const;
  bool IsDLChannel(uint16_t band, int32_t channel) const;

  // The rules alone, without the lists. kNoFrequency for a band outside all groups; throws Exception.
  double CalculateULFrequency(uint16_t band, int32_t channel) const;
  double CalculateDLFrequency(uint16_t band, int32_t channel) const;

 private:
  constexpr CBandHelper() = default;
};

}  // namespace kral

#endif
