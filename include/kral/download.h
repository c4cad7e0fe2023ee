/**
 * @file download.h
 * Software download: the loader stage that takes a flash programmer (KOVA), writing images through a flash programmer
 * (streaming download), and Intel HEX files.
 *
 * The functions of this header are one set: their names and signatures were chosen for it as a whole.
 *
 * The way of a download: KRAL_DIAG_DLOAD_F puts the handset into its loader; KRAL_KOVA_LoadFlashProgrammer loads a
 * flash programmer and starts it; KRAL_STREAM_HELLO asks the programmer for its limits; then come security mode,
 * partition table and any number of images.
 *
 * Beside the rules of kral.h:
 *
 * - Direct mode only. With a phone server every function that needs the handset returns 0.
 * - `result` arguments report what happened in a number of this header. They are written whenever the handle is known,
 *   also when the function returns 0, and may be null.
 * - Unless a function says otherwise an exchange waits for time-out 0 (4,000 ms); flash that is erased as an image is
 *   opened may need more (KRAL_ConfigureTimeOut). A write must leave through the port within time-out 7.
 * - The bytes of the image, header and table files are read while the call runs; they must not change meanwhile.
 * - The receive thread of a COM port keeps up best when it is woken by data (KRAL_SetReceiveMode).
 */
#ifndef KRAL_DOWNLOAD_H
#define KRAL_DOWNLOAD_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** @name Progress and abort */
/**@{*/

/**
 * How far a download has come. Called on the thread that called the download function, once at its beginning and
 * whenever more bytes have been acknowledged.
 *
 * @param handle        of the handset
 * @param acknowledged  bytes that the handset has acknowledged
 * @param total         bytes in all
 * @param value         as given to KRAL_ConfigureDownloadCallBack
 */
typedef void(KRAL_CALL* KRAL_DOWNLOAD_PROGRESS_CALLBACK)(KRAL_HANDLE handle, uint32_t acknowledged, uint32_t total,
                                                         uintptr_t value);

/**
 * Sets the progress callback of a handset; null takes it away. Not to be changed while a download runs.
 *
 * @return 0 for an unknown handle only. Never waits for a running request.
 */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigureDownloadCallBack(KRAL_HANDLE handle, KRAL_DOWNLOAD_PROGRESS_CALLBACK callback,
                                                          uintptr_t value);

/**
 * Ends the running download of a handset, from any thread or from the progress callback. The download stops before
 * its next packet and reports KRAL_DOWNLOAD_ABORTED; the image in flash is then incomplete. An abort while nothing runs
 * is forgotten.
 *
 * @return 0 for an unknown handle only. Never waits for a running request.
 */
KRAL_API uint8_t KRAL_CALL KRAL_AbortDownload(KRAL_HANDLE handle);

/** The download was ended by KRAL_AbortDownload. */
#define KRAL_DOWNLOAD_ABORTED 100u

/**@}*/
/** @name KOVA: the loader stage */
/**@{*/

#define KRAL_KOVA_LOADED 0u           /**< loaded and started */
#define KRAL_KOVA_FILE_NOT_OPENED 1u  /**< the file cannot be opened */
#define KRAL_KOVA_FILE_NOT_DECODED 2u /**< no Intel HEX file, or larger than 500 KiB */
#define KRAL_KOVA_GO_FAILED 4u        /**< loaded, but the handset did not acknowledge the start */
#define KRAL_KOVA_WRITE_FAILED 5u     /**< a piece was not acknowledged, or lies outside the image */
#define KRAL_KOVA_DATA_LOST 6u        /**< data of the file have no place in its image (KRAL_HEX_FindLoss) */

