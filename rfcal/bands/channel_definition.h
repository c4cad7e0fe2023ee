// The channel numbers of one band in one direction: a list of inclusive ranges.
#ifndef KRAL_RFCAL_BANDS_CHANNEL_DEFINITION_H
#define KRAL_RFCAL_BANDS_CHANNEL_DEFINITION_H

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <span>

namespace kral {

struct ChannelRange {
  int32_t first;
  int32_t last;

  constexpr bool Holds(int32_t channel) const { return first <= channel && channel <= last; }
};

// Owns its ranges in place, so that whole tables of definitions are constants.
class CChannelDefinition {
 public:
  static constexpr size_t kMostRanges = 5;

  constexpr CChannelDefinition() = default;
  // A list that is too long or has a range that runs backwards does not compile in a constant.
  constexpr CChannelDefinition(std::initializer_list<ChannelRange> ranges) {
    for (const ChannelRange& range : ranges) {
      if (range.last < range.first) throw "a range runs backwards";
      ranges_.at(count_++) = range;
    }
  }

  constexpr bool Holds(int32_t channel) const {
    return std::ranges::any_of(ranges(), [channel](const ChannelRange& range) { return range.Holds(channel); });
  }
  constexpr std::span<const ChannelRange> ranges() const { return std::span(ranges_).first(count_); }

 private:
  std::array<ChannelRange, kMostRanges> ranges_{};
  size_t count_ = 0;
};

}  // namespace kral

#endif
