// Bands and channels: every range edge against the exact table, the refusals, and equal bits on every platform.
#include <bit>
#include <limits>

#include "kral/band.h"
#include "rfcal/bands/band_channels.h"
#include "rfcal/bands/band_helper.h"
#include "tests/rfcal/band_edges.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using test::BandEdges;
using test::EdgePair;
using test::kBandEdges;

struct Side {
  const char* name;
  double(KRAL_CALL* calculate)(uint16_t, int32_t);
  EdgePair BandEdges::*edges;
};

constexpr Side kSides[] = {{"uplink", KRAL_Band_Helper_CalculateULFrequency, &BandEdges::uplink},
                           {"downlink", KRAL_Band_Helper_CalculateDLFrequency, &BandEdges::downlink}};

bool Listed(uint16_t band, EdgePair BandEdges::*side, int32_t channel) {
  for (const BandEdges& row : kBandEdges) {
    if (row.band == band && (row.*side).first <= channel && channel <= (row.*side).last) return true;
  }
  return false;
}

std::string ThrownBy(double (CBandHelper::*calculate)(uint16_t, int32_t) const, uint16_t band, int32_t channel) {
  try {
    (CBandHelper::Instance().*calculate)(band, channel);
  } catch (const CBandHelper::Exception& exception) {
    return exception.what();
  }
  return "nothing thrown";
}

TEST(BandHelper, EveryRangeEdgeHasItsFrequencyAndTheNextChannelOutsideHasNone) {
  for (const Side& side : kSides) {
    for (const BandEdges& row : kBandEdges) {
      SCOPED_TRACE(std::string(side.name) + " of band " + std::to_string(row.band));
      const EdgePair& edges = row.*side.edges;
      EXPECT_NEAR(side.calculate(row.band, edges.first), edges.first_mhz, 1e-9);
      EXPECT_NEAR(side.calculate(row.band, edges.last), edges.last_mhz, 1e-9);
      for (const int32_t outside : {edges.first - 1, edges.last + 1}) {
        if (Listed(row.band, side.edges, outside)) continue;
        EXPECT_EQ(side.calculate(row.band, outside), 0.0) << outside;
      }
    }
  }
}

// Broadcast channels have gaps between them that the edges of their ranges do not show.
TEST(BandHelper, ChannelsInsideTheBroadcastBandsFollowTheUnevenRules) {
  const struct {
    uint16_t band;
    int32_t channel;
    double downlink;
  } kCases[] = {{401, 7, 191.143},  {401, 8, 195.143},  {800, 12, 219.143},  {800, 13, 473.143},
                {801, 13, 213.143}, {801, 14, 473.143}, {403, 18, 1482.064}, {602, 22, 482 + 1.0 / 3}};
  for (const auto& c : kCases) {
    EXPECT_NEAR(KRAL_Band_Helper_CalculateDLFrequency(c.band, c.channel), c.downlink, 1e-9) << c.band;
  }
}

TEST(BandHelper, ExtremeChannelsGiveZero) {
  for (const BandChannels& row : AllBandChannels()) {
    for (const int32_t extreme : {std::numeric_limits<int32_t>::min(), std::numeric_limits<int32_t>::max(), -1}) {
      for (const Side& side : kSides) EXPECT_EQ(side.calculate(row.band, extreme), 0.0) << side.name << row.band;
    }
  }
}

TEST(BandHelper, RulesAloneGiveNoFrequencyForBandsOutsideAllGroups) {
  const CBandHelper& helper = CBandHelper::Instance();
  constexpr uint16_t kOutside[] = {5, 99, 111, 212, 213, 301, 404, 701, 802, 899, 931, 941, 999, 1011, 1102, 65535};
  for (const uint16_t band : kOutside) {
    EXPECT_EQ(helper.CalculateULFrequency(band, 1), -999.0) << band;
    EXPECT_EQ(ThrownBy(&CBandHelper::CalculateDLFrequency, band, 1),
              "Invalid/unsupported band enumeration: " + std::to_string(band));
  }
  EXPECT_EQ(helper.CalculateULFrequency(914, 5400), -999.0);
  EXPECT_EQ(helper.CalculateULFrequency(700, 5), 1575.42);
  EXPECT_EQ(helper.CalculateDLFrequency(700, 5), 1575.42);
}

