/**
 * @file ftm.h
 * Factory test mode (FTM): the mode a handset is in, the radio technology that receives commands, and the commands
 * themselves. The RF commands with a payload of the caller are listed in ftm_commands.h.
 *
 * Beside the rules of kral.h:
 *
 * - An FTM request names a dispatcher of the handset by its mode id (KRAL_FTM_SET_MODE_ID). The mode id, the command
 *   code and the last RF mode are kept per handle, also across reconnects; they are never read back from the handset.
 * - A request may wait for time-out 0 (4,000 ms). 1 means that the handset answered: FTM commands do not judge the
 *   status words within an answer.
 * - The library's FTM sequencer modes (queue, batch) are off; requests to mode id 37 are passed on like any other.
 */
#ifndef KRAL_FTM_H
#define KRAL_FTM_H

#include "kral/ftm_commands.h"
#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/* --- Settings of the handle --------------------------------------------------------------------------------------- */

/** Mode ids: dispatchers of the handset for FTM commands. They are the names that the text log shows. */
#define KRAL_FTM_MODE_ID_CDMA_1X 0
#define KRAL_FTM_MODE_ID_WCDMA 1
#define KRAL_FTM_MODE_ID_GSM 2
#define KRAL_FTM_MODE_ID_CDMA_1X_RX1 3
#define KRAL_FTM_MODE_ID_BLUETOOTH 4
#define KRAL_FTM_MODE_ID_CDMA_1X_CALL 7
#define KRAL_FTM_MODE_ID_HDR_C 8 /* EVDO */
#define KRAL_FTM_MODE_ID_LOGGING 9
#define KRAL_FTM_MODE_ID_AGPS 10
#define KRAL_FTM_MODE_ID_PMIC 11
#define KRAL_FTM_MODE_ID_GSM_BER 13
#define KRAL_FTM_MODE_ID_AUDIO 14
#define KRAL_FTM_MODE_ID_CAMERA 15
#define KRAL_FTM_MODE_ID_WCDMA_BER 16
#define KRAL_FTM_MODE_ID_GSM_EXTENDED_C 17
#define KRAL_FTM_MODE_ID_CDMA_API_V2 18
#define KRAL_FTM_MODE_ID_ZEFT_C 19 /* broadcast */
#define KRAL_FTM_MODE_ID_RF_COMMON 20
#define KRAL_FTM_MODE_ID_WCDMA_RX1 21
#define KRAL_FTM_MODE_ID_WLAN 22
#define KRAL_FTM_MODE_ID_LTE 29
#define KRAL_FTM_MODE_ID_LTE_NS 30
#define KRAL_FTM_MODE_ID_CDMA_1X_C2 32
#define KRAL_FTM_MODE_ID_LTE_RX1 35
#define KRAL_FTM_MODE_ID_RFNV 36      /* RF NV items */
#define KRAL_FTM_MODE_ID_SEQUENCER 37 /* the handset's sequencer */
#define KRAL_FTM_MODE_ID_SV 38
#define KRAL_FTM_MODE_ID_RFM_C 39
#define KRAL_FTM_MODE_ID_1X_C3_C 40
#define KRAL_FTM_MODE_ID_RFCA_MAL_C 41
#define KRAL_FTM_MODE_ID_TDSCDMA 42
#define KRAL_FTM_MODE_ID_TDSCDMA_RX1 43
#define KRAL_FTM_MODE_ID_TDSCDMA_BER 44
#define KRAL_FTM_MODE_ID_LTE_C3 47
#define KRAL_FTM_MODE_ID_LTE_C4 48
#define KRAL_FTM_MODE_ID_GSM_C2 49
#define KRAL_FTM_MODE_ID_GSM_EXTENDED_C2 50
#define KRAL_FTM_MODE_ID_GSM_BER_C2 51
#define KRAL_FTM_MODE_ID_PRODUCTION 0x8000
#define KRAL_FTM_MODE_ID_LTM 0x8001

/** Command codes that carry FTM. */
#define KRAL_FTM_COMMAND_CODE_SUBSYSTEM 75
#define KRAL_FTM_COMMAND_CODE_LEGACY 59

