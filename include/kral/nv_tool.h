/**
 * @file nv_tool.h
 * The NV tool: whole sets of NV items, known by their definitions, moved between the handset, PKV backup files and XML
 * source files. Single requests without definitions are in nv.h; the XML files are described in docs/nv.md.
 *
 * Beside the rules of kral.h:
 *
 * - Every function returns an error code, 0 for success (KRAL_NV_GetErrorText has the texts). With an unknown handle
 *   it is 16; 0xFFFFFFFF is a failure of the machine, such as a lack of memory.
 * - Definitions, values, filters, the current @param[out] subscription  belong to the handle, until its release.
 * - An item is a numbered NV item or a file of the handset, known by its full path; a missing first slash and doubled
 *   ones make no difference. Items that are kept as "/nv/item_files/rfnv/" and eight decimal digits are RF NV items:
 *   they are files and have an NV id too.
 * - An index counts all definitions from 0, in the order in which they were loaded: first the numbered items
 *   (KRAL_NV_GetNumOfNVDefinition of them), then the files (KRAL_NV_GetNumOfNVEfsDefinition).
 * - An item has one value for each subscription and, when it is an array, for each array index (0 for all others).
 *   Functions act on the current subscription; files have one value for all. Value strings are decimal numbers,
 *   member by member, separated by commas. They are checked against the ranges of the members when they are set.
 * - No request to the handset names both an array index and a subscription: the handset holds arrays of subscription 0
 *   only. In another one, array items have no value when they are read (status 5) and are refused when they are written
 *   (11); files take their values of every subscription.
 * - @param[out] text  [size] terminated. Of each function with a text there is a companion, ...StringLength, for the
 *   @param[out] length  that it needs, zero included; with less room the code is 12, and the buffer is untouched.
 * - Functions that move a set continue after an item that fails, and name it in the text log. The files that
 *   they write are replaced in one step. What moves is limited by the filters, if any are loaded.
 * - A request to the handset may wait for time-out 0 (4,000 ms). One that gets no answer is tried 3 times and then
 *   counts as refused when the handset still answers others; when it does not, the function ends with 16.
 */
#ifndef KRAL_NV_TOOL_H
#define KRAL_NV_TOOL_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Error codes, in the order of their texts. */
#define KRAL_NV_ERROR_NONE 0u                    /**< "ERROR_FREE" */
#define KRAL_NV_ERROR_NO_XML_PARSER 1u           /**< the machine's XML parser cannot be had */
#define KRAL_NV_ERROR_CANNOT_LOAD_SOURCE 2u      /**< no source file there, or no XML */
#define KRAL_NV_ERROR_CANNOT_SAVE_SOURCE 3u      /**< the source file could not be written whole */
#define KRAL_NV_ERROR_CANNOT_LOAD_DEFINITION 4u  /**< no definition file there, or no XML */
#define KRAL_NV_ERROR_BAD_SOURCE 5u              /**< the source file is not of the form of docs/nv.md */
#define KRAL_NV_ERROR_BAD_DEFINITION 6u          /**< the definition file is not, or contradicts itself */
#define KRAL_NV_ERROR_CANNOT_OPEN_PKV 7u         /**< the PKV file cannot be read, or cannot be written */
#define KRAL_NV_ERROR_INDEX_OUT_OF_BOUND 8u      /**< no definition, or no element, has that index */
#define KRAL_NV_ERROR_NOT_DEFINED 9u             /**< no definition has that id or path */
#define KRAL_NV_ERROR_NO_VALUE 10u               /**< the item has no value */
#define KRAL_NV_ERROR_CANNOT_SET_VALUE 11u       /**< the value does not suit the item, or the handset refused it */
#define KRAL_NV_ERROR_CANNOT_GET_VALUE 12u       /**< the handset gave no value, or the buffer is too small */
#define KRAL_NV_ERROR_REDEFINED 13u              /**< a warning: a definition took the place of an older one */
#define KRAL_NV_ERROR_CANNOT_OPEN_SOURCE 14u     /**< the source file cannot be opened for writing */
#define KRAL_NV_ERROR_CANNOT_OPEN_QDF 15u        /**< the list cannot be written */
#define KRAL_NV_ERROR_NO_CONNECTION 16u          /**< the handset does not answer; also an unknown handle */
#define KRAL_NV_ERROR_CANNOT_OPEN_REPORT 17u     /**< the page of the comparison cannot be written */
#define KRAL_NV_ERROR_NO_PKV_STORAGE 18u         /**< the file is no PKV file */
#define KRAL_NV_ERROR_CANNOT_OPEN_FILTER 19u     /**< no filter file there, or not of its form */
#define KRAL_NV_ERROR_BAD_PKV_ITEM 20u           /**< an item of the PKV file is damaged or has no place */
#define KRAL_NV_ERROR_BAD_SOURCE_ITEM 21u        /**< an item of the source file is damaged or has no place */
#define KRAL_NV_ERROR_CANNOT_READ_FILE_ITEM 22u  /**< the handset did not give a file */
#define KRAL_NV_ERROR_CANNOT_WRITE_FILE_ITEM 23u /**< the handset did not take a file */
#define KRAL_NV_ERROR_UNKNOWN 0xFFFFFFFFu        /**< the library itself failed: out of memory, for instance */

