/**
 * @file efs.h
 * Files on the handset: transfers, item files, directories, links, file and file-system status (EFS2).
 *
 * Beside the rules of kral.h:
 *
 * - Paths of the handset are terminated texts with '/' between names. A request of more than 256 bytes is refused
 *   without sending, which leaves 243 characters for the path of a transfer and 249 or more for other paths (two paths
 *   share them). The path of an item request has up to 1,024 characters.
 * - @param[out] error_number  what the handset answers (KRAL_EFS_ERROR_...): 0 done, 2 no such file, 6 exists, 28 no
 *   room, and others. A function with an `error_number` returns 1 when the handset answered and leaves the judgement to
 *   its caller; the other outputs are written only when the number is 0. Any output may be null.
 * - Every packet of a transfer and of a listing is tried up to 5 times, the questions for room and status in front of
 *   it included. A try may wait for time-out 0 (4,000 ms) or, when a file is written or a directory listed, for
 *   2,000 ms; one that gets no answer closes the port, and the next one opens it again.
 * - A late answer to an earlier request is skipped, and the right one awaited for the rest of the time-out.
 * - A transfer that fails or is aborted leaves no partial file on either side, unless the handset cannot be reached any
 *   more or refuses the removal: then the text log has a line about it. What is read goes into a temporary file beside
 *   its target, which is replaced at the end.
 * - Where the path of a transfer to the handset is a symbolic link, it is the link that is removed, in place of an item
 *   file as well as after a failure: what it leads to keeps what was written.
 * - A handset whose answer to an opening request does not come keeps that descriptor open. It is closed as soon as the
 *   answer turns up, in front of whatever other answer; should it be lost, the number stays unknown, and the
 *   descriptor stays open until the handset restarts. The text log has a line about it.
 */
#ifndef KRAL_EFS_H
#define KRAL_EFS_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Operation codes of the transfer callback. */
#define KRAL_EFS_OPERATION_READ 4u
#define KRAL_EFS_OPERATION_WRITE 5u
#define KRAL_EFS_OPERATION_GET_ITEM 39u

/** Packet sizes of transfers by default, and their limits (KRAL_SetEfsReadAndWritePacketSize). */
#define KRAL_EFS_DEFAULT_READ_SIZE 536u
#define KRAL_EFS_DEFAULT_WRITE_SIZE 524u
#define KRAL_EFS_LARGEST_READ_SIZE 4091u
#define KRAL_EFS_LARGEST_WRITE_SIZE 6143u

/** Bytes that an item file holds at most. */
#define KRAL_EFS_ITEM_SIZE 1024u

/** Filters of KRAL_EfsDirectory, which go by the handset's own types. */
#define KRAL_EFS_FILTER_FILES 0u
#define KRAL_EFS_FILTER_DIRECTORIES 1u
#define KRAL_EFS_FILTER_LINKS 2u
#define KRAL_EFS_FILTER_ALL 255u

/** Types in a KRAL_EFS_ENTRY; not the handset's numbers, in which 0 is a file and 1 a directory. */
#define KRAL_EFS_ENTRY_DIRECTORY 0u
#define KRAL_EFS_ENTRY_FILE 1u
#define KRAL_EFS_ENTRY_LINK 2u

/** Error numbers of the handset's file system; there are others. */
#define KRAL_EFS_ERROR_NONE 0u
#define KRAL_EFS_ERROR_NO_SUCH_FILE 2u
#define KRAL_EFS_ERROR_EXISTS 6u
#define KRAL_EFS_ERROR_NO_ROOM 28u

/** Data types of KRAL_EFS2_DIAG_EXTENDED_INFO. */
#define KRAL_EFS_DATA_NUMBER 0u
#define KRAL_EFS_DATA_TEXT 1u

/** Mode bits that hold the kind of a file, and the kind that marks an item file. */
#define KRAL_EFS_MODE_KIND 0xF000u
#define KRAL_EFS_MODE_ITEM_FILE 0xE000u

#define KRAL_EFS_NAME_SIZE 512 /**< bytes of a path, its end included */

/** One entry of a directory. Times are the handset's, in seconds. */
typedef struct KRAL_EFS_ENTRY {
  uint32_t type;                 /**< KRAL_EFS_ENTRY_..., and 0 for types that only the handset knows */
  uint32_t mode;                 /**< kind and permissions */
  uint32_t size;                 /**< bytes */
  uint32_t access_time;          /**< of its latest reading */
  uint32_t modify_time;          /**< of its latest writing */
  uint32_t change_time;          /**< of the latest change of its status */
  char name[KRAL_EFS_NAME_SIZE]; /**< the full path */
} KRAL_EFS_ENTRY;