/**
 * Chooses the dispatcher that receives FTM commands. Sends nothing.
 *
 * @param handle   from a connect function
 * @param mode_id  KRAL_FTM_MODE_ID_... or any other 16-bit value; KRAL_FTM_MODE_ID_WCDMA for a new handle. Known ids
 *                 are logged with their names
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_MODE_ID(KRAL_HANDLE handle, uint16_t mode_id);

/** Returns the mode id in force. Sends nothing. @param[out] mode_id  KRAL_FTM_MODE_ID_..., or another number */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_MODE_ID(KRAL_HANDLE handle, uint16_t* mode_id);

/**
 * Chooses the diagnostic command code that carries FTM: KRAL_FTM_COMMAND_CODE_SUBSYSTEM (the default) or
 * KRAL_FTM_COMMAND_CODE_LEGACY (legacy handsets). Sends nothing.
 *
 * @return 1; 0 for any other code, which changes nothing
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t code);

/** Returns the command code in force. Sends nothing. @param[out] code  KRAL_FTM_COMMAND_CODE_... */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GET_COMMAND_CODE(KRAL_HANDLE handle, uint16_t* code);

/* --- Into and out of factory test mode ---------------------------------------------------------------------------- */

/**
 * Asks whether the handset is in factory test mode: its operating mode under command code 75, the boot flag (NV item
 * 453) under 59. A handset of target type 1 has no such query: it counts as not in FTM.
 *
 * @param      handle  from a connect function
 * @param[out] is_ftm  [1] 1 or 0
 * @return 1 when the handset answered
 */
KRAL_API uint8_t KRAL_CALL KRAL_IsFTM_Mode(KRAL_HANDLE handle, uint8_t* is_ftm);

/**
 * Chooses the mode in which the handset boots: takes it offline (KRAL_DIAG_CONTROL_F with mode 1) and writes NV item
 * 453.
 *
 * @param handle  from a connect function
 * @param ftm     first data byte of the item: 1 for factory test mode, 0 for normal
 * @param reset   1: resets the handset afterwards, so that it boots into the new mode; the answer is not awaited for
 *                the result
 * @return 1 when the handset went offline and its NV status is 0
 *
 * Wait: as KRAL_DIAG_CONTROL_F, plus time-out 0 for the write and for the reset.
 */
KRAL_API uint8_t KRAL_CALL KRAL_ChangeFTM_BootMode(KRAL_HANDLE handle, uint8_t ftm, uint8_t reset);

/**
 * Switches between factory test mode and online while the handset runs. Nothing is sent beside the query when it
 * already is in the wanted mode.
 *
 * @param handle  from a connect function
 * @param ftm     not 0: factory test mode; 0: online
 * @return 1 when the handset is in the wanted mode; 0 also when the query fails and under command code 59
 *
 * Wait: time-out 0 for the query, then as KRAL_DIAG_CONTROL_F.
 */
KRAL_API uint8_t KRAL_CALL KRAL_ChangeFTM_ModeRuntime(KRAL_HANDLE handle, uint8_t ftm);

/* --- Commands with arguments of their own ------------------------------------------------------------------------- */

/**
 * RF modes: the first one of each technology. The others of a technology, its bands, have no names: see the table of
 * KRAL_FTM_SET_MODE.
 */
#define KRAL_FTM_RF_MODE_SLEEP 2
#define KRAL_FTM_RF_MODE_CDMA 3
#define KRAL_FTM_RF_MODE_WCDMA 9
#define KRAL_FTM_RF_MODE_GSM 10
#define KRAL_FTM_RF_MODE_BROADCAST 30
#define KRAL_FTM_RF_MODE_LTE 34
#define KRAL_FTM_RF_MODE_TDSCDMA 90

