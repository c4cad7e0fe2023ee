/**
 * @file diag.h
 * Core diagnostic commands: identity, operating mode, memory, keys, service programming code, error log, status.
 *
 * Beside the rules of kral.h:
 *
 * - Unless a function says otherwise it may wait for time-out 0 (4,000 ms), plus the opening of a closed port, and
 *   may be called from any thread.
 * - A handset that answers with another command code, or refuses (bad command, parameter, length or mode): the
 *   function returns 0, with the reason in the text log.
 * - An output pointer may be null where the value is not wanted. With a null input the function returns 0 without
 *   traffic.
 */
#ifndef KRAL_DIAG_H
#define KRAL_DIAG_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/* --- Sizes of buffers --------------------------------------------------------------------------------------------- */

#define KRAL_VERNO_DATE_SIZE 11      /* a date of KRAL_DIAG_VERNO_F, not terminated */
#define KRAL_VERNO_TIME_SIZE 8       /* a time of it */
#define KRAL_VERNO_DIRECTORY_SIZE 8  /* the version directory of it */
#define KRAL_BUILD_ID_TEXT_SIZE 4096 /* a text of KRAL_DIAG_EXT_BUILD_ID_F */
#define KRAL_SERVICE_CODE_SIZE 6     /* the digits of KRAL_DIAG_SPC_F */
#define KRAL_LONGEST_DIAG_REPLY 6144 /* any answer, as KRAL_DIAG_ERR_READ_F copies it */

/* --- Identity ----------------------------------------------------------------------------------------------------- */

/**
 * Reads the version of the handset's software.
 *
 * The five texts are runs of characters of exactly the size given; none is terminated.
 *
 * @param      handle                  from a connect function
 * @param[out] compile_date            [KRAL_VERNO_DATE_SIZE] 11 bytes
 * @param[out] compile_time            [KRAL_VERNO_TIME_SIZE] 8 bytes
 * @param[out] release_date            [KRAL_VERNO_DATE_SIZE] 11 bytes
 * @param[out] release_time            [KRAL_VERNO_TIME_SIZE] 8 bytes
 * @param[out] version_directory       [KRAL_VERNO_DIRECTORY_SIZE] 8 bytes
 * @param[out] station_class_mark      [1] 8 bits
 * @param[out] air_interface_revision  [1] 8 bits
 * @param[out] mobile_model            [1] 8 bits
 * @param[out] firmware_revision       16 bits
 * @param[out] slot_cycle_index        [1] 8 bits
 * @param[out] vocoder_major           [1] 8 bits
 * @param[out] vocoder_minor           [1] 8 bits
 * @return 1 when the handset answered. 1 also for an answer of fewer than 54 bytes: the outputs then show the last
 *         full answer of this connection's handset object, or zeros when there was none.
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_VERNO_F(KRAL_HANDLE handle, char* compile_date, char* compile_time,
                                             char* release_date, char* release_time, char* version_directory,
                                             uint8_t* station_class_mark, uint8_t* air_interface_revision,
                                             uint8_t* mobile_model, uint16_t* firmware_revision,
                                             uint8_t* slot_cycle_index, uint8_t* vocoder_major, uint8_t* vocoder_minor);

/**
 * Reads the extended build identity.
 *
 * The texts are copied with their terminators and their length is not checked against the buffers, which therefore
 * must hold the longest text that a handset can send: KRAL_BUILD_ID_TEXT_SIZE (4,096) bytes each.
 *
 * @param      handle             from a connect function
 * @param[out] hardware_version   version of the BXC hardware
 * @param[out] mobile_model       number of the mobile model
 * @param[out] software_revision  [KRAL_BUILD_ID_TEXT_SIZE] NUL-terminated
 * @param[out] model              [KRAL_BUILD_ID_TEXT_SIZE] NUL-terminated; empty when the handset sent no second text
 * @return 1 on success; 0 also when the answer ends before the mobile model. Texts that were not sent are empty
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_EXT_BUILD_ID_F(KRAL_HANDLE handle, uint32_t* hardware_version,
                                                    uint32_t* mobile_model, char* software_revision, char* model);

/** What KRAL_DIAG_READ_ESN_F reads where there is no serial number. */
#define KRAL_NO_SERIAL_NUMBER 0xDEADBEEFu

/**
 * Reads the electronic serial number (NV item 0).
 *
 * With KRAL_TARGET_APPLICATION (KRAL_SetTargetType) there is no such number: the call then returns 1 and
 * KRAL_NO_SERIAL_NUMBER without traffic.
 *
 * @param      handle  from a connect function
 * @param[out] serial  the serial number
 * @return 1 on success; 0 also when the NV status of the answer is not 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_READ_ESN_F(KRAL_HANDLE handle, uint32_t* serial);

/* --- Operating mode ----------------------------------------------------------------------------------------------- */

/** Operating modes. */
#define KRAL_MODE_OFFLINE_ANALOG 0
#define KRAL_MODE_OFFLINE_DIGITAL 1
#define KRAL_MODE_RESET 2
#define KRAL_MODE_FACTORY_TEST 3
#define KRAL_MODE_ONLINE 4
#define KRAL_MODE_LOW_POWER 5

