/* Factory test mode: channels, transmitter, and commands with payloads. */
#include <stdio.h>

#include "kral/kral.h"

int enter_test_mode(KRAL_HANDLE handle) {
  //! [Into factory test mode, and back]
  uint8_t is_ftm = 0;
  if (!KRAL_ChangeFTM_ModeRuntime(handle, 1)) return 0; /* without a restart */
  if (!KRAL_IsFTM_Mode(handle, &is_ftm) || !is_ftm) return 0;
  /* ... */
  KRAL_ChangeFTM_ModeRuntime(handle, 0);
  KRAL_ChangeFTM_BootMode(handle, 1, 1); /* from each restart on, of which this is the first */
  //! [Into factory test mode, and back]
  return 1;
}

void transmit(KRAL_HANDLE handle) {
  //! [Transmit on a channel]
  if (KRAL_FTM_SET_MODE(handle, KRAL_FTM_RF_MODE_WCDMA) && KRAL_FTM_SET_CHAN(handle, 9750)) {
    KRAL_FTM_SET_TX_ON(handle);
    /* ... measure ... */
    KRAL_FTM_SET_TX_OFF(handle);
  }
  //! [Transmit on a channel]
}

void send_command(KRAL_HANDLE handle) {
  //! [A command with a payload]
  const uint8_t payload[] = {0xE8, 0x03}; /* 10 dBm, in hundredths */
  uint8_t response[64];
  uint16_t size = sizeof response;

  /* By its own function, of which there is one for each listed command ... */
  if (KRAL_FTM_SET_TX_POWER_DBM(handle, payload, sizeof payload, response, &size)) printf("%u bytes\n", size);

  /* ... by its number, or to another dispatcher and with another header. */
  size = sizeof response;
  KRAL_FTM_SendCommand(handle, 53, NULL, 0, response, &size);
  size = sizeof response;
  KRAL_FTM_SendCommandTo(handle, KRAL_FTM_MODE_ID_WLAN, KRAL_FTM_HEADER_LENGTHS, 5, payload, sizeof payload, response,
                         &size);
  //! [A command with a payload]
}

void choose_dispatcher(KRAL_HANDLE handle) {
  //! [Which dispatcher, which command code]
  uint16_t mode_id, code;
  KRAL_FTM_SET_MODE_ID(handle, KRAL_FTM_MODE_ID_WCDMA);
  KRAL_FTM_SET_COMMAND_CODE(handle, KRAL_FTM_COMMAND_CODE_LEGACY); /* for older handsets */
  if (KRAL_FTM_GET_MODE_ID(handle, &mode_id) && KRAL_FTM_GET_COMMAND_CODE(handle, &code)) {
    printf("dispatcher %u, code %u\n", mode_id, code);
  }
  //! [Which dispatcher, which command code]
}

void list_commands(void) {
  //! [All listed commands]
  for (uint16_t i = 0; i < KRAL_FTM_GetCommandCount(); ++i) {
    uint16_t command;
    char name[KRAL_FTM_COMMAND_NAME_SIZE];
    if (KRAL_FTM_GetCommandInfo(i, &command, name, sizeof name)) printf("%5u %s\n", command, name);
  }
  //! [All listed commands]
}
