/**
 * @file kivrat.h
 * The boot transfer (Kivrat): a handset in its primary boot loader is asked for its chip identity and given a flash
 * programmer; and the whole way of a download in one call.
 *
 * The functions of this header belong to the set of download.h, the two for the phone server excepted: their names and
 * signatures were chosen for it as a whole. Progress and abort are those of download.h.
 *
 * The way: KRAL_Kivrat_ConnectServer takes a handle without touching the port; KRAL_Kivrat_Connect answers the
 * target's hello; KRAL_Kivrat_DownloadFlashProgrammer serves what it asks for. Then the handset runs its flash
 * programmer: KRAL_STREAM_HELLO and images.
 *
 * Beside the rules of kral.h:
 *
 * - A boot loader sends hello once, unprompted. KRAL_ConnectServer would consume it: it opens the port for
 *   diagnostics. Every other connect serves as well when the hello comes later, as from a handset that
 *   KRAL_DIAG_DLOAD_F has just sent into its boot loader.
 * - From KRAL_Kivrat_Connect on the port belongs to the boot transfer, and requests of the handle return 0. It is
 *   returned at the end of KRAL_Kivrat_DownloadFlashProgrammer, by every failure, by KRAL_Kivrat_End and by a connect;
 *   the next request opens it for diagnostics again. Only a flash programmer whose file cannot be opened leaves
 *   everything as it is: the target still waits, and can be given another file.
 * - Nothing is repeated inside an exchange. After a failure the target waits for ever, or until it is powered off and
 *   on: a new attempt begins with its hello.
 * - Every packet of the target is awaited for 5,000 ms.
 */
#ifndef KRAL_KIVRAT_H
#define KRAL_KIVRAT_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/**
 * Takes the context of a port, as KRAL_ConnectServer does, without opening the port. Sets no mode; direct mode is
 * needed for everything that follows.
 *
 * @param port  COM number
 * @return the handle; 0 when all 50 contexts are taken
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_Kivrat_ConnectServer(uint32_t port);

/**
 * Sets how the boot transfers of a handset go on. Never waits for a running request.
 *
 * @param handle             from a connect function
 * @param hello_retries      how often KRAL_Kivrat_Connect tries again when the port cannot be opened, goes away, or no
 *                           hello comes (0 by default); a handset that changes its device needs some
 * @param retry_delay_ms     pause between two tries (500 by default)
 * @param pre_done_delay_ms  pause before the target is told that all is done (0 by default)
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_Kivrat_Configure(KRAL_HANDLE handle, uint32_t hello_retries, uint32_t retry_delay_ms,
                                                 uint32_t pre_done_delay_ms);

/**
 * Answers the target's hello and lets it begin with its image transfer; on the way there, if asked to, reads the chip
 * identity.
 *
 * @param      handle         of a handset in its boot loader
 * @param[out] version        version of the boot transfer that the target speaks; may be null
 * @param[out] chip_identity  null: not asked for. A target that has none leaves it untouched and itself in command
 *                            mode, from which it transfers no image: the call still returns 1
 * @return 1 when the hello was answered
 *
 * Wait: 5,000 ms for each packet and try. KRAL_AbortDownload ends it.
 */
KRAL_API uint8_t KRAL_CALL KRAL_Kivrat_Connect(KRAL_HANDLE handle, uint32_t* version, uint32_t* chip_identity);

/**
 * Serves a flash programmer to the target that KRAL_Kivrat_Connect has left waiting. The file goes out from its front
 * to its end, in the pieces that the target asks for, whatever offsets it names. Requests for 0 bytes get nothing; a
 * hundred of them in a row end the transfer. The target's status of the image goes into the text log only.
 *
 * @param handle           of a connected target
 * @param programmer_file  path of the file, in the target's own format
 * @return 1 when the target has acknowledged the end; 0 also for a file that cannot be opened, and for one that ends
 *         before the target has all it wants
 *
 * Wait: 5,000 ms for each packet, and 500 ms at the end, in which the programmer starts. Progress counts the bytes
 * of the file.
 */
KRAL_API uint8_t KRAL_CALL KRAL_Kivrat_DownloadFlashProgrammer(KRAL_HANDLE handle, const char* programmer_file);

/** Gives the port back without a transfer. @return 1, or 0 for an unknown handle */
KRAL_API uint8_t KRAL_CALL KRAL_Kivrat_End(KRAL_HANDLE handle);

/** Results of KRAL_Kivrat_FlashAll, beside those of KRAL_STREAM_WriteImageFile. */
#define KRAL_FLASH_CONNECT_FAILED 201u    /**< no target said hello, or not as it should */
#define KRAL_FLASH_PROGRAMMER_FAILED 202u /**< the flash programmer was not transferred */
#define KRAL_FLASH_HELLO_FAILED 203u      /**< the flash programmer was transferred but does not answer */

/** Of no image speaks a result that comes with this index. */
#define KRAL_FLASH_NO_IMAGE 0xFFFFFFFFu

/**
 * The whole way: boot transfer, flash programmer, its hello, every image opened, written and closed. Every file is
 * looked at before the first byte is sent. Progress counts all of them together.
 *
 * @param      handle           of a handset in its boot loader
 * @param      programmer_file  as for KRAL_Kivrat_DownloadFlashProgrammer
 * @param      image_files      [image_count] paths, binary or Intel HEX by their content
 * @param      image_types      [image_count] one for each image, for its opening packet; null: 0 for all
 * @param      image_count      at least 1
 * @param[out] result           KRAL_FLASH_..., KRAL_STREAM_... or KRAL_DOWNLOAD_ABORTED; written whenever the handle is
 *                              known, may be null
 * @param[out] failed_image     index of the image that the result speaks of, or KRAL_FLASH_NO_IMAGE; likewise
 * @return 1 when everything is in flash; the flash programmer still runs then
 *
 * Wait: what its parts wait.
 */
KRAL_API uint8_t KRAL_CALL KRAL_Kivrat_FlashAll(KRAL_HANDLE handle, const char* programmer_file,
                                                const char* const* image_files, const uint8_t* image_types,
                                                uint32_t image_count, uint32_t* result, uint32_t* failed_image);

/* --- Through the phone server ------------------------------------------------------------------------------------- */

/**
 * Tells the phone server how it is to answer hellos, in a number of its own, and keeps it.
 *
 * @return 1; 0 in direct mode, which does not use it
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetKivratHelloBehavior(KRAL_HANDLE handle, uint16_t behavior);

/** Gives the number that was set last. @param[out] behavior  0 by default @return 1; 0 in direct mode */
KRAL_API uint8_t KRAL_CALL KRAL_GetKivratHelloBehavior(KRAL_HANDLE handle, uint16_t* behavior);

#ifdef __cplusplus
}
#endif

#endif
