// Exports of the FTM settings, mode switches, the commands with arguments of their own, and the general command calls.
#include <algorithm>

#include "commands/ftm_command.h"
#include "commands/ftm_mode.h"
#include "commands/outputs.h"
#include "frame/export_call.h"
#include "kral/ftm.h"

namespace ftm = kral::ftm;
using kral::LogFormatted;
using kral::LogName;
using kral::OnPhone;

extern "C" {

uint8_t KRAL_CALL KRAL_FTM_SET_MODE_ID(KRAL_HANDLE handle, uint16_t mode_id) {
  if (const char* name = ftm::ModeIdName(mode_id)) {
    LogFormatted(handle, "KRAL_FTM_SET_MODE_ID( eModeId = %d(%s) )", mode_id, name);
  } else {
    LogFormatted(handle, "KRAL_FTM_SET_MODE_ID( eModeId = %d )", mode_id);
  }
  return OnPhone(handle, ftm::SetModeId, mode_id);
}

// An unknown handle has no log in which "KRAL_FTM_GET_MODE_ID: Unable to get Diag_FTM object" could stand.
uint8_t KRAL_CALL KRAL_FTM_GET_MODE_ID(KRAL_HANDLE handle, uint16_t* mode_id) {
  uint16_t current = 0;
  if (OnPhone(handle, ftm::GetModeId, &current) == 0) return 0;
  if (const char* name = ftm::ModeIdName(current)) {
    LogFormatted(handle, "KRAL_FTM_GET_MODE_ID(iSystem_Mode = %d(%s) ) ", current, name);
  } else {
    LogFormatted(handle, "KRAL_FTM_GET_MODE_ID( eModeId = %d )", current);
  }
  kral::Put(mode_id, current);
  return 1;
}

uint8_t KRAL_CALL KRAL_FTM_SET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t code) {
  LogFormatted(handle, "KRAL_FTM_SET_COMMAND_CODE( eCommandMode = %d )", code);
  return OnPhone(handle, ftm::SetCommandCode, code);
}

uint8_t KRAL_CALL KRAL_FTM_GET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t* code) {
  LogName(handle, "KRAL_FTM_GET_COMMAND_CODE");
  return OnPhone(handle, ftm::GetCommandCode, code);
}

uint8_t KRAL_CALL KRAL_IsFTM_Mode(KRAL_HANDLE handle, uint8_t* is_ftm) {
  LogName(handle, "KRAL_IsFTM_Mode");
  return OnPhone(handle, ftm::IsFtm, is_ftm);
}

uint8_t KRAL_CALL KRAL_ChangeFTM_BootMode(KRAL_HANDLE handle, uint8_t ftm_flag, uint8_t reset) {
  LogFormatted(handle, "KRAL_ChangeFTM_BootMode(bFTMMode=%d)", ftm_flag);
  return OnPhone(handle, ftm::ChangeBootMode, ftm_flag, reset);
}

uint8_t KRAL_CALL KRAL_ChangeFTM_ModeRuntime(KRAL_HANDLE handle, uint8_t ftm_flag) {
  LogFormatted(handle, "KRAL_ChangeFTM_ModeRuntime(bFTMMode=%d)", ftm_flag);
  return OnPhone(handle, ftm::ChangeModeRuntime, ftm_flag);
}

uint8_t KRAL_CALL KRAL_FTM_SET_MODE(KRAL_HANDLE handle, uint16_t mode) {
  LogFormatted(handle, "KRAL_FTM_SET_MODE( eNewMode = %d )", mode);
  return OnPhone(handle, ftm::SetMode, mode);
}

uint8_t KRAL_CALL KRAL_FTM_SET_CHAN(KRAL_HANDLE handle, uint16_t channel) {
  LogFormatted(handle, "KRAL_FTM_SET_CHAN( iChannel = %d )", channel);
  return OnPhone(handle, ftm::SetChannel, channel);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_ON(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_FTM_SET_TX_ON");
  return OnPhone(handle, ftm::SetTxOn);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_OFF(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_FTM_SET_TX_OFF");
  return OnPhone(handle, ftm::SetTxOff);
}

uint8_t KRAL_CALL KRAL_FTM_SendCommand(KRAL_HANDLE handle, uint16_t command, const uint8_t* payload,
                                       uint16_t payload_size, uint8_t* response, uint16_t* response_size) {
  LogFormatted(handle, "KRAL_FTM_SendCommand( command = %d, payload_size = %d )", command, payload_size);
  const ftm::Exchange exchange{payload, payload_size, response, response_size};
  return OnPhone(handle, [&](kral::Diag_FTM& phone) {
    const auto mode_id = static_cast<uint16_t>(phone.ftm().mode_id);
    return ftm::SendCommand(phone, mode_id, ftm::HeaderForm::kPlain, command, exchange);
  });
}

uint8_t KRAL_CALL KRAL_FTM_SendCommandTo(KRAL_HANDLE handle, uint16_t mode_id, uint8_t header_form, uint16_t command,
                                         const uint8_t* payload, uint16_t payload_size, uint8_t* response,
                                         uint16_t* response_size) {
  LogFormatted(handle, "KRAL_FTM_SendCommandTo( mode_id = %d, header_form = %d, command = %d, payload_size = %d )",
               mode_id, header_form, command, payload_size);
  if (header_form >= ftm::kHeaderFormCount) return 0;
  const ftm::Exchange exchange{payload, payload_size, response, response_size};
  return OnPhone(handle, ftm::SendCommand, mode_id, static_cast<ftm::HeaderForm>(header_form), command, exchange);
}

uint16_t KRAL_CALL KRAL_FTM_GetCommandCount(void) {
  return static_cast<uint16_t>(ftm::kCommands.size());
}

uint8_t KRAL_CALL KRAL_FTM_GetCommandInfo(uint16_t index, uint16_t* command, char* name, uint16_t name_size) {
  if (index >= ftm::kCommands.size()) return 0;
  const ftm::Command& row = ftm::kCommands[index];
  if (name != nullptr) {
    if (row.name.size() >= name_size) return 0;
    *std::copy(row.name.begin(), row.name.end(), name) = '\0';
  }
  kral::Put(command, row.id);
  return 1;
}

}  // extern "C"