/** What a file system reports about itself; sizes in blocks unless said otherwise. */
typedef struct KRAL_EFS_STATFS {
  uint32_t file_system_id;   /**< the handset's number of it */
  uint32_t type;             /**< the handset's number of its kind */
  uint32_t block_size;       /**< bytes */
  uint32_t total_blocks;     /**< in use or not */
  uint32_t available_blocks; /**< of those free, what files may take */
  uint32_t free_blocks;      /**< not in use */
  uint32_t max_file_size;    /**< bytes */
  uint32_t file_count;       /**< files that are there */
  uint32_t max_file_count;   /**< files that there may be */
} KRAL_EFS_STATFS;

/** The memory under the file system. */
typedef struct KRAL_EFS_DEVICE_INFO {
  uint32_t total_blocks;    /**< that can be erased */
  uint32_t pages_per_block; /**< that can be written */
  uint32_t page_size;       /**< bytes of data */
  uint32_t total_page_size; /**< bytes, spare area included */
  uint32_t maker_id;        /**< as the memory itself tells */
  uint32_t device_id;       /**< the same */
  uint32_t device_type;     /**< the handset's number of its kind */
  char name[64];            /**< terminated; a longer one is cut */
} KRAL_EFS_DEVICE_INFO;

/**
 * Called after every chunk of a transfer, on the thread that called the transfer function. It must not send requests;
 * KRAL_AbortEFS_Operation is allowed.
 *
 * @param source       path (const char *) or, of a memory transfer, the buffer's address
 * @param destination  likewise
 * @param operation    KRAL_EFS_OPERATION_...
 * @param reserved     0
 * @param done         bytes so far
 * @param total        bytes in all, as the handset or the local file reported before the transfer
 * @param context      the handle
 */
typedef void(KRAL_CALL* KRAL_EFS_TRANSFER_CALLBACK)(uintptr_t source, uintptr_t destination, uint32_t operation,
                                                    uint32_t reserved, uint32_t done, uint32_t total,
                                                    KRAL_HANDLE context);

/** Called for every selected entry of a directory, like the transfer callback. The entry lives for the call only. */
typedef void(KRAL_CALL* KRAL_EFS_DIRECTORY_CALLBACK)(const KRAL_EFS_ENTRY* entry, KRAL_HANDLE context);

/* --- Settings of the handle, kept across reconnects; none of these waits for a running request -------------------- */

/**
 * Sets the packet sizes of file transfers. Nothing is tested here: a size that leaves no room for data, or a packet
 * that is larger than the library can send, fails the transfer.
 *
 * @param read_size   bytes of one answer, of which 20 are not data; 536 by default, at most 4,091; a larger one
 *                    works only for files that do not fill such an answer
 * @param write_size  bytes of one request, of which 12 are not data; 524 by default, at most 6,143
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetEfsReadAndWritePacketSize(KRAL_HANDLE handle, uint16_t read_size,
                                                             uint16_t write_size);

/**
 * Lets transfers find out how large the packets are that the handset takes; off by default.
 *
 * The protocol has no question for it. So a transfer of 4 KiB or more tries packets of 6,143 bytes (writing) or 4,091
 * (reading) first, then such of 2 KiB data, then those of KRAL_SetEfsReadAndWritePacketSize, which it never goes below.
 * What the handset took stays in use until the caller connects again. A size that has not passed yet gets one try of at
 * most 500 ms, later ones two: a handset that takes no notice of long packets costs a second, once. The data are right
 * in either case.
 *
 * @param on  1: find out; 0: use the sizes that are set
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetEfsAutomaticPacketSize(KRAL_HANDLE handle, uint8_t on);

/** Sets both callbacks; null for none. They are called with the handle as their context. */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigureEfs2CallBacks(KRAL_HANDLE handle, KRAL_EFS_TRANSFER_CALLBACK transfer,
                                                       KRAL_EFS_DIRECTORY_CALLBACK directory);

/**
 * Ends the transfer, listing or KRAL_EFS2_SyncWithWait that runs on another thread, before its next packet; it then
 * returns 0. The answer to the current packet is awaited only briefly: with a silent handset the function is back
 * within 250 ms, and a part of a file may stay there. Each of them forgets earlier calls when it starts. A backup,
 * restore or comparison (pkv.h) is stopped as its callback would stop it, at whichever request it is.
 */
