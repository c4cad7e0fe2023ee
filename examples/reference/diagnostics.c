/* Core diagnostics, bands, and requests given as bytes. */
#include <stdio.h>
#include <string.h>

#include "kral/kral.h"

void identify_handset(KRAL_HANDLE handle) {
  //! [Who is it?]
  char revision[KRAL_BUILD_ID_TEXT_SIZE], model[KRAL_BUILD_ID_TEXT_SIZE];
  uint32_t hardware, model_number, serial;

  if (KRAL_DIAG_EXT_BUILD_ID_F(handle, &hardware, &model_number, revision, model))
    printf("%s runs %s\n", model, revision);
  if (KRAL_DIAG_READ_ESN_F(handle, &serial)) printf("serial number %08X\n", (unsigned)serial);

  char date[KRAL_VERNO_DATE_SIZE], time[KRAL_VERNO_TIME_SIZE]; /* not terminated */
  if (KRAL_DIAG_VERNO_F(handle, date, time, NULL, NULL, NULL, NULL, NULL, NULL, NULL, NULL, NULL, NULL)) {
    printf("compiled %.*s %.*s\n", (int)sizeof date, date, (int)sizeof time, time);
  }
  //! [Who is it?]
}

void switch_mode(KRAL_HANDLE handle) {
  //! [Unlock it and switch its mode]
  uint8_t accepted = 0;
  if (!KRAL_DIAG_SPC_F(handle, "000000", &accepted) || !accepted) printf("another service programming code\n");
  if (KRAL_DIAG_CONTROL_F(handle, KRAL_MODE_OFFLINE_DIGITAL) && KRAL_DIAG_CONTROL_F(handle, KRAL_MODE_RESET)) {
    printf("it restarts\n");
  }
  //! [Unlock it and switch its mode]
}

void memory(KRAL_HANDLE handle, uint32_t address) {
  //! [Memory of the handset]
  uint8_t bytes[4], status;
  uint16_t words[2];
  uint32_t number;

  if (KRAL_DIAG_MEMORY_PEEK_F(handle, address, 4, bytes)) printf("%02X ...\n", bytes[0]);
  if (KRAL_DIAG_MEMORY_PEEK_WORD_F(handle, address, 2, words)) printf("%04X ...\n", words[0]);
  if (KRAL_DIAG_MEMORY_PEEK_DWORD_F(handle, address, 1, &number)) printf("%08X\n", (unsigned)number);

  KRAL_DIAG_MEMORY_POKE_F(handle, address, 4, bytes, &status);
  KRAL_DIAG_MEMORY_POKE_WORD_F(handle, address, 2, words, &status);
  KRAL_DIAG_MEMORY_POKE_DWORD_F(handle, address, 1, &number, &status);
  //! [Memory of the handset]
}

void keys_and_switches(KRAL_HANDLE handle) {
  //! [Keys and switches]
  uint16_t switches;
  if (KRAL_DIAG_GET_DIPSW_F(handle, &switches)) KRAL_DIAG_SET_DIPSW_F(handle, switches | 1);
  for (const char *digit = "112"; *digit != '\0'; ++digit) KRAL_DIAG_HS_KEY_F(handle, 0, (uint8_t)*digit);
  //! [Keys and switches]
}

void records(KRAL_HANDLE handle) {
  //! [Error log and status records]
  uint8_t record[KRAL_LONGEST_DIAG_REPLY];
  uint16_t size = sizeof record;

  if (KRAL_DIAG_ERR_READ_F(handle, &size, record)) printf("%u bytes of error log\n", size);
  KRAL_DIAG_ERR_CLEAR_F(handle, 0);

  size = sizeof record;
  if (KRAL_DIAG_STATUS_F(handle, &size, record)) printf("%u bytes of status\n", size);
  size = sizeof record;
  if (KRAL_DIAG_IS2000_STATUS_F(handle, &size, record)) printf("%u bytes of IS-2000 status\n", size);
  //! [Error log and status records]
}

