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
    ModeName{0, "FTM_MODE_ID_CDMA_1X"},
    ModeName{1, "FTM_MODE_ID_WCDMA"},
    ModeName{2, "FTM_MODE_ID_GSM"},
    ModeName{3, "FTM_MODE_ID_CDMA_1X_RX1"},
    ModeName{4, "FTM_MODE_ID_BLUETOOTH"},
    ModeName{7, "FTM_MODE_ID_CDMA_1X_CALL"},
    ModeName{8, "FTM_MODE_ID_HDR_C"},
    ModeName{9, "FTM_MODE_ID_LOGGING"},
    ModeName{10, "FTM_MODE_ID_AGPS"},
    ModeName{11, "FTM_MODE_ID_PMIC"},
    ModeName{13, "FTM_MODE_GSM_BER"},
    ModeName{14, "FTM_MODE_ID_AUDIO"},
    ModeName{15, "FTM_MODE_ID_CAMERA"},
    ModeName{16, "FTM_MODE_WCDMA_BER"},
    ModeName{17, "FTM_MODE_ID_GSM_EXTENDED_C"},
    ModeName{18, "FTM_MODE_CDMA_API_V2"},
    ModeName{19, "FTM_MODE_ID_ZEFT_C"},
    ModeName{20, "FTM_MODE_RF_COMMON"},
    ModeName{21, "FTM_MODE_WCDMA_RX1"},
    ModeName{22, "FTM_MODE_WLAN"},
    ModeName{29, "FTM_MODE_ID_LTE"},
    ModeName{30, "FTM_MODE_LTE_NS"},
    ModeName{32, "FTM_MODE_ID_CDMA_1X_C2"},
    ModeName{35, "FTM_MODE_LTE_RX1"},
    ModeName{36, "FTM_MODE_RFNV"},
    ModeName{38, "FTM_MODE_SV"},
    ModeName{39, "FTM_MODE_RFM_C"},
    ModeName{40, "FTM_MODE_ID_1X_C3_C"},
    ModeName{41, "FTM_MODE_ID_RFCA_MAL_C"},
    ModeName{42, "FTM_MODE_ID_TDSCDMA"},
    ModeName{43, "FTM_MODE_ID_TDSCDMA_RX1"},
    ModeName{44, "FTM_MODE_ID_TDSCDMA_BER"},
    ModeName{47, "FTM_MODE_ID_LTE_C3"},
    ModeName{48, "FTM_MODE_ID_LTE_C4"},
    ModeName{49, "FTM_MODE_ID_GSM_C2"},
    ModeName{50, "FTM_MODE_ID_GSM_EXTENDED_C2"},
    ModeName{51, "FTM_MODE_ID_GSM_BER_C2"},
    ModeName{0x8000, "FTM_MODE_ID_PRODUCTION"},
    ModeName{0x8001, "FTM_MODE_ID_LTM"},
    // The published table ends with these two once more; the first hit answers, so they change nothing.
    ModeName{20, "FTM_MODE_RF_COMMON"},
    ModeName{21, "FTM_MODE_WCDMA_RX1"},
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
  return std::any_of(group.rf_modes.begin(), group.rf_modes.end(),
                     [rf_mode](const Range& range) { return rf_mode >= range.first && rf_mode <= range.last; });
}

}  // namespace

const char* ModeIdName(uint32_t mode_id) {
  const auto row = std::find_if(kModeNames.begin(), kModeNames.end(),
                                [mode_id](const ModeName& entry) { return entry.id == mode_id; });
  return row != kModeNames.end() ? row->name : nullptr;
}

std::optional<uint16_t> ModeIdForRfMode(uint16_t rf_mode, uint32_t current) {
  for (const Group& group : kGroups) {
    if (!Holds(group, rf_mode)) continue;
    const auto kept = std::find(group.kept.begin(), group.kept.end(), current);
    return kept != group.kept.end() ? *kept : group.standard;
  }
  return std::nullopt;
}

}  // namespace kral::ftm