/**
 * Loads a flash programmer from an Intel HEX file into the handset's memory and starts it at its start address, which
 * must be its lowest.
 *
 * @param      handle          of a handset in its loader (KRAL_DIAG_DLOAD_F)
 * @param      programmer_file path of the HEX file
 * @param      maximum_packet  half of it is written at a time if it is below 8,178, else 4,089 bytes
 * @param[out] result          KRAL_KOVA_... or KRAL_DOWNLOAD_ABORTED
 * @return 1 when the programmer was started
 *
 * Wait: time-out 0 for each piece, 1,000 ms for the start. Progress counts the bytes of the programmer.
 */
KRAL_API uint8_t KRAL_CALL KRAL_KOVA_LoadFlashProgrammer(KRAL_HANDLE handle, const char* programmer_file,
                                                         uint32_t maximum_packet, uint32_t* result);

/** Asks the loader for a sign of life. Wait: time-out 0. */
KRAL_API uint8_t KRAL_CALL KRAL_KOVA_NOP(KRAL_HANDLE handle);

/** Restarts a handset that is in its loader. Wait: time-out 0. */
KRAL_API uint8_t KRAL_CALL KRAL_KOVA_RESET(KRAL_HANDLE handle);

/** Reads the software version of the loader. Wait: time-out 0. @param[out] version  [1] a number */
KRAL_API uint8_t KRAL_CALL KRAL_KOVA_SW_VERSION(KRAL_HANDLE handle, uint8_t* version);

/**@}*/
/** @name Streaming download: images into flash */
/**@{*/

/** The exchange that KRAL_STREAM_HELLO knows; every other variant fails. */
#define KRAL_STREAM_HELLO_VARIANT 1u

/**
 * Wakes a flash programmer and asks for its limits.
 *
 * @param      handle      of a handset that runs a flash programmer
 * @param      variant     KRAL_STREAM_HELLO_VARIANT
 * @param[out] block_size  the largest block that the programmer takes, bytes
 * @param[out] window      writes that it takes ahead of its acknowledgements
 *
 * Wait: three times at most 1,000 ms, then up to 5 hellos of at most 2,000 ms, 500 ms apart
 * (KRAL_STREAM_ConfigureHello).
 */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_HELLO(KRAL_HANDLE handle, uint32_t variant, uint32_t* block_size,
                                             uint16_t* window);

/**
 * Sets how often KRAL_STREAM_HELLO sends hello and how long it pauses in between.
 *
 * @param handle    of the handset
 * @param tries     hellos in all; 0 counts as 1
 * @param delay_ms  milliseconds between two of them
 * @return 0 for an unknown handle only. Never waits for a running request.
 */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_ConfigureHello(KRAL_HANDLE handle, uint32_t tries, uint32_t delay_ms);

/** Sets the security mode of the flash programmer; the values are the handset's. Wait: time-out 0. */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_SECURITY_MODE(KRAL_HANDLE handle, uint8_t mode);

#define KRAL_STREAM_PARTITION_ACCEPTED 0u
#define KRAL_STREAM_PARTITION_USE_OVERRIDE 1u /**< differs from the table in flash, and may not replace it */
#define KRAL_STREAM_PARTITION_BAD_FORMAT 2u
#define KRAL_STREAM_PARTITION_ERASE_FAILED 3u

/**
 * Sends a partition table.
 *
 * @param      handle          of a handset that runs a flash programmer
 * @param      table_file      path of the table, at most 512 bytes
 * @param      override_table  1 to replace a different table
 * @param[out] status          [1] what the handset said, KRAL_STREAM_PARTITION_...; also written when that is a
 * refusal, and untouched when it said nothing. May be null.
 * @return 1 when the table was accepted
 *
 * Wait: time-out 0.
 */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_PARTITION_TABLE(KRAL_HANDLE handle, const char* table_file,
                                                       uint8_t override_table, uint8_t* status);

/** Formats of image files. */
#define KRAL_IMAGE_FORMAT_BY_CONTENT 0u /**< HEX when the first character is a colon, else binary */
#define KRAL_IMAGE_FORMAT_BINARY 1u
#define KRAL_IMAGE_FORMAT_HEX 2u