void whole_handset(KRAL_HANDLE handle, int ships) {
  //! [Requests to the whole handset]
  KRAL_DIAG_NV_CNV_DIAG_BACKUP_F(handle); /* it copies its own NV items */
  if (ships)
    KRAL_DIAG_SECURITY_FREEZE_F(handle); /* for good */
  else
    KRAL_DIAG_DLOAD_F(handle); /* into its loader */
  //! [Requests to the whole handset]
}

void call_control(KRAL_HANDLE handle) {
  //! [GSM call control]
  /* No handset has requests for these: each gives 0 and leaves a line in the text log. */
  KRAL_DIAG_GSM_CALL_ORIG_F(handle);
  KRAL_DIAG_GSM_STATUS_F(handle);
  KRAL_DIAG_GSM_CALL_END_F(handle);
  //! [GSM call control]
}

void bands(void) {
  //! [Bands and channels]
  for (uint32_t i = 0; i < KRAL_Band_Helper_GetBandCount(); ++i) {
    uint16_t band;
    char name[64] = "";
    int32_t first, last;
    if (!KRAL_Band_Helper_GetBand(i, &band) || !KRAL_Band_Helper_GetBandName(band, name, sizeof name)) continue;
    if (!KRAL_Band_Helper_GetBandRange(band, KRAL_BAND_UPLINK, 0, &first, &last)) continue;
    printf("%s: channel %ld is %ld up, %ld down\n", name, (long)first,
           (long)KRAL_Band_Helper_CalculateULFrequency(band, first),
           (long)KRAL_Band_Helper_CalculateDLFrequency(band, first));
  }
  //! [Bands and channels]
}

void raw_requests(KRAL_HANDLE handle) {
  //! [A request of your own]
  const uint8_t request[] = {0x4B, 0x0F, 0x00, 0x00};
  uint8_t reply[4096];
  uint16_t size = sizeof reply;

  if (KRAL_SendSync(handle, sizeof request, request, &size, reply, 2000))
    printf("%u bytes, first %02X\n", size, reply[0]);
  KRAL_SendASync(handle, sizeof request, request, 2000, 1); /* its answer comes as a packet */
  KRAL_SetResynchronise(handle, 1);                         /* so that no late answer is taken for that of the next */
  //! [A request of your own]
}

//! [Bytes without frames]
static void KRAL_CALL on_packet(uint32_t size, const uint8_t *bytes, uintptr_t value) {
  fprintf((FILE *)value, "%u bytes, first %02X\n", (unsigned)size, bytes[0]);
}

void unframed(KRAL_HANDLE handle) {
  const uint8_t greeting[] = "AT\r";
  uint8_t answer[64];
  uint16_t size = sizeof answer;

  KRAL_ConfigureCallBacks(handle, on_packet, (uintptr_t)stderr);
  KRAL_SetPacketMode(handle, KRAL_PACKET_MODE_UNFRAMED);
  KRAL_SetStartFlag(handle, 0);
  KRAL_FlushRxBuffer(handle);
  if (KRAL_SendRAW(handle, 3, greeting, &size, answer, 500)) printf("%.*s\n", size, answer);
  KRAL_SetPacketMode(handle, KRAL_PACKET_MODE_FRAMED);
}
//! [Bytes without frames]

void line_settings(KRAL_HANDLE handle) {
  //! [The line itself]
  KRAL_SetDTR_State(handle, 1);
  KRAL_SetRTS_State(handle, 1);
  KRAL_SetSendDataSerialWriteSizeLimit(handle, 64); /* for adapters that lose bytes of long writes */
  //! [The line itself]
}

void own_transport(KRAL_HANDLE handle) {
  //! [A transport that tells when bytes came]
  KRAL_SetReceiveWait(handle, 1000); /* the receive function is asked that seldom ... */
  KRAL_NotifyReceived(handle);       /* ... unless it is told: from the thread that got the bytes */
  //! [A transport that tells when bytes came]
}
