// Exports of the FTM settings, mode switches, the commands with arguments of their own, and the general command calls.
#include <algorithm>

#include "base/outputs.h"
#include "commands/ftm/ftm_command.h"
#include "commands/ftm/ftm_mode.h"
#include "frame/export_call.h"
#include "kral/ftm.h"

namespace ftm = kral::ftm;
using kral::ExportCall;

extern "C" {

uint8_t KRAL_CALL KRAL_FTM_SET_MODE_ID(KRAL_HANDLE handle, uint16_t mode_id) {
  ExportCall call(handle, __func__);
  if (const char* name = ftm::ModeIdName(mode_id)) {
    call.Logged("( eModeId = %d(%s) )", mode_id, name);
  } else {
    call.Logged("( eModeId = %d )", mode_id);
  }
  return call.Run(ftm::SetModeId, mode_id);
}

// An unknown handle has no log in which "KRAL_FTM_GET_MODE_ID: Unable to get Diag_FTM object" could stand.
uint8_t KRAL_CALL KRAL_FTM_GET_MODE_ID(KRAL_HANDLE handle, uint16_t* mode_id) {
  ExportCall call(handle, __func__);
  uint16_t current = 0;
  if (call.Unlogged().Run(ftm::GetModeId, &current) == 0) return 0;
  if (const char* name = ftm::ModeIdName(current)) {
    call.Logged("(iSystem_Mode = %d(%s) ) ", current, name);
  } else {
    call.Logged("( eModeId = %d )", current);
  }
  kral::Put(mode_id, current);
  return 1;
}

uint8_t KRAL_CALL KRAL_FTM_SET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t code) {
  return ExportCall(handle, __func__).Logged("( eCommandMode = %d )", code).Run(ftm::SetCommandCode, code);
}

uint8_t KRAL_CALL KRAL_FTM_GET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t* code) {
  return ExportCall(handle, __func__).Run(ftm::GetCommandCode, code);
}

uint8_t KRAL_CALL KRAL_IsFTM_Mode(KRAL_HANDLE handle, uint8_t* is_ftm) {
  return ExportCall(handle, __func__).Run(ftm::IsFtm, is_ftm);
}

uint8_t KRAL_CALL KRAL_ChangeFTM_BootMode(KRAL_HANDLE handle, uint8_t ftm_flag, uint8_t reset) {
  return ExportCall(handle, __func__).Logged("(bFTMMode=%d)", ftm_flag).Run(ftm::ChangeBootMode, ftm_flag, reset);
}

uint8_t KRAL_CALL KRAL_ChangeFTM_ModeRuntime(KRAL_HANDLE handle, uint8_t ftm_flag) {
  return ExportCall(handle, __func__).Logged("(bFTMMode=%d)", ftm_flag).Run(ftm::ChangeModeRuntime, ftm_flag);
}

uint8_t KRAL_CALL KRAL_FTM_SET_MODE(KRAL_HANDLE handle, uint16_t mode) {
  return ExportCall(handle, __func__).Logged("( eNewMode = %d )", mode).Run(ftm::SetMode, mode);
}

uint8_t KRAL_CALL KRAL_FTM_SET_CHAN(KRAL_HANDLE handle, uint16_t channel) {
  return ExportCall(handle, __func__).Logged("( iChannel = %d )", channel).Run(ftm::SetChannel, channel);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_ON(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(ftm::SetTxOn);
}

uint8_t KRAL_CALL KRAL_FTM_SET_TX_OFF(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(ftm::SetTxOff);
}

uint8_t KRAL_CALL KRAL_FTM_SendCommand(KRAL_HANDLE handle, uint16_t command, const uint8_t* payload,
                                       uint16_t payload_size, uint8_t* response, uint16_t* response_size) {
  const ftm::Exchange exchange{payload, payload_size, response, response_size};
  return ExportCall(handle, __func__)
      .Logged("( command = %d, payload_size = %d )", command, payload_size)
      .Run([&](kral::Diag_FTM& phone) {
        const auto mode_id = static_cast<uint16_t>(phone.state<ftm::Settings>().mode_id);
        return ftm::SendCommand(phone, mode_id, ftm::HeaderForm::kPlain, command, exchange);
      });
}

uint8_t KRAL_CALL KRAL_FTM_SendCommandTo(KRAL_HANDLE handle, uint16_t mode_id, uint8_t header_form, uint16_t command,
                                         const uint8_t* payload, uint16_t payload_size, uint8_t* response,
                                         uint16_t* response_size) {
  const ftm::Exchange exchange{payload, payload_size, response, response_size};
  return ExportCall(handle, __func__)
      .Logged("( mode_id = %d, header_form = %d, command = %d, payload_size = %d )", mode_id, header_form, command,
              payload_size)
      .Require(header_form < ftm::kHeaderFormCount, "the header form is not one of 0 to 2")
      .Run(ftm::SendCommand, mode_id, static_cast<ftm::HeaderForm>(header_form), command, exchange);
}

uint16_t KRAL_CALL KRAL_FTM_GetCommandCount(void) {
  return static_cast<uint16_t>(ftm::kCommands.size());
}

uint8_t KRAL_CALL KRAL_FTM_GetCommandInfo(uint16_t index, uint16_t* command, char* name, uint16_t name_size) {
  return ExportCall(__func__)
      .Require(index < ftm::kCommands.size(), "there are fewer commands than that")
      .Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
        const ftm::Command& row = ftm::kCommands[index];
        if (name != nullptr) {
          if (row.name.size() >= name_size) {
            return kral::Fail(kral::Failure(KRAL_ERROR_ARGUMENT, "the name does not fit into %d bytes", name_size));
          }
          *std::ranges::copy(row.name, name).out = '\0';
        }
        kral::Put(command, row.id);
        return 1;
      });
}

}  // extern "C"