/** Operations that the callback reports. */
#define KRAL_NV_OPERATION_READ_MOBILE 1u
#define KRAL_NV_OPERATION_WRITE_MOBILE 2u
#define KRAL_NV_OPERATION_READ_PKV 3u
#define KRAL_NV_OPERATION_WRITE_PKV 4u
#define KRAL_NV_OPERATION_READ_SOURCE 5u
#define KRAL_NV_OPERATION_WRITE_SOURCE 6u

/**
 * Called after each item of a set, on the thread that moves it. It must not call functions of this header on the same
 * handle, which return 0xFFFFFFFF until the set has been moved.
 *
 * @param operation  KRAL_NV_OPERATION_...
 * @param done       items so far
 * @param total      items in all
 * @param item       "NV ID 453" or the path
 * @param status     error code of the item; 10 when the handset does not have it
 * @param handle     the handle that the set is moved on
 */
typedef void(KRAL_CALL* KRAL_NV_CALLBACK)(uint32_t operation, uint32_t done, uint32_t total, const char* item,
                                          uint32_t status, KRAL_HANDLE handle);

/**
 * The text of an error code; "UNKNOWN" for codes beyond 23.
 *
 * @param handle  whose text log gets the line with the function's name; may be 0
 * @param size    bytes of `text`; 128 hold every text
 * @return 0; 12 for a buffer that is too small
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetErrorText(KRAL_HANDLE handle, uint32_t code, char* text, uint32_t size);

/** Has a function called after each item; null for none. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_ConfigureCallBack(KRAL_HANDLE handle, KRAL_NV_CALLBACK callback);

/* --- Definitions -------------------------------------------------------------------------------------------------- */

/**
 * Loads definitions. They join those that are loaded already; one for the same id or path takes the place of the older
 * one, whose value is lost.
 *
 * @return 0; 13 when an item was redefined that a file had defined, not one with a generic definition (all were
 *         loaded); 4 or 6 when nothing was loaded
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadNVDefinitionFile(KRAL_HANDLE handle, const char* file);

/** Loads data types for definition files that are loaded later. 4 or 6: nothing was loaded. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadNVDataTypeDictinary(KRAL_HANDLE handle, const char* file);

/** Forgets all definitions with their values, all data types and roaming lists. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearNVDefinition(KRAL_HANDLE handle);

/** The number of numbered items, and of files. @param[out] count  of definitions */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNumOfNVDefinition(KRAL_HANDLE handle, uint32_t* count);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNumOfNVEfsDefinition(KRAL_HANDLE handle, uint32_t* count);

/** A definition as the XML element that a definition file could hold, on one line. 8: no such index. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndex(KRAL_HANDLE handle, uint32_t index, char* text,
                                                           uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndexStringLength(KRAL_HANDLE handle, uint32_t index,
                                                                       uint32_t* length);

/** The same of a file. 9: not defined. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                                 uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                             uint32_t* length);

/** The names of the members, separated by commas; of a type of several forms those of the first. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNames(KRAL_HANDLE handle, uint32_t index, char* text,
                                                              uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNamesStringLength(KRAL_HANDLE handle, uint32_t index,
                                                                          uint32_t* length);

/** A shared data type as XML, one element for each of its forms. 9: no such type. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinition(KRAL_HANDLE handle, const char* type_name, char* text,
                                                            uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinitionStringLength(KRAL_HANDLE handle, const char* type_name,
                                                                        uint32_t* length);

/** The paths of all files that are defined, a line each. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenames(KRAL_HANDLE handle, char* text, uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenamesStringLength(KRAL_HANDLE handle, uint32_t* length);

/* --- Values --------------------------------------------------------------------------------------------------------
 *
 * 8: no such index or array index. 9: not defined. 10: the item has no value. 11: the value does not fit the
 * definition. 12: the buffer is too small.
 */

/** Gets a value as bytes. @param[out] data  [size] the value @param[in,out] size  the room; its bytes, also when the
 * room is too small */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index,
                                                                uint16_t array_index, uint8_t* data, uint32_t* size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                               uint8_t* data, uint32_t* size);

/** Sets a value from bytes. @param data  [size] the value @param size  bytes of the item's type, or of a value of
 * variable size */
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index,
                                                                uint16_t array_index, const uint8_t* data,
                                                                uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                               const uint8_t* data, uint32_t size);

