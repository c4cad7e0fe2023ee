/**
 * @file nv.h
 * NV items: the handset's numbered settings and calibration values, one by one and in batches. Whole sets of items with
 * their definitions are in nv_tool.h.
 *
 * Beside the rules of kral.h:
 *
 * - An item has a 16-bit id and a data field of 128 bytes. The meaning of its bytes is the handset's.
 * - The NV status is the handset's result of a request: 0 done, 7 the item is read-only, others as the handset defines
 *   them. The functions with a `status` return 1 when the handset answered, whatever the status: look at it. It may be
 *   null when it is not wanted.
 * - Every request may wait for time-out 0 (4,000 ms).
 */
#ifndef KRAL_NV_H
#define KRAL_NV_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Bytes of an item's data field. */
#define KRAL_NV_DATA_SIZE 128u

/** Status of an item that was read or written. */
#define KRAL_NV_STATUS_DONE 0u
/** Status of an item that was never written: it has no value. */
#define KRAL_NV_STATUS_NEVER_WRITTEN 5u
/** Status of an item that the handset does not know, and of an element that an array does not have. */
#define KRAL_NV_STATUS_UNKNOWN_ITEM 6u
/** Status of a write to an item that cannot be written. */
#define KRAL_NV_STATUS_READ_ONLY 7u

/* --- One item ----------------------------------------------------------------------------------------------------- */

/**
 * Reads an item.
 *
 * @param         handle  from a connect function
 * @param         item    the item's id
 * @param[in,out] data    [length] sent with the request unchanged; receives the item. Untouched unless the status is 0
 * @param         length  bytes of `data`, normally KRAL_NV_DATA_SIZE
 * @param[in,out] status  sent unchanged; the handset's answer
 * @return 1 when an answer came that is at least as long as the request
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_READ_F(KRAL_HANDLE handle, uint16_t item, uint8_t* data, uint16_t length,
                                               uint16_t* status);

/**
 * Writes an item, or in batch mode appends it to the queue with status 0.
 *
 * @param      data    [length] what the data field begins with; the rest of it becomes 0
 * @param      length  bytes of `data`; what is beyond 128 is not written
 * @param[out] status  the handset's answer
 * @return 1 when an answer with a status came
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_F(KRAL_HANDLE handle, uint16_t item, const uint8_t* data, uint16_t length,
                                                uint16_t* status);

/** Reads an item of one subscription, `context`; else as KRAL_DIAG_NV_READ_F. */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_READ_EXT_F(KRAL_HANDLE handle, uint16_t item, uint8_t* data, uint16_t context,
                                                   uint16_t length, uint16_t* status);

/**
 * Writes an item of one subscription, `context`; else as KRAL_DIAG_NV_WRITE_F, but that the status goes out with the
 * request unchanged, and that it is never queued.
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_EXT_F(KRAL_HANDLE handle, uint16_t item, const uint8_t* data,
                                                    uint16_t context, uint16_t length, uint16_t* status);

/**
 * Reads one element of an array item.
 *
 * @param      index   of the element, from 0
 * @param[out] data    [length] the element; the answer must hold so many bytes
 * @param[out] status  the handset's answer, also written with a refusal
 * @return 1 when the status is 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_READ_ARRAY_F(KRAL_HANDLE handle, uint16_t item, uint8_t index, uint8_t* data,
                                                     uint16_t length, uint16_t* status);

/**
 * Writes one element of an array item: a plain write of the index byte and the data, of which 127 bytes at most are
 * written. In batch mode it is queued like any other. Otherwise as KRAL_DIAG_NV_WRITE_F.
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_ARRAY_F(KRAL_HANDLE handle, uint16_t item, uint8_t index,
                                                      const uint8_t* data, uint16_t length, uint16_t* status);

/* --- Many items --------------------------------------------------------------------------------------------------- */

/**
 * Starts or leaves batch mode, in which writes are collected instead of sent. The queue is emptied either way.
 *
 * @param start  not 0: start; 0: leave
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_SetBatchMode(KRAL_HANDLE handle, uint8_t start);

/**
 * Replaces the list of items whose refusal as read-only (status 7) is no error in a flush.
 *
 * @param items  [count] ids; may be null when `count` is 0, which empties the list
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(KRAL_HANDLE handle, const uint16_t* items,
                                                                    uint16_t count);

/**
 * Writes the queued items, some nine full ones in a packet, and leaves batch mode, whatever happens. The first item
 * that fails ends the flush after its packet; items that are still queued are dropped.
 *
 * The outputs are written in every case, but for an unknown handle; each may be null.
 *
 * @param[out] last_error_item    id of the last item whose result was read: the failing one, if any; 65535 when none
 * was
 * @param[out] last_total_status  of the last packet, as the handset reported
 * @param[out] last_item_status   [1] of that item; 0 when it is read-only and in the list
 * @return 1 when every packet was answered, with a result for each of its items, and no item failed
 *
 * Wait: time-out 0 for each packet.
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_NV_WRITE_FlushBatchQueue(KRAL_HANDLE handle, uint16_t* last_error_item,
                                                              uint16_t* last_total_status, uint8_t* last_item_status);

#ifdef __cplusplus
}
#endif

#endif
