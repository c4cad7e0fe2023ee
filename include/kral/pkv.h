/**
 * @file pkv.h
 * PKV backup files: the handset's NV items and item files in one file of the PC, and their way back.
 *
 * Beside the rules of kral.h:
 *
 * - A backup reads the NV items of a range of ids (KRAL_PKV_ConfigureBackup; 0 to 9,999 of one subscription by
 *   default), those that are defined for the handset's NV tool, array items of these element by element, and every file
 *   in the handset's item folders, /nv/items, nv/item_files/conf, nv/reg_files/conf, /nv/item_files/rfnv and
 *   nv/item_store/rfnv, with what is below them. Items that the handset answers with a status other than 0 have no
 *   value and are left out. RF NV items are files, too.
 * - Every request is tried up to 3 times, each of them for time-out 0 (4,000 ms). A handset that cannot be reached any
 *   more ends the work: a backup then leaves the file as it was.
 * - @param[out] status  how the work ended: the code of the NV tool (KRAL_NV_GetErrorText), or one of those below.
 *   Written in every case but for an unknown handle, and may be null.
 * - The work takes as long as its requests: plan for one round trip per item of a backup or comparison, and for 1.2 of
 *   a restore. The callback receives the progress and can end it; other requests on the handle wait for its end.
 * - A backup lists the item folders first. Until that is done the total is not known and the callback is not called;
 *   the directory callback (KRAL_ConfigureEfs2CallBacks) is, with every entry. KRAL_AbortEFS_Operation ends the work
 *   also then, and in the midst of an item or a file. The answer that it did not wait for may come late, in front of
 *   that to the next request, which then fails unless the handle resynchronises (KRAL_SetResynchronise).
 */
#ifndef KRAL_PKV_H
#define KRAL_PKV_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Ends of the work. */
#define KRAL_PKV_STATUS_DONE 0u
#define KRAL_PKV_STATUS_CANNOT_OPEN 7u /**< the file cannot be read, or cannot be written */
#define KRAL_PKV_STATUS_INCOMPLETE 12u /**< backup: the file is written, but the handset refused something */
#define KRAL_PKV_STATUS_LOST 16u       /**< the handset does not answer */
#define KRAL_PKV_STATUS_NO_STORAGE 18u /**< the file is no PKV file */
#define KRAL_PKV_STATUS_BAD_ITEM 20u   /**< something in the file is damaged, or it holds nothing */
/** The handset gave no item and no file; or files only, where the station's writer needs an item (docs/pkv.md). */
#define KRAL_PKV_STATUS_NOTHING_READ 22u
#define KRAL_PKV_STATUS_NOT_WRITTEN 23u        /**< the handset refused something, or reads back otherwise */
#define KRAL_PKV_STATUS_DIFFERENT 256u         /**< file and handset differ */
#define KRAL_PKV_STATUS_STOPPED 257u           /**< the callback or KRAL_AbortEFS_Operation wanted it so */
#define KRAL_PKV_STATUS_UNEXPECTED 0xFFFFFFFFu /**< the library itself failed: out of memory, for instance */

/** What became of an item or a file. */
#define KRAL_PKV_DONE 0u          /**< backup: read; restore: written and read back; comparison: equal */
#define KRAL_PKV_SKIPPED 1u       /**< backup: has no value; restore: read-only, see KRAL_RestoreNVFromPKV */
#define KRAL_PKV_REFUSED 2u       /**< by the handset, with the status */
#define KRAL_PKV_DIFFERENT 3u     /**< the handset holds another value; with a status other than 0: none */
#define KRAL_PKV_NOT_READ_BACK 4u /**< written, but could not be read back */
#define KRAL_PKV_NOT_REACHED 5u   /**< the work ended before; the one that was under way may have been written */

/** An NV item or a file, and what became of it. */
typedef struct KRAL_PKV_ITEM {
  uint16_t id;           /**< of an NV item; 0 for a file */
  uint16_t index;        /**< of the element, where the item is an array */
  uint16_t subscription; /**< that it belongs to */
  uint16_t reserved;     /**< 0 */
  uint32_t status;       /**< NV status, or the error number of a file; 0xFFFF where the handset refused without one */
  uint32_t result;       /**< KRAL_PKV_DONE, ... */
} KRAL_PKV_ITEM;