/** Gets a value as text: decimal numbers with commas between them, or what the definition makes of them. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                            char* text, uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndexStringLength(KRAL_HANDLE handle, uint32_t index,
                                                                        uint16_t array_index, uint32_t* length);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                           char* text, uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVIDStringLength(KRAL_HANDLE handle, uint16_t item,
                                                                       uint16_t array_index, uint32_t* length);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                                  uint32_t size);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                              uint32_t* length);

/** Sets a value from such a text. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                            const char* text);
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                           const char* text);
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file,
                                                                  const char* text);

/** Takes the value away, of the current subscription and all array indexes. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearNVValueByIndex(KRAL_HANDLE handle, uint32_t index);
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearNVValueByNVID(KRAL_HANDLE handle, uint16_t item);

/** Takes the values of all items and all subscriptions away, and the roaming lists. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearNVValues(KRAL_HANDLE handle);

/* --- Moving sets -------------------------------------------------------------------------------------------------- */

/**
 * Reads the items of the current subscription from the handset. Files that the handset keeps in its folders for item
 * files get a generic definition when they have none. Items that were never written (status 5) have no value
 * afterwards, as those that the handset refuses.
 *
 * @return 0; 12 when the handset refused items with another status than 5, or its files could not be listed to the end
 *         (all others were read); 16 when it does not answer
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadNVsFromMobile(KRAL_HANDLE handle);

/**
 * Takes the values of a PKV file, of all subscriptions. Items without a definition get a generic one, except files
 * with a path of more than 200 characters or with other than printable ASCII characters, which are not taken.
 *
 * @return 0; 20 when items of the file could not be taken (the others were); 7 or 18 when the file could not be opened
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadNVsFromPKV(KRAL_HANDLE handle, const char* file);

/** The same of a source file. 21: items could not be taken; 2 or 5: the file could not be used. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadNVsFromSource(KRAL_HANDLE handle, const char* file);

/**
 * Writes the values of the current subscription to the handset.
 *
 * @return 0; 11 when the handset refused items (the others were written); 16 when it does not answer
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVsToMobile(KRAL_HANDLE handle);

/**
 * Writes all values to a PKV file, with the identity of the handset when one is connected and answers.
 *
 * @return 0; 11 when a value has no place in a PKV file, 10 when there is no value, 7 when the file cannot be written
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVsToPKV(KRAL_HANDLE handle, const char* file);

/** Writes all values and roaming lists to a source file. 14: it cannot be opened; 3: it cannot be saved. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVsToSource(KRAL_HANDLE handle, const char* file);

/* --- Single items, whatever the filters say -------------------------------------------------------------------------
 *
 * Of an array item all elements are read, and those that have a value are written; elements that were never written
 * (status 5) are a failure only when all of them are. 12 and 11: the handset refused a numbered item, with
 * `status` as the reason (it may be null); 22 and 23: an RF NV item or a file could not be read or written; 16: no
 * answer.
 */

/** An item without a definition gets a generic one. @param[out] status  NV status (nv.h) */
KRAL_API uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status);
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status);
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t* status);
KRAL_API uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file);
KRAL_API uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file);

/* --- Filters: 19 when the file cannot be read or written ---------------------------------------------------------- */

/** Adds to what sets that are loaded, or written, are limited to. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadReadFilter(KRAL_HANDLE handle, const char* file);
KRAL_API uint32_t KRAL_CALL KRAL_NV_LoadWriteFilter(KRAL_HANDLE handle, const char* file);
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearReadFilters(KRAL_HANDLE handle);
KRAL_API uint32_t KRAL_CALL KRAL_NV_ClearWriteFilters(KRAL_HANDLE handle);

/**
 * Writes a filter of the items that have a value in the current subscription; the complement is one of those that have
 * none. 10: there is no such item.
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_CreateNVFilter(KRAL_HANDLE handle, const char* file);
KRAL_API uint32_t KRAL_CALL KRAL_NV_CreateComplementNVFilter(KRAL_HANDLE handle, const char* file);

/* --- Reports ------------------------------------------------------------------------------------------------------ */

/**
 * Compares two PKV files in a page of HTML, with values decoded by the definitions that are loaded. Values in the tool
 * stay as they are.
 *
 * @return 0, whether they differ or not; 7, 18 or 20 for the PKV files; 17 for the page, also when it is one of them
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_PKV_Diff(KRAL_HANDLE handle, const char* first_pkv, const char* second_pkv,
                                             const char* html_file);

/**
 * Writes all values as a list: item, name, subscription, array index, value; tabs between.
 *
 * @return 0; 10 when there is no value (an older list stays as it is); 15 when it cannot be made
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_GenerateQDF(KRAL_HANDLE handle, const char* file);

/* --- Subscriptions ------------------------------------------------------------------------------------------------ */

/**
 * Sets whether the handset knows subscriptions (1): numbered items of another than 0 are then read and written with
 * the requests that name it. Without (0, the default) the current subscription becomes 0.
 */
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetTargetSupportMultiSIM(KRAL_HANDLE handle, uint8_t supported);
KRAL_API uint32_t KRAL_CALL KRAL_NV_GetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t* subscription);
/** 8: another than 0 on a handset that knows no subscriptions. */
KRAL_API uint32_t KRAL_CALL KRAL_NV_SetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t subscription);

#ifdef __cplusplus
}
#endif

#endif