/**
 * Sets the RF mode: technology and band (command 7).
 *
 * A mode id that does not belong to the RF mode's technology is replaced first:
 *
 *     RF modes                                    mode ids kept                                    else
 *     2 (sleep)                                   0, 1, 2, 3, 19, 21, 29, 32, 40, 42, 45, 49       1
 *     3, 5, 6, 8, 14, 17, 19, 26, 27, 32, 33      0, 3, 32, 40, 45                                 0
 *     9, 15, 16, 22, 23, 25, 28, 29, 31, 40, 75   1, 21                                            1
 *     10, 11, 12, 18                              2, 49                                            2
 *     30                                          none                                             19
 *     34 to 39, 41 to 74, 76, 77                  47, 48                                           29
 *     90, 91, 92                                  42, 43                                           42
 *
 * @param handle  from a connect function
 * @param mode    an RF mode of the table, such as KRAL_FTM_RF_MODE_WCDMA
 * @return 1 when the handset answered; 0 without traffic for any other RF mode
 *
 * Wait: time-out 0; after RF modes 10, 11, 12 and 18 also time-out 14 (100 ms) for the transceiver to settle.
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_MODE(KRAL_HANDLE handle, uint16_t mode);

/**
 * Sets the channel (command 8).
 *
 * @param handle   from a connect function
 * @param channel  channel number of the RF mode's band
 * @return 1 when the handset answered
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_CHAN(KRAL_HANDLE handle, uint16_t channel);

/** Switches the transmitter on (command 2). */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_ON(KRAL_HANDLE handle);

/** Switches the transmitter off (command 3). */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SET_TX_OFF(KRAL_HANDLE handle);

/* --- Commands of every family: additions of this library ---------------------------------------------------------- */

/**
 * Addition. Sends any FTM command to the dispatcher of the current mode id, as KRAL_FTM_GSM_CAPTURE_IQ sends its own.
 *
 * @param command  the command id
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SendCommand(KRAL_HANDLE handle, uint16_t command, const uint8_t* payload,
                                                uint16_t payload_size, uint8_t* response, uint16_t* response_size);

/** Header forms of KRAL_FTM_SendCommandTo. */
#define KRAL_FTM_HEADER_PLAIN 0   /* the payload follows the command id */
#define KRAL_FTM_HEADER_LENGTHS 1 /* two data lengths come first: EVDO, AGPS */
#define KRAL_FTM_HEADER_ZEROS 2   /* two zeros come first: PMIC */

/**
 * Addition. As KRAL_FTM_SendCommand, but to the dispatcher of a given mode id and with a given header, which leaves the
 * current mode id as it is. So every family is reached by its own rule, for example EVDO with mode id 8 and form 1,
 * PMIC with 11 and form 2, AUDIO with 14 and form 0.
 *
 * @param mode_id      the dispatcher; not sent under command code 59
 * @param header_form  0: the payload follows the command id.
 *                     1: request and response data lengths (16 bits each) come first. The request length is the one
 *                     that the EVDO (8) and AGPS (10) dispatchers expect of the command, else 0; the response length 0.
 *                     2: two 16-bit zeros come first; the payload is the PMIC command's argument byte.
 *                     Any other form returns 0 without traffic.
 *
 * `response` receives what follows the command id, the two length words of forms 1 and 2 included.
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_SendCommandTo(KRAL_HANDLE handle, uint16_t mode_id, uint8_t header_form,
                                                  uint16_t command, const uint8_t* payload, uint16_t payload_size,
                                                  uint8_t* response, uint16_t* response_size);

/** Room that holds the name of every command. */
#define KRAL_FTM_COMMAND_NAME_SIZE 64

/** Addition. The number of commands in the library's table of RF commands. */
KRAL_API uint16_t KRAL_CALL KRAL_FTM_GetCommandCount(void);

/**
 * Addition. One row of the table, which is sorted by command id. Some ids are in two rows.
 *
 * @param      index      0 to KRAL_FTM_GetCommandCount() - 1
 * @param[out] command    the command id
 * @param[out] name       [name_size] the name without "KRAL_FTM_", NUL-terminated
 * @param      name_size  room of `name`; KRAL_FTM_COMMAND_NAME_SIZE bytes hold every name
 * @return 1; 0 for an index out of range or a name that does not fit
 */
KRAL_API uint8_t KRAL_CALL KRAL_FTM_GetCommandInfo(uint16_t index, uint16_t* command, char* name, uint16_t name_size);

#ifdef __cplusplus
}
#endif

#endif