/**
 * Switches the operating mode: 0 offline (analog), 1 offline (digital), 2 reset, 3 factory test, 4 online, 5 low
 * power. Only the low four bits are sent.
 *
 * After the request for mode 3, 4, 0 and 1 the call sleeps for time-out 11 (150 ms), 12 (140 ms) and 13 (3,000 ms)
 * respectively. It then asks the handset for its mode every 100 ms until the new one is reported or time-out 18
 * (500 ms) has passed; mode 5 is read back without the sleep. With the legacy FTM command (59) it sleeps time-out 18
 * instead of asking. Any other mode returns right after the request.
 *
 * The comparison uses `mode` as passed: bits above the low four make the read-back fail.
 *
 * @param handle  from a connect function
 * @param mode    KRAL_MODE_...
 * @return 1 when the handset reports the new mode; where nothing is read back, 1 when it answered the request
 *
 * Wait: time-out 0 for the request, the sleep, time-out 18, and time-out 0 for a query that gets no answer.
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_CONTROL_F(KRAL_HANDLE handle, uint16_t mode);

/* --- Memory ------------------------------------------------------------------------------------------------------- */

/**
 * Reads `count` bytes of the handset's memory.
 *
 * @param      handle   from a connect function
 * @param      address  in the handset
 * @param      count    elements to read; one answer must carry them all, and many handsets carry at most 16 bytes
 * @param[out] data     [count] the elements
 * @return 1 on success; 0 also when the answer holds fewer
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_F(KRAL_HANDLE handle, uint32_t address, uint16_t count, uint8_t* data);

/** The same for 16-bit words. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_WORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                        uint16_t* data);

/** The same for 32-bit words. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_PEEK_DWORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                         uint32_t* data);

/**
 * Writes `count` bytes into the handset's memory.
 *
 * @param      handle   from a connect function
 * @param      address  in the handset
 * @param      count    elements to write
 * @param      data     [count] the elements
 * @param[out] status   [1] the last byte of the answer, the handset's own status
 * @return 1 when the handset answered
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                   const uint8_t* data, uint8_t* status);

/** The same for 16-bit words. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_WORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                        const uint16_t* data, uint8_t* status);

/** The same for 32-bit words. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_MEMORY_POKE_DWORD_F(KRAL_HANDLE handle, uint32_t address, uint16_t count,
                                                         const uint32_t* data, uint8_t* status);

/* --- Keys, switches, service code --------------------------------------------------------------------------------- */

/**
 * Presses a key of the handset.
 *
 * @param handle  from a connect function
 * @param hold    1: the key is held down, 0: pressed and released
 * @param key     the handset's key code
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_HS_KEY_F(KRAL_HANDLE handle, uint8_t hold, uint8_t key);

/**
 * Reads the switch word of the handset.
 *
 * @param      handle    from a connect function
 * @param[out] switches  one bit per switch, bit 0 first
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GET_DIPSW_F(KRAL_HANDLE handle, uint16_t* switches);

/** Writes the switch word of the handset, one bit per switch. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SET_DIPSW_F(KRAL_HANDLE handle, uint16_t switches);

/**
 * Sends the service programming code, which unlocks protected settings. The code appears in the text log in clear.
 *
 * @param      handle  from a connect function
 * @param      code    [KRAL_SERVICE_CODE_SIZE] ASCII digits. Exactly six characters are read: no terminator is
 *                     needed, and a shorter text is read beyond its end
 * @param[out] result  [1] the last byte of the answer: 1 when the handset accepted the code
 * @return 1 when the handset answered, whatever it thought of the code
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SPC_F(KRAL_HANDLE handle, const char* code, uint8_t* result);

/* --- Error log and status ----------------------------------------------------------------------------------------- */

/**
 * Reads the error log.
 *
 * @param         handle   from a connect function
 * @param[in,out] size     in: bytes of `records`; out: bytes written. A longer answer is cut at the room. An answer
 *                         has at most KRAL_LONGEST_DIAG_REPLY bytes.
 * @param[out]    records  [size] the answer as it came, its command code (42) first
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ERR_READ_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* records);

/** Clears one record of the error log, by its index. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ERR_CLEAR_F(KRAL_HANDLE handle, uint8_t record);

/** Reads the status record; as KRAL_DIAG_ERR_READ_F. @param[out] record  [size] the answer, with 75 first */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_STATUS_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* record);

/** Reads the IS-2000 status record; as KRAL_DIAG_ERR_READ_F. @param[out] record  [size] the answer, with 112 first */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_IS2000_STATUS_F(KRAL_HANDLE handle, uint16_t* size, uint8_t* record);

/* --- Whole-handset requests --------------------------------------------------------------------------------------- */

/** Makes the handset leave diagnostic mode for its download loader; it then answers no diagnostic request. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_DLOAD_F(KRAL_HANDLE handle);

/** Freezes the security settings of the handset; this cannot be undone. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SECURITY_FREEZE_F(KRAL_HANDLE handle);

/** Makes the handset back up its NV items. Wait: time-out 5 (10,000 ms). */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_CNV_DIAG_BACKUP_F(KRAL_HANDLE handle);

/* --- GSM call control --------------------------------------------------------------------------------------------- */

/** No request is defined: writes an error line into the text log and returns 0, without traffic. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GSM_STATUS_F(KRAL_HANDLE handle);

/** No request is defined: writes an error line into the text log and returns 0, without traffic. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GSM_CALL_ORIG_F(KRAL_HANDLE handle);

/** No request is defined: writes an error line into the text log and returns 0, without traffic. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GSM_CALL_END_F(KRAL_HANDLE handle);

#ifdef __cplusplus
}
#endif

#endif