/** How many of each result there were. */
typedef struct KRAL_PKV_COUNTS {
  uint32_t total;         /**< items, files and what the PKV file holds beside (skipped); the others add up to it */
  uint32_t done;          /**< KRAL_PKV_DONE */
  uint32_t skipped;       /**< KRAL_PKV_SKIPPED */
  uint32_t refused;       /**< KRAL_PKV_REFUSED */
  uint32_t different;     /**< KRAL_PKV_DIFFERENT */
  uint32_t not_read_back; /**< KRAL_PKV_NOT_READ_BACK */
  uint32_t not_reached;   /**< KRAL_PKV_NOT_REACHED */
} KRAL_PKV_COUNTS;

/**
 * Called once for every item and file, with its final result, on the thread that called the function, until it stops
 * the work: what a restore had written together with the last one is then in the counts only. So are, as skipped, parts
 * of a PKV file that can be no item and no file (the text log names them). It must not call functions of the handle;
 * another backup, restore or comparison would end with KRAL_PKV_STATUS_UNEXPECTED.
 *
 * @param item    lives for the call only
 * @param path    of a file; null for an NV item
 * @param done    items and files so far, this one included
 * @param total   in all
 * @param handle  the handset's
 * @return 1 to go on, 0 to stop
 */
typedef uint8_t(KRAL_CALL* KRAL_PKV_CALLBACK)(const KRAL_PKV_ITEM* item, const char* path, uint32_t done,
                                              uint32_t total, KRAL_HANDLE handle);

/** Sets the callback; null for none. An addition to the interface, like the next two. */
KRAL_API uint8_t KRAL_CALL KRAL_PKV_ConfigureCallBack(KRAL_HANDLE handle, KRAL_PKV_CALLBACK callback);

/**
 * Sets what backups read.
 *
 * @param first_item     lowest item id
 * @param last_item      highest item id, not below the lowest
 * @param subscriptions  1 to 16: the items of subscription 0, of 0 and 1, ...
 */
KRAL_API uint8_t KRAL_CALL KRAL_PKV_ConfigureBackup(KRAL_HANDLE handle, uint16_t first_item, uint16_t last_item,
                                                    uint16_t subscriptions);

/** Gives the counts of the last backup, restore or comparison, also of one that failed. @param[out] counts  of each */
KRAL_API uint8_t KRAL_CALL KRAL_PKV_GetCounts(KRAL_HANDLE handle, KRAL_PKV_COUNTS* counts);

/**
 * Reads the handset's items and files and writes them to a PKV file, which is replaced in one step at the end.
 *
 * Items that were never written (status 5), and those that the handset does not know (6), have no value. All others
 * that it does not return are refused: items with another status, files that it lists but does not return whole, and
 * folders, by their paths, whose files it does not list. What was read is written even so, and the status is
 * KRAL_PKV_STATUS_INCOMPLETE.
 *
 * @return 1 when the status is 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_BackupNVFromMobileToPKV(KRAL_HANDLE handle, const char* file, uint32_t* status);

/**
 * Writes the items and files of a PKV file to the handset, in batches, and reads back what it wrote. An item that is
 * refused does not keep the others from being written. Folders of files are made where they are missing. An addition to
 * the interface.
 *
 * An item that the handset refuses as read-only (status 7) is skipped when it holds the value already, or is in the
 * list of KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List. Elements of array items can be written for subscription 0 only, and
 * are skipped for others. An item that is defined as an array now, in a file that notes its arrays and not this one,
 * is refused (0xFFFF): it was read without knowing which element it is; so is an element with an index above 255. Items
 * queued in batch mode stay queued.
 *
 * Files get their permissions, and are read back with kind and permissions. One that cannot be written, but is there
 * with the same content, kind and permissions, is skipped.
 *
 * @return 1 when everything was written, or skipped
 */
KRAL_API uint8_t KRAL_CALL KRAL_RestoreNVFromPKV(KRAL_HANDLE handle, const char* file, uint32_t* status);

/**
 * Compares the items and files of a PKV file with those of the handset, which is not changed; files with their kind and
 * permissions. Elements of array items of another subscription than 0 cannot be asked for and are skipped, those with
 * an index above 255 are refused. An addition to the interface.
 *
 * @return 1 when the handset holds everything, but for what was skipped, as it is in the file
 */
KRAL_API uint8_t KRAL_CALL KRAL_PKV_Verify(KRAL_HANDLE handle, const char* file, uint32_t* status);

/**
 * Restores a PKV file to the handset (upload) and backs the handset up to one (download), through the download agent of
 * the phone server. 0 in direct mode, where there is no server.
 *
 * @param options  flags of the download agent, passed on as they are
 */
KRAL_API uint8_t KRAL_CALL KRAL_UploadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options);
KRAL_API uint8_t KRAL_CALL KRAL_DownloadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options);

#ifdef __cplusplus
}
#endif

#endif
