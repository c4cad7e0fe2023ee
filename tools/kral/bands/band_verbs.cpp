// kral band: bands, their channels and carrier frequencies. Pure arithmetic: no handset is needed.
#include <array>
#include <cctype>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/format.h"
#include "tools/kral/numbers.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct Direction {
  std::uint8_t list;
  const char* name;
  double(KRAL_CALL* frequency)(std::uint16_t band, std::int32_t channel);
};
constexpr std::array<Direction, 3> kDirections{{
    {KRAL_BAND_ANY_DIRECTION, "any", nullptr},  // numbers in use, some without a carrier of their own
    {KRAL_BAND_UPLINK, "uplink", KRAL_Band_Helper_CalculateULFrequency},
    {KRAL_BAND_DOWNLINK, "downlink", KRAL_Band_Helper_CalculateDLFrequency},
}};

struct ChannelRange {
  std::int32_t first;
  std::int32_t last;
};

std::vector<ChannelRange> RangesOf(std::uint16_t band, std::uint8_t list) {
  std::vector<ChannelRange> ranges;
  ChannelRange range{};
  for (std::uint32_t i = 0; KRAL_Band_Helper_GetBandRange(band, list, i, &range.first, &range.last) != 0; ++i) {
    ranges.push_back(range);
  }
  return ranges;
}

std::string NameOfBand(std::uint16_t band) {
  std::array<char, 128> name{};
  return KRAL_Band_Helper_GetBandName(band, name.data(), static_cast<std::uint32_t>(name.size())) != 0 ? name.data()
                                                                                                       : "";
}

void List(const Context& context) {
  Json rows = Json::array();
  std::string text = Format("{:>4}  {:28} {:9} {:>10} {:>10}  {:>11} {:>11}\n", "id", "band", "direction", "first",
                            "last", "MHz", "MHz");
  for (std::uint32_t i = 0; i < KRAL_Band_Helper_GetBandCount(); ++i) {
    std::uint16_t band = 0;
    if (KRAL_Band_Helper_GetBand(i, &band) == 0) continue;
    for (const auto& direction : kDirections) {
      for (const auto& [first, last] : RangesOf(band, direction.list)) {
        Json row{{"band", band},
                 {"name", NameOfBand(band)},
                 {"direction", direction.name},
                 {"first", first},
                 {"last", last}};
        text += Format("{:>4}  {:28} {:9} {:>10} {:>10}", band, NameOfBand(band), direction.name, first, last);
        if (direction.frequency != nullptr) {
          row["first_mhz"] = direction.frequency(band, first);
          row["last_mhz"] = direction.frequency(band, last);
          text += Format("  {:>11.4f} {:>11.4f}", direction.frequency(band, first), direction.frequency(band, last));
        }
        text += '\n';
        rows.push_back(std::move(row));
      }
    }
  }
  context.out.Result({{"bands", rows}}, text);
}

// "E-GSM 900" is "egsm900".
std::string PlainName(std::string_view name) {
  std::string plain;
  for (const char letter : name) {
    const auto character = static_cast<unsigned char>(letter);
    if (std::isalnum(character) != 0) plain += static_cast<char>(std::tolower(character));
  }
  return plain;
}

std::vector<std::uint16_t> BandsNamed(const std::string& text) {
  const auto wanted = PlainName(text);
  std::vector<std::uint16_t> alike;
  for (std::uint32_t i = 0; i < KRAL_Band_Helper_GetBandCount(); ++i) {
    std::uint16_t band = 0;
    if (KRAL_Band_Helper_GetBand(i, &band) == 0) continue;
    const auto name = PlainName(NameOfBand(band));
    if (name == wanted) return {band};
    if (!wanted.empty() && name.find(wanted) != std::string::npos) alike.push_back(band);
  }
  return alike;
}

// By id or by name. Several that are called so are one where the channel is the same carrier in all that have it.
std::uint16_t BandOf(const std::string& text, const Direction& direction, std::int32_t channel) {
  if (const auto id = ParseNumber<std::uint16_t>(text)) return *id;
  const auto bands = BandsNamed(text);
  std::vector<std::uint16_t> with_channel;
  std::set<double> carriers;
  std::vector<std::string> names;
  for (const auto band : bands) {
    names.push_back(Format("{} ({})", band, NameOfBand(band)));
    const double carrier = direction.frequency(band, channel);
    if (carrier == 0.0) continue;
    carriers.insert(carrier);
    with_channel.push_back(band);
  }
  if (carriers.size() == 1) return with_channel.front();
  if (bands.size() == 1) return bands.front();
  throw ToolError(ExitCode::kUsage,
                  bands.empty()      ? Format("there is no band {}", text)
                  : carriers.empty() ? Format("no band {} has channel {}", text, channel)
                                     : Format("several bands are called {}: {}", text, Joined(names, ", ")),
                  "kral band list shows ids and names");
}

void Convert(const Context& context, const Direction& direction, const std::string& name, std::int32_t channel) {
  const auto band = BandOf(name, direction, channel);
  const double frequency = direction.frequency(band, channel);
  if (frequency == 0.0) {
    throw ToolError(ExitCode::kUsage,
                    Format("band {} has no {} frequency for channel {}", band, direction.name, channel),
                    "kral band list shows the bands and their channels");
  }
  context.out.Result({{"band", band}, {"channel", channel}, {"direction", direction.name}, {"mhz", frequency}},
                     Format("{:.4f} MHz\n", frequency));
}

void AddConversion(const Command& parent, Context& context, const char* verb, const Direction& direction) {
  const auto band = std::make_shared<std::string>();
  const auto channel = std::make_shared<std::int32_t>();
  const auto conversion = parent.Verb(verb, Format("Print the {} carrier of a channel", direction.name));
  conversion.NeedsNoHandset();
  conversion.Add("band", *band, "Band id or name, as in the list: 1, gsm900").Required();
  conversion.Add("channel", *channel, "Channel number").Required();
  conversion.Run([&context, &direction, band, channel] { Convert(context, direction, *band, *channel); });
}

}  // namespace

void AddBandVerbs(const Command& root, Context& context) {
  const auto band = root.Noun("band", "Convert bands and channels to carrier frequencies");
  const auto list = band.Verb("list", "Print every band with its channel ranges and edge frequencies");
  list.NeedsNoHandset();
  list.Run([&context] { List(context); });
  AddConversion(band, context, "ul", kDirections[1]);
  AddConversion(band, context, "dl", kDirections[2]);
}

}  // namespace kral::tool
