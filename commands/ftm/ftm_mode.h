// FTM modes: mode ids and their names, the choice of a mode id for an RF mode, and switching the handset into and out
// of factory test mode.
#ifndef KRAL_COMMANDS_FTM_FTM_MODE_H
#define KRAL_COMMANDS_FTM_FTM_MODE_H

#include <cstdint>
#include <optional>

#include "kral/ftm.h"
#include "transport/engine/reply.h"

namespace kral {

class Diag_FTM;

namespace ftm {

inline constexpr uint8_t kSubsystem = 11;

inline constexpr uint16_t kModeIdCdma1x = KRAL_FTM_MODE_ID_CDMA_1X;
inline constexpr uint16_t kModeIdWcdma = KRAL_FTM_MODE_ID_WCDMA;
inline constexpr uint16_t kModeIdGsm = KRAL_FTM_MODE_ID_GSM;
inline constexpr uint16_t kModeIdEvdo = KRAL_FTM_MODE_ID_HDR_C;
inline constexpr uint16_t kModeIdAgps = KRAL_FTM_MODE_ID_AGPS;
inline constexpr uint16_t kModeIdPmic = KRAL_FTM_MODE_ID_PMIC;
inline constexpr uint16_t kModeIdZeft = KRAL_FTM_MODE_ID_ZEFT_C;
inline constexpr uint16_t kModeIdLte = KRAL_FTM_MODE_ID_LTE;
inline constexpr uint16_t kModeIdSequencer = KRAL_FTM_MODE_ID_SEQUENCER;
inline constexpr uint16_t kModeIdTdscdma = KRAL_FTM_MODE_ID_TDSCDMA;

// The name of a mode id; null when it has none.
const char* ModeIdName(uint32_t mode_id);

// The mode id under which an RF mode is set: the current one where it belongs to the RF mode's group, else the
// group's default. Nothing for an RF mode outside every group.
std::optional<uint16_t> ModeIdForRfMode(uint16_t rf_mode, uint32_t current);

bool SetModeId(Diag_FTM& phone, uint16_t mode_id);
bool GetModeId(Diag_FTM& phone, uint16_t* mode_id);
bool SetCommandCode(Diag_FTM& phone, uint16_t code);
bool GetCommandCode(Diag_FTM& phone, uint16_t* code);

bool SetMode(Diag_FTM& phone, uint16_t rf_mode);
// What stands around its request: the mode id that the RF mode needs becomes the current one (false for an RF mode that
// has none), and a handset needs a while after some of them.
bool ChooseModeId(Diag_FTM& phone, uint16_t rf_mode);
void WaitAfterMode(Diag_FTM& phone, uint16_t rf_mode);
Reply SetChannel(Diag_FTM& phone, uint16_t channel);
Reply SetTxOn(Diag_FTM& phone);
Reply SetTxOff(Diag_FTM& phone);

// Asks whether the handset is in factory test mode. False when it cannot be told.
bool QueryFtm(Diag_FTM& phone, bool& is_ftm);
bool IsFtm(Diag_FTM& phone, uint8_t* is_ftm);

bool ChangeBootMode(Diag_FTM& phone, uint8_t ftm, uint8_t reset);
bool ChangeModeRuntime(Diag_FTM& phone, uint8_t ftm);

}  // namespace ftm
}  // namespace kral

#endif