KRAL_API uint8_t KRAL_CALL KRAL_AbortEFS_Operation(KRAL_HANDLE handle);

/* --- Transfers ---------------------------------------------------------------------------------------------------- */

/**
 * Copies a file of the PC to the handset, replacing what is there; an item file of that name is removed first.
 *
 * What the handset has under that name goes only when the path, the packet size and the room allow the transfer.
 *
 * @return 1 when all bytes were written and the file was closed
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsWrite(KRAL_HANDLE handle, const char* local_file, const char* efs_file);

/** The same from memory. @param buffer  [size] the bytes; may be null when there are none */
KRAL_API uint8_t KRAL_CALL KRAL_EfsWriteMem(KRAL_HANDLE handle, const uint8_t* buffer, uint32_t size,
                                            const char* efs_file);

/**
 * Copies a file of the handset to the PC, replacing what is there. Item files are fetched with one request. A file
 * that grows meanwhile is read to its end; more than 1 MiB beyond the size that the handset reported is a failure.
 *
 * @return 1 when every byte that the handset reported was read and is in the local file
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsRead(KRAL_HANDLE handle, const char* local_file, const char* efs_file);

/**
 * Copies a file of the handset into memory.
 *
 * @param[out]    buffer  [size] the file; on failure it may hold a part of the file
 * @param[in,out] size    in: bytes of `buffer`; out: bytes read, on success only. A larger file is a failure
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsReadMem(KRAL_HANDLE handle, const char* efs_file, uint8_t* buffer, uint32_t* size);

/* --- Item files: one request each --------------------------------------------------------------------------------- */

/**
 * Writes an item file from a file of the PC of at most 1,024 bytes. A larger one is not sent.
 *
 * @return 1 when the handset answered with error number 0
 *
 * Wait: time-out 0.
 */
KRAL_API uint8_t KRAL_CALL KRAL_Efs2PutItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file);

/** The same from memory. @param buffer  [size] the bytes */
KRAL_API uint8_t KRAL_CALL KRAL_EfsPutItemFromMem(KRAL_HANDLE handle, const char* efs_file, const uint8_t* buffer,
                                                  uint32_t size);

/**
 * Reads an item file into a file of the PC.
 *
 * @param length  bytes asked for, at most 1,024; a shorter item is given as it is
 * @return 1 when the handset answered with error number 0 and the local file is written
 *
 * Wait: time-out 0.
 */
KRAL_API uint8_t KRAL_CALL KRAL_Efs2GetItem(KRAL_HANDLE handle, const char* local_file, const char* efs_file,
                                            uint32_t length);

/* --- Directories -------------------------------------------------------------------------------------------------- */

/**
 * Lists a directory, in the handset's order. Every selected entry goes to the directory callback and into `entries`.
 *
 * @param         folder   null and "" list "/"
 * @param         filter   KRAL_EFS_FILTER_...; any other value selects nothing
 * @param[out]    entries  [count] the records, or null. On failure it may hold those that had come
 * @param[in,out] count    in: room in `entries`; out: entries selected, of which the first so many are in
 *                         `entries`. May be null when `entries` is
 *
 * One request for each entry, three for the directory.
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsDirectory(KRAL_HANDLE handle, const char* folder, uint8_t filter,
                                             KRAL_EFS_ENTRY* entries, uint32_t* count);

/**
 * Makes a directory with mode 0777.
 *
 * @param[out] error_number  written whenever the handset answered, also when the function returns 0
 * @return 1 when it is there: error numbers 0 and 6 (something of that name was there already)
 *
 * Wait: 2,000 ms.
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsMkDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number);

/** Removes an empty directory. Wait, as for everything below: time-out 0. */
KRAL_API uint8_t KRAL_CALL KRAL_EfsRmDir(KRAL_HANDLE handle, const char* folder, uint32_t* error_number);

/* --- Names -------------------------------------------------------------------------------------------------------- */

/** Removes a file, an item file or a link. */
KRAL_API uint8_t KRAL_CALL KRAL_EfsDelete(KRAL_HANDLE handle, const char* efs_file, uint32_t* error_number);

/** Makes a symbolic link at `link` that leads to `target`, which need not exist. */
KRAL_API uint8_t KRAL_CALL KRAL_EfsCreateLink(KRAL_HANDLE handle, const char* target, const char* link,
                                              uint32_t* error_number);

/**
 * Reads where a symbolic link leads.
 *
 * @param[out] target  [size] terminated
 * @param      size    bytes of `target`; 0 is returned when the text and its zero do not fit
 */
