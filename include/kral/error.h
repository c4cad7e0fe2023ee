/**
 * @file error.h
 * Why a call failed: the record that each failing call leaves, and the names of its codes.
 */
#ifndef KRAL_ERROR_H
#define KRAL_ERROR_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/**
 * @name Error codes
 * One list for the whole library; the command-line tool exits with the same numbers.
 * @{
 */
#define KRAL_ERROR_NONE 0         /**< no failure */
#define KRAL_ERROR_INTERNAL 1     /**< a fault of the library, or no memory */
#define KRAL_ERROR_ARGUMENT 2     /**< the library refused an argument, a handle or the state; nothing was sent */
#define KRAL_ERROR_NO_PORT 3      /**< there is no such port, or it cannot be opened as one */
#define KRAL_ERROR_PORT_IN_USE 4  /**< the port is held by another program, or not permitted */
#define KRAL_ERROR_NO_ANSWER 5    /**< nothing came in time */
#define KRAL_ERROR_LINK 6         /**< the answer was another one, too short or garbled, or the request not written */
#define KRAL_ERROR_REFUSED 7      /**< the handset said no; its own status is in the record */
#define KRAL_ERROR_MISMATCH 8     /**< a comparison found a difference */
#define KRAL_ERROR_LOST 9         /**< the handset or its port went away */
#define KRAL_ERROR_BAD_FILE 10    /**< a file of this machine cannot be read, written or understood */
#define KRAL_ERROR_SAFETY_STOP 11 /**< stopped before doing harm */
#define KRAL_ERROR_ABORTED 130    /**< ended by the caller */
/** @} */

/**
 * @name What KRAL_ERROR::status is
 * @{
 */
#define KRAL_ERROR_STATUS_NONE 0 /**< nothing: status is 0 */
#define KRAL_ERROR_STATUS_REFUSAL \
  1                                /**< first byte of an error response: 19 command, 20 parameter, 21 length, 24 mode */
#define KRAL_ERROR_STATUS_REPLY 2  /**< first byte of a reply that answers something else */
#define KRAL_ERROR_STATUS_EFS 3    /**< error number of the handset's file system (efs.h) */
#define KRAL_ERROR_STATUS_NV 4     /**< status of an NV item (nv.h) */
#define KRAL_ERROR_STATUS_LOADER 5 /**< answer of a loader, boot loader or flash programmer */
#define KRAL_ERROR_STATUS_COMMAND 6 /**< status field of any other command's reply */
#define KRAL_ERROR_STATUS_RESULT 7  /**< the result or error code that the function itself hands out */
/** @} */

/**
 * @name Bits of KRAL_ERROR::present
 * @{
 */
#define KRAL_ERROR_HAS_COMMAND 1     /**< command is set */
#define KRAL_ERROR_HAS_OFFSET 2      /**< offset is set */
#define KRAL_ERROR_HAS_LINE 4        /**< line is set */
#define KRAL_ERROR_OF_OTHER_THREAD 8 /**< the failure is another thread's: the calling one has none on the handle */
/** @} */

/** One failure: 360 bytes without padding, the same on all platforms. Texts are UTF-8, terminated, without controls. */
typedef struct KRAL_ERROR {
  uint32_t code;         /**< one of the KRAL_ERROR_ codes */
  uint32_t status_kind;  /**< one of KRAL_ERROR_STATUS_ */
  uint32_t status;       /**< what the handset said */
  uint32_t system_error; /**< errno, or GetLastError() on Windows; 0 when the system had no part in it */
  uint32_t present;      /**< KRAL_ERROR_HAS_ bits, and whose failure it is */
  uint32_t command;      /**< the first four bytes of the request, the first one lowest: 75, subsystem, command */
  uint32_t line;         /**< line of a text file, from 1 */
  uint32_t number;       /**< of the failure, as KRAL_GetLastError gives it: a later one has another */
  uint64_t offset;       /**< byte offset in the file or memory concerned */
  char function[64];     /**< the exported function that failed */
  char text[256];        /**< one sentence that names what was wrong */
} KRAL_ERROR;

/**
 * Gets the record of the calling thread's last failed call on a handle. Where this thread has none on it, the latest
 * one of any thread: hosts such as LabVIEW move a program between threads.
 *
 * A successful call does not clear the record (as with errno): look only after a failure. Functions whose 0 is an
 * answer, such as KRAL_IsLoggingStarted, leave a record only when they could not ask; then its `number` is a new one.
 * Records are kept for the latest few hundred failures; those of a handle are forgotten when a connect returns its
 * value again.
 *
 * @param      handle  from a connect function, or one that is not valid any more; 0: the calling thread's last failed
 *                     connect, or failed call of a function without handle
 * @param[out] error   the record
 * @return 1 on success; 0 when there is no record
 *
 * Wait: none. Any thread. Writes nothing into the text log and leaves no record.
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetLastError(KRAL_HANDLE handle, KRAL_ERROR* error);

/**
 * Gets what an error code means, as a short phrase ("no answer in time").
 *
 * @param      code  one of the KRAL_ERROR_ codes
 * @param[out] text  [size] the phrase, terminated, in ASCII
 * @param      size  bytes of text; 64 are enough for every phrase
 * @return 1 on success; 0 for an unknown code and when the phrase does not fit, with text untouched
 *
 * Wait: none. Any thread.
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetErrorText(uint32_t code, char* text, uint32_t size);

#ifdef __cplusplus
}
#endif

#endif