TEST(BandHelper, ChannelsBetweenTheRangesOfABandThrow) {
  const struct {
    uint16_t band;
    int32_t channel;
    const char* text;
  } kCases[] = {
      {0, 500, R"(Invalid frequency band "0" or channel "500")"},
      {200, 0, R"(Invalid frequency band "200" or channel "0")"},
      {203, 800, R"(Invalid frequency band "203" or channel "800")"},
      {205, 2017, R"(Invalid frequency band "205" or channel "2017")"},
      {210, 920, R"(Invalid frequency band "210" or channel "920")"},
      {211, -5, R"(Invalid frequency band "211" or channel "-5")"},
      {1100, 7, R"(CBandHelper::CalculateULFrequency Invalid frequency band "1100" or channel "7")"},
      {1101, 8, R"(CBandHelper::CalculateULFrequency Invalid frequency band "1101" or channel "8")"},
  };
  for (const auto& c : kCases) {
    EXPECT_EQ(ThrownBy(&CBandHelper::CalculateULFrequency, c.band, c.channel), c.text);
    EXPECT_EQ(ThrownBy(&CBandHelper::CalculateDLFrequency, c.band, c.channel), c.text);
  }
}

// FNV-1a over the bits of the results of every range, at most some thousand channels of each.
uint64_t DigestOfAllFrequencies() {
  uint64_t digest = 0xcbf29ce484222325;
  for (const BandEdges& row : kBandEdges) {
    for (const Side& side : kSides) {
      const EdgePair& edges = row.*side.edges;
      const int32_t step = (edges.last - edges.first) / 4000 + 1;
      for (int32_t channel = edges.first; channel <= edges.last; channel += step) {
        digest = (digest ^ std::bit_cast<uint64_t>(side.calculate(row.band, channel))) * 0x100000001b3;
      }
    }
  }
  return digest;
}

TEST(BandHelper, BothPlatformsGiveTheSameBits) {
  EXPECT_EQ(KRAL_Band_Helper_CalculateULFrequency(200, 991), 0x1.9c051eb851eb8p+9);
  EXPECT_EQ(KRAL_Band_Helper_CalculateDLFrequency(601, 21), 0x1.da2aaaaaaaaabp+8);
  EXPECT_EQ(KRAL_Band_Helper_CalculateDLFrequency(400, 14140001), 0x1.618001a36e2ebp+9);
  EXPECT_EQ(DigestOfAllFrequencies(), 0x4b1a59986357a60cu);
}

TEST(BandHelper, BandsAndRangesCanBeListed) {
  uint32_t listed = 0;
  for (uint32_t index = 0; index < KRAL_Band_Helper_GetBandCount(); ++index) {
    uint16_t band = 0;
    ASSERT_EQ(KRAL_Band_Helper_GetBand(index, &band), 1);
    char name[40] = "";
    EXPECT_EQ(KRAL_Band_Helper_GetBandName(band, name, sizeof name), 1);
    EXPECT_GT(std::strlen(name), 5u);
    EXPECT_LT(std::strlen(name), 39u);
    int32_t first = 0;
    int32_t last = 0;
    for (uint32_t range = 0; KRAL_Band_Helper_GetBandRange(band, KRAL_BAND_UPLINK, range, &first, &last); ++range) {
      EXPECT_TRUE(Listed(band, &BandEdges::uplink, first) && Listed(band, &BandEdges::uplink, last)) << band;
      ++listed;
    }
  }
  EXPECT_EQ(listed, std::size(kBandEdges));

  int32_t first = 0;
  int32_t last = 0;
  EXPECT_EQ(KRAL_Band_Helper_GetBandRange(101, KRAL_BAND_ANY_DIRECTION, 2, &first, &last), 1);
  EXPECT_EQ(first, 0);
  EXPECT_EQ(last, 300);
  EXPECT_EQ(KRAL_Band_Helper_GetBandRange(101, KRAL_BAND_ANY_DIRECTION, 4, &first, &last), 0);
  EXPECT_EQ(KRAL_Band_Helper_GetBandRange(101, 3, 0, &first, &last), 0);
  EXPECT_EQ(KRAL_Band_Helper_GetBandRange(5, KRAL_BAND_UPLINK, 0, &first, &last), 0);
  uint16_t band = 0;
  EXPECT_EQ(KRAL_Band_Helper_GetBand(KRAL_Band_Helper_GetBandCount(), &band), 0);
}

TEST(BandHelper, BandNamesAreCutToTheBuffer) {
  const struct {
    uint16_t band;
    const char* name;
  } kCases[] = {{0, "E-GSM 900"}, {1007, "TD-SCDMA band 1007"}};
  char name[40];
  for (const auto& c : kCases) {
    ASSERT_EQ(KRAL_Band_Helper_GetBandName(c.band, name, sizeof name), 1);
    EXPECT_STREQ(name, c.name);
  }
  ASSERT_EQ(KRAL_Band_Helper_GetBandName(903, name, 4), 1);
  EXPECT_STREQ(name, "LTE");
  EXPECT_EQ(KRAL_Band_Helper_GetBandName(903, name, 0), 0);
  EXPECT_EQ(KRAL_Band_Helper_GetBandName(5, name, sizeof name), 0);
  EXPECT_EQ(KRAL_Band_Helper_GetBandName(903, nullptr, 40), 0);
}

}  // namespace
}  // namespace kral