KRAL_API uint8_t KRAL_CALL KRAL_EfsReadLink(KRAL_HANDLE handle, const char* link, uint32_t* error_number, char* target,
                                            uint32_t size);

/** Renames or moves a file, an item file, a link or a directory. */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_RENAME(KRAL_HANDLE handle, const char* old_path, const char* new_path,
                                                 uint32_t* error_number);

/* --- Status ------------------------------------------------------------------------------------------------------- */

/** Status, links followed. @param[out] mode, size, link_count, access_time, modify_time, change_time  in seconds */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_STAT(KRAL_HANDLE handle, const char* path, uint32_t* error_number,
                                               uint32_t* mode, uint32_t* size, uint32_t* link_count,
                                               uint32_t* access_time, uint32_t* modify_time, uint32_t* change_time);

/** Sets the permission bits of what a path names. */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_CHMOD(KRAL_HANDLE handle, const char* path, uint16_t mode,
                                                uint32_t* error_number);

/** Asks whether all of the permission bits are granted: error number 0. */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_ACCESS(KRAL_HANDLE handle, const char* path, uint16_t permission_bits,
                                                 uint32_t* error_number);

/** Reads the status of the file system that holds a path. @param[out] status  sizes in blocks */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_STATFS(KRAL_HANDLE handle, const char* path, uint32_t* error_number,
                                                 KRAL_EFS_STATFS* status);

/**
 * Reads how much of the file system that holds a path is in use.
 *
 * @param[out] used  bytes
 * @return 1 when the handset answered with error number 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_GetGroupInfo(KRAL_HANDLE handle, const char* path, uint64_t* used);

/** Reads the geometry and the make of the memory under the file system. @param[out] info  what it is */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_DEV_INFO(KRAL_HANDLE handle, uint32_t* error_number,
                                                   KRAL_EFS_DEVICE_INFO* info);

/**
 * Asks for one of the things that the handset can report besides.
 *
 * @param      query      the handset's number for it
 * @param[out] data_type, number  KRAL_EFS_DATA_...: where the answer is; the number. Any other type returns 0
 * @param[out] text       [text_size] the answer, terminated
 * @param      text_size  bytes of `text`; 0 is returned when the answer and its zero do not fit
 */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_EXTENDED_INFO(KRAL_HANDLE handle, uint32_t query, uint32_t* error_number,
                                                        uint32_t* data_type, uint32_t* number, char* text,
                                                        uint32_t text_size);

/**
 * Has the handset write what it still keeps in memory, and waits for that.
 *
 * @param time_out  ms until it is given up; the handset is asked every 100 ms. A question without an answer is
 *                  followed by the next
 * @return 1 when everything under the path is in the flash; 0 also when the handset does not know the request
 *
 * Wait: the time-out and, for each question to the handset, time-out 0.
 */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_SyncWithWait(KRAL_HANDLE handle, const char* path, uint32_t time_out);

/** Keeps the present state of the file system that holds a path as the one that the handset can be restored to. */
KRAL_API uint8_t KRAL_CALL KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY(KRAL_HANDLE handle, const char* path,
                                                           uint32_t* error_number);

/* --- Done by the phone server: server mode only, 0 in direct mode ------------------------------------------------- */

/** Removes a directory with everything in it. */
KRAL_API uint8_t KRAL_CALL KRAL_EfsRmTree(KRAL_HANDLE handle, const char* folder);

/**
 * The file-system images. Each has the phone server make or use an image, a file of the PC; the kind of job is what
 * the name says, and what it does belongs to the server.
 */
KRAL_API uint8_t KRAL_CALL KRAL_BackupCEFS_Legacy(KRAL_HANDLE handle, const char* image_file);
KRAL_API uint8_t KRAL_CALL KRAL_BackupCEFS_Alternate(KRAL_HANDLE handle, const char* image_file);
KRAL_API uint8_t KRAL_CALL KRAL_UploadCEFS_File(KRAL_HANDLE handle, const char* image_file);
KRAL_API uint8_t KRAL_CALL KRAL_UploadCEFS_File2(KRAL_HANDLE handle, const char* image_file);
KRAL_API uint8_t KRAL_CALL KRAL_UploadCEFS_ImageAlternate(KRAL_HANDLE handle, const char* image_file);
KRAL_API uint8_t KRAL_CALL KRAL_DownloadCEFS_File(KRAL_HANDLE handle, const char* image_file);

#ifdef __cplusplus
}
#endif

#endif