/** How an image is opened and closed. */
#define KRAL_STREAM_MULTI_IMAGE 0u /**< with an opening and a closing packet */
#define KRAL_STREAM_NOR 1u         /**< with neither */

#define KRAL_STREAM_WRITTEN 0u
#define KRAL_STREAM_FILE_NOT_OPENED 1u  /**< the image or header file is missing, empty or unreadable */
#define KRAL_STREAM_FILE_NOT_DECODED 2u /**< a HEX file that is broken, or spreads over more than 128 MiB */
#define KRAL_STREAM_BAD_IMAGE 3u        /**< a second region at 0x08000000, of which a download can write none */
#define KRAL_STREAM_BAD_ARGUMENT 4u     /**< no such format or method, a null pointer */
#define KRAL_STREAM_OPEN_FAILED 5u      /**< the handset refused to open the image; also a header over 512 bytes */
#define KRAL_STREAM_NO_THREAD 6u        /**< the response thread did not start */
#define KRAL_STREAM_WRITE_FAILED 7u     /**< the handset fell silent, answered something else, or the port failed */
#define KRAL_STREAM_NOT_COMPLETED 8u    /**< the last acknowledgement did not come */
#define KRAL_STREAM_THREAD_STUCK 9u     /**< the response thread did not stop */
#define KRAL_STREAM_CLOSE_FAILED 10u    /**< everything is written, but the handset did not close the image */
/* 11 is KRAL_HEX_NOT_WRITTEN. */
#define KRAL_STREAM_DATA_LOST 12u      /**< data of a HEX file have no place in its image (KRAL_HEX_FindLoss) */
#define KRAL_STREAM_FILE_TOO_LARGE 13u /**< a binary of 4 GiB and more, or of more than the process can map */
#define KRAL_STREAM_PAST_END 14u       /**< the image would go on past address 0xFFFFFFFF */
#define KRAL_STREAM_FILE_NOT_READ 15u  /**< the file could not be read to its end: it has become shorter meanwhile */

/**
 * Writes an image file into flash.
 *
 * @param      handle      of a handset whose flash programmer has been greeted
 * @param      image_file  path of the image; a binary image begins at address 0
 * @param      format      KRAL_IMAGE_FORMAT_...
 * @param      image_type  of the opening packet; the values are the handset's
 * @param      header_file path of the header that goes with the opening packet, at most 512 bytes; null for none
 * @param      method      KRAL_STREAM_MULTI_IMAGE or KRAL_STREAM_NOR
 * @param      block_size  as KRAL_STREAM_HELLO reported; at most 16,376 bytes are written at a time, and fewer where
 * bytes have to be escaped. The frame check of blocks of 8,187 bytes and more covers a part of them only; a programmer
 * that checks them whole never answers those and needs 8,186 here.
 * @param      window      as KRAL_STREAM_HELLO reported; one write fewer is outstanding. 0 counts as 65,536.
 * @param[out] result      KRAL_STREAM_... or KRAL_DOWNLOAD_ABORTED
 * @return 1 when every byte was acknowledged and the image closed
 *
 * Wait: time-out 0 for the opening, for each acknowledgement, and for the closing; ten time-outs in a row without any
 * acknowledgement end it.
 */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_WriteImageFile(KRAL_HANDLE handle, const char* image_file, uint32_t format,
                                                      uint8_t image_type, const char* header_file, uint8_t method,
                                                      uint32_t block_size, uint16_t window, uint32_t* result);

/**
 * Writes bytes of the caller into flash; otherwise as KRAL_STREAM_WriteImageFile.
 *
 * @param handle       as above, like everything not named here
 * @param data         [size] the bytes; may be null when there are none. An image of nothing is opened and closed.
 * @param size         how many
 * @param address      of the first byte
 * @param header       [header_size] for the opening packet; null for none
 * @param header_size  its bytes, at most 512
 */
