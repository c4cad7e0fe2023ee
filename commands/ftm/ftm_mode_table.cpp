// Mode ids with their names, and the groups that tie RF modes to mode ids.
#include <algorithm>
#include <array>
#include <initializer_list>
#include <span>

#include "commands/ftm/ftm_mode.h"

namespace kral::ftm {
namespace {

struct ModeName {
  uint16_t id;
  const char* name;
};

// 37, the sequencer's own mode id, has no name on purpose.
constexpr std::array kModeNames = {
    ModeName{KRAL_FTM_MODE_ID_CDMA_1X, "FTM_MODE_ID_CDMA_1X"},
    ModeName{KRAL_FTM_MODE_ID_WCDMA, "FTM_MODE_ID_WCDMA"},
    ModeName{KRAL_FTM_MODE_ID_GSM, "FTM_MODE_ID_GSM"},
    ModeName{KRAL_FTM_MODE_ID_CDMA_1X_RX1, "FTM_MODE_ID_CDMA_1X_RX1"},
    ModeName{KRAL_FTM_MODE_ID_BLUETOOTH, "FTM_MODE_ID_BLUETOOTH"},
    ModeName{KRAL_FTM_MODE_ID_CDMA_1X_CALL, "FTM_MODE_ID_CDMA_1X_CALL"},
    ModeName{KRAL_FTM_MODE_ID_HDR_C, "FTM_MODE_ID_HDR_C"},
    ModeName{KRAL_FTM_MODE_ID_LOGGING, "FTM_MODE_ID_LOGGING"},
    ModeName{KRAL_FTM_MODE_ID_AGPS, "FTM_MODE_ID_AGPS"},
    ModeName{KRAL_FTM_MODE_ID_PMIC, "FTM_MODE_ID_PMIC"},
    ModeName{KRAL_FTM_MODE_ID_GSM_BER, "FTM_MODE_GSM_BER"},
    ModeName{KRAL_FTM_MODE_ID_AUDIO, "FTM_MODE_ID_AUDIO"},
    ModeName{KRAL_FTM_MODE_ID_CAMERA, "FTM_MODE_ID_CAMERA"},
    ModeName{KRAL_FTM_MODE_ID_WCDMA_BER, "FTM_MODE_WCDMA_BER"},
    ModeName{KRAL_FTM_MODE_ID_GSM_EXTENDED_C, "FTM_MODE_ID_GSM_EXTENDED_C"},
    ModeName{KRAL_FTM_MODE_ID_CDMA_API_V2, "FTM_MODE_CDMA_API_V2"},
    ModeName{KRAL_FTM_MODE_ID_ZEFT_C, "FTM_MODE_ID_ZEFT_C"},
    ModeName{KRAL_FTM_MODE_ID_RF_COMMON, "FTM_MODE_RF_COMMON"},
    ModeName{KRAL_FTM_MODE_ID_WCDMA_RX1, "FTM_MODE_WCDMA_RX1"},
    ModeName{KRAL_FTM_MODE_ID_WLAN, "FTM_MODE_WLAN"},
    ModeName{KRAL_FTM_MODE_ID_LTE, "FTM_MODE_ID_LTE"},
    ModeName{KRAL_FTM_MODE_ID_LTE_NS, "FTM_MODE_LTE_NS"},
    ModeName{KRAL_FTM_MODE_ID_CDMA_1X_C2, "FTM_MODE_ID_CDMA_1X_C2"},
    ModeName{KRAL_FTM_MODE_ID_LTE_RX1, "FTM_MODE_LTE_RX1"},
    ModeName{KRAL_FTM_MODE_ID_RFNV, "FTM_MODE_RFNV"},
    ModeName{KRAL_FTM_MODE_ID_SV, "FTM_MODE_SV"},
    ModeName{KRAL_FTM_MODE_ID_RFM_C, "FTM_MODE_RFM_C"},
    ModeName{KRAL_FTM_MODE_ID_1X_C3_C, "FTM_MODE_ID_1X_C3_C"},
    ModeName{KRAL_FTM_MODE_ID_RFCA_MAL_C, "FTM_MODE_ID_RFCA_MAL_C"},
    ModeName{KRAL_FTM_MODE_ID_TDSCDMA, "FTM_MODE_ID_TDSCDMA"},
    ModeName{KRAL_FTM_MODE_ID_TDSCDMA_RX1, "FTM_MODE_ID_TDSCDMA_RX1"},
    ModeName{KRAL_FTM_MODE_ID_TDSCDMA_BER, "FTM_MODE_ID_TDSCDMA_BER"},
    ModeName{KRAL_FTM_MODE_ID_LTE_C3, "FTM_MODE_ID_LTE_C3"},
    ModeName{KRAL_FTM_MODE_ID_LTE_C4, "FTM_MODE_ID_LTE_C4"},
    ModeName{KRAL_FTM_MODE_ID_GSM_C2, "FTM_MODE_ID_GSM_C2"},
    ModeName{KRAL_FTM_MODE_ID_GSM_EXTENDED_C2, "FTM_MODE_ID_GSM_EXTENDED_C2"},
    ModeName{KRAL_FTM_MODE_ID_GSM_BER_C2, "FTM_MODE_ID_GSM_BER_C2"},
    ModeName{KRAL_FTM_MODE_ID_PRODUCTION, "FTM_MODE_ID_PRODUCTION"},
    ModeName{KRAL_FTM_MODE_ID_LTM, "FTM_MODE_ID_LTM"},
    // The published table ends with these two once more; the first hit answers, so they change nothing.
    ModeName{KRAL_FTM_MODE_ID_RF_COMMON, "FTM_MODE_RF_COMMON"},
    ModeName{KRAL_FTM_MODE_ID_WCDMA_RX1, "FTM_MODE_WCDMA_RX1"},
};
static_assert(kModeNames.size() == 41);
static_assert(std::is_sorted(kModeNames.begin(), kModeNames.end() - 2,
                             [](const ModeName& a, const ModeName& b) { return a.id < b.id; }));

struct Range {
  uint16_t first;
  uint16_t last;
};

// One RF mode group: mode ids that are kept (secondary chains survive), and the one that replaces any other.
struct Group {
  std::span<const Range> rf_modes;
  std::span<const uint16_t> kept;
  uint16_t standard;
};

// Sleep: deliberately broad, a transceiver that goes to sleep keeps the dispatcher of any technology.
constexpr Range kSleepModes[] = {{2, 2}};
constexpr uint16_t kSleepKept[] = {0, 1, 2, 3, 19, 21, 29, 32, 40, 42, 45, 49};
constexpr Range kCdmaModes[] = {{3, 3}, {5, 6}, {8, 8}, {14, 14}, {17, 17}, {19, 19}, {26, 27}, {32, 33}};
constexpr uint16_t kCdmaKept[] = {0, 3, 32, 40, 45};
constexpr Range kWcdmaModes[] = {{9, 9}, {15, 16}, {22, 23}, {25, 25}, {28, 29}, {31, 31}, {40, 40}, {75, 75}};
constexpr uint16_t kWcdmaKept[] = {1, 21};
constexpr Range kGsmModes[] = {{10, 12}, {18, 18}};
constexpr uint16_t kGsmKept[] = {2, 49};
constexpr Range kBroadcastModes[] = {{30, 30}};
constexpr Range kLteModes[] = {{34, 39}, {41, 74}, {76, 77}};
// The standard id of the group is not among the kept ones; the outcome is the same.
constexpr uint16_t kLteKept[] = {47, 48};
constexpr Range kTdscdmaModes[] = {{90, 92}};
constexpr uint16_t kTdscdmaKept[] = {42, 43};

constexpr Group kGroups[] = {
    {kSleepModes, kSleepKept, kModeIdWcdma},
    {kCdmaModes, kCdmaKept, kModeIdCdma1x},
    {kWcdmaModes, kWcdmaKept, kModeIdWcdma},
    {kGsmModes, kGsmKept, kModeIdGsm},
    {kBroadcastModes, {}, kModeIdZeft},
    {kLteModes, kLteKept, kModeIdLte},
    {kTdscdmaModes, kTdscdmaKept, kModeIdTdscdma},
};

bool Holds(const Group& group, uint16_t rf_mode) {
  return std::ranges::any_of(group.rf_modes,
                             [rf_mode](const Range& range) { return rf_mode >= range.first && rf_mode <= range.last; });
}

}  // namespace

const char* ModeIdName(uint32_t mode_id) {
  const auto row = std::ranges::find_if(kModeNames, [mode_id](const ModeName& entry) { return entry.id == mode_id; });
  return row != kModeNames.end() ? row->name : nullptr;
}

std::optional<uint16_t> ModeIdForRfMode(uint16_t rf_mode, uint32_t current) {
  for (const Group& group : kGroups) {
    if (!Holds(group, rf_mode)) continue;
    const auto kept = std::ranges::find(group.kept, current);
    return kept != group.kept.end() ? *kept : group.standard;
  }
  return std::nullopt;
}

}  // namespace kral::ftm
