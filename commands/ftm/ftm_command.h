// FTM commands whose payload is the caller's: by table row, by id, and by mode id and header form.
#ifndef KRAL_COMMANDS_FTM_FTM_COMMAND_H
#define KRAL_COMMANDS_FTM_FTM_COMMAND_H

#include <cstdint>

#include "commands/ftm/ftm_command_table.h"
#include "commands/ftm/ftm_frame.h"
#include "kral/types.h"

namespace kral::ftm {

// A caller's payload and the room for what comes back.
struct Exchange {
  const uint8_t* payload;
  uint16_t payload_size;
  uint8_t* response;
  uint16_t* response_size;
};

// Sends command and payload to the dispatcher of a mode id and hands back what the handset sent behind the header.
bool SendCommand(Diag_FTM& phone, uint16_t mode_id, HeaderForm form, uint16_t command, const Exchange& exchange);

// The whole of an exported table command: log line, handle, command.
uint8_t ExportedCommand(KRAL_HANDLE handle, const Command& command, const uint8_t* payload, uint16_t payload_size,
                        uint8_t* response, uint16_t* response_size);

}  // namespace kral::ftm

#endif