KRAL_API uint8_t KRAL_CALL KRAL_STREAM_WriteImageMem(KRAL_HANDLE handle, const uint8_t* data, uint32_t size,
                                                     uint32_t address, uint8_t image_type, const uint8_t* header,
                                                     uint32_t header_size, uint8_t method, uint32_t block_size,
                                                     uint16_t window, uint32_t* result);

/**@}*/
/** @name Image files; no handset is needed, and nothing is logged */
/**@{*/

#define KRAL_IMAGE_REGIONS 2 /**< that a KRAL_IMAGE_INFO has */

/** What is in an image file. */
typedef struct KRAL_IMAGE_INFO {
  uint32_t format;                   /**< KRAL_IMAGE_FORMAT_BINARY or KRAL_IMAGE_FORMAT_HEX */
  uint32_t base[KRAL_IMAGE_REGIONS]; /**< lowest address of each region */
  uint32_t size[KRAL_IMAGE_REGIONS]; /**< bytes, gaps included; 0 for a region that is not there */
  uint32_t start_address;            /**< 0xFFFFFFFF for a HEX file without one, 0 for a binary */
  uint32_t payload;                  /**< bytes that are not those of erased flash, 0xFF */
} KRAL_IMAGE_INFO;

/**
 * Reads an image file from end to end and reports what is in it.
 *
 * @param      image_file path of the file
 * @param      format     KRAL_IMAGE_FORMAT_...
 * @param[out] info       what is in it
 * @param[out] result     KRAL_STREAM_FILE_..., ..._DATA_LOST, ..._PAST_END, ..._BAD_ARGUMENT or 0; may be null
 */
KRAL_API uint8_t KRAL_CALL KRAL_IMAGE_GetInfo(const char* image_file, uint32_t format, KRAL_IMAGE_INFO* info,
                                              uint32_t* result);

/**
 * Reports which data of an Intel HEX file have no place in its image. Such a file can be decoded, but not to what it
 * holds; every other function refuses it. Data are lost before the first extended address record (type 02 or 04), where
 * the first record lies above the image's base and none after it reaches as far, and to other data for their address.
 *
 * @param      hex_file path of the file
 * @param[out] line     first line that loses data, its own or those it replaces, from 1; 0 when nothing is lost
 * @param[out] bytes    bytes that are lost in all; may be null
 * @param[out] result   KRAL_STREAM_FILE_NOT_OPENED, ..._NOT_DECODED, ..._BAD_ARGUMENT or 0; may be null
 * @return 1 when the file can be decoded, whether it loses data or not
 */
KRAL_API uint8_t KRAL_CALL KRAL_HEX_FindLoss(const char* hex_file, uint32_t* line, uint64_t* bytes, uint32_t* result);

#define KRAL_HEX_TO_BINARY 0u
#define KRAL_HEX_FROM_BINARY 1u

/**
 * Converts an Intel HEX file to a binary file, or back. The output replaces what was there in one step, but no input.
 *
 * A binary holds the first region from its base to its last byte, gaps as 0xFF; a file with a second region is refused.
 * A HEX file is written with extended linear addresses and without a start address.
 *
 * @param         input        path of the file to read
 * @param         output       path of the file to write
 * @param         direction    KRAL_HEX_TO_BINARY or KRAL_HEX_FROM_BINARY
 * @param[in,out] base_address of the first byte: read from the HEX file, or passed for it, then a multiple of 65,536.
 * May be null, for 0.
 * @param[out]    result       KRAL_STREAM_FILE_..., ..._DATA_LOST, ..._PAST_END, ..._BAD_IMAGE, ..._BAD_ARGUMENT,
 *                             KRAL_HEX_NOT_WRITTEN or 0; may be null
 */
KRAL_API uint8_t KRAL_CALL KRAL_HEX_Convert(const char* input, const char* output, uint32_t direction,
                                            uint32_t* base_address, uint32_t* result);

#define KRAL_HEX_NOT_WRITTEN 11u /**< a result of KRAL_HEX_Convert: the output cannot be written */

/**@}*/

#ifdef __cplusplus
}
#endif

#endif
