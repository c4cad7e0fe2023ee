/**
 * @file text_log.h
 * The text log of a handset: what the library did and why something failed, line by line, to a file and to a callback.
 *
 * Beside the rules of kral.h:
 *
 * - Each handset has its own log. Each line carries a category flag; the mask of KRAL_SetLogFlags chooses which
 *   categories are written. A new handset's mask is empty until KRAL_SetLogFlags or KRAL_StartLogging.
 * - A line of the file is the time, a tab, and ",CATEGORY,text". The time is minutes:seconds:milliseconds. The name
 *   is that of the lowest bit of the flag. Device lines are indented by four blanks, framing lines by two.
 * - Control characters in what a line quotes (a handset's texts, an argument) are written as \x and two hexadecimal
 *   digits, those of UTF-8 (C2 80 to C2 9F) byte by byte; tabs stay. KRAL_AddUserMessageToTextLog writes them as they
 *   are.
 * - The functions may be called from any thread and never wait for a running request.
 */
#ifndef KRAL_TEXT_LOG_H
#define KRAL_TEXT_LOG_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Category flags, and the names that lines show. */
#define KRAL_LOG_IO 0x1u                   /* LOG_IO: raw traffic */
#define KRAL_LOG_FN 0x2u                   /* LOG_FN: entry of internal functions */
#define KRAL_LOG_RET 0x4u                  /* LOG_RET: results and details */
#define KRAL_LOG_ASYNC 0x8u                /* LOG_ASYNC: asynchronous traffic */
#define KRAL_LOG_ERR 0x10u                 /* LOG_ERR: errors */
#define KRAL_LOG_IO_AHDLC 0x20u            /* LOG_IO_AHDLC: framing layer, traffic */
#define KRAL_LOG_FN_AHDLC 0x40u            /* LOG_FN_AHDLC: functions */
#define KRAL_LOG_RET_AHDLC 0x80u           /* LOG_RET_AHDLC: results */
#define KRAL_LOG_INF_AHDLC 0x100u          /* LOG_INF_AHDLC: information */
#define KRAL_LOG_C_HIGH_LEVEL_START 0x200u /* LOG_C_HIGH_LEVEL_START: exported functions as they are called */
#define KRAL_LOG_IO_DEV 0x400u             /* LOG_IO_DEV: serial port, traffic */
#define KRAL_LOG_FN_DEV 0x800u             /* LOG_FN_DEV: functions */
#define KRAL_LOG_RET_DEV 0x1000u           /* LOG_RET_DEV: results */
#define KRAL_LOG_INF_DEV 0x2000u           /* LOG_INF_DEV: information */
#define KRAL_LOG_C_HIGH_LEVEL_STOP 0x4000u /* LOG_C_HIGH_LEVEL_STOP: end of exported functions */
#define KRAL_LOG_NV_MANAGER_DEBUG 0x8000u  /* LOG_NV_MANAGER_DEBUG */

/** The mask that KRAL_StartLogging activates unless KRAL_SetLogFlags has stored another. */
#define KRAL_LOG_DEFAULT_MASK 0x421Fu

/** Size in bytes of the record that the callback is given. */
#define KRAL_TEXT_LOG_RECORD_SIZE 1008u

/**
 * Takes a line of the log, on the thread that wrote it: a thread of the caller, or one of the connection's own. It
 * must not send requests. It may call other functions of the library: the lines that these write on its thread, of any
 * handset, go to the files only and not back to it.
 *
 * | offset | size | field                                                                      |
 * |--------|------|----------------------------------------------------------------------------|
 * |      0 |    2 | category flag, its low 16 bits                                             |
 * |      2 |    2 | 0                                                                          |
 * |      4 |    4 | milliseconds since the handset was connected or its log was last stopped   |
 * |      8 |  999 | the text with its indentation, terminated, cut to 999 bytes                |
 * |   1007 |    1 | 0                                                                          |
 *
 * @param size    KRAL_TEXT_LOG_RECORD_SIZE
 * @param record  [size] valid during the call; multi-byte fields are little-endian
 * @param handle  the handle with which the callback was configured
 */
typedef void(KRAL_CALL* KRAL_TEXT_LOG_CALLBACK)(uint32_t size, const void* record, uint32_t handle);

/**
 * Starts writing the log to a file. The file is opened, and truncated, with the next line; one that cannot be opened
 * is not reported, its lines are dropped. While a log is being written, starts the new one in its place.
 *
 * A terminal, the null device, and a pipe that somebody reads already are opened too. Each line then waits until it is
 * taken, and with it the thread that writes it. A file that does not take a line (a full disk, a pipe whose reader has
 * gone) costs that line; the callback receives one line about it, before that line.
 *
 * @param handle     from a connect function
 * @param file_name  terminated
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartLogging(KRAL_HANDLE handle, const char* file_name);

/**
 * Closes the log file. The callback keeps receiving lines. KRAL_DisconnectServer does this too.
 *
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_StopLogging(KRAL_HANDLE handle);

/** Tells whether a log is being written. @return [answer] 1 between KRAL_StartLogging and KRAL_StopLogging */
KRAL_API uint8_t KRAL_CALL KRAL_IsLoggingStarted(KRAL_HANDLE handle);

/**
 * Chooses the categories that are written from now on, also by later starts.
 *
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetLogFlags(KRAL_HANDLE handle, uint32_t mask);

/**
 * Writes a line of the caller's.
 *
 * @param handle  from a connect function
 * @param flag    category of the line
 * @param text    terminated; written as it is, lines of more than 12,295 characters are cut
 * @param echo    1: the text also goes to the standard output
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_AddUserMessageToTextLog(KRAL_HANDLE handle, uint32_t flag, const char* text,
                                                        uint8_t echo);

/**
 * Writes an asynchronous message of the handset as a line: its kind by its first byte, and its size.
 *
 * @param handle      from a connect function
 * @param flag        category of the line
 * @param message     [size] the de-framed packet
 * @param size        bytes of the message
 * @param with_code   1: the first byte is shown as a number too
 * @param with_bytes  1: the bytes follow in hexadecimal
 * @return 1; 0 for an unknown handle and for an empty message
 */
KRAL_API uint8_t KRAL_CALL KRAL_AddUserAsyncLogMessageToTextLog(KRAL_HANDLE handle, uint32_t flag,
                                                                const uint8_t* message, uint16_t size,
                                                                uint8_t with_code, uint8_t with_bytes);

/**
 * Gives every written line to a function of the caller, beside the file.
 *
 * @param handle    from a connect function; handed back to the callback
 * @param callback  null: turns it off. A line that another thread is handing over may still arrive.
 */
KRAL_API void KRAL_CALL KRAL_ConfigureLibraryTextLogCallBack(KRAL_HANDLE handle, KRAL_TEXT_LOG_CALLBACK callback);

#ifdef __cplusplus
}
#endif

#endif
