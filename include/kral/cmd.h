/**
 * @file cmd.h
 * Commands by definition: requests that a station describes once, in an XML file, and then calls by name. What a
 * definition file holds is told in docs/commands.md.
 *
 *     KRAL_CMD_LoadDefinitions(handle, "wlan.xml", &count);
 *     KRAL_CMD_Call(handle, "WLAN.TX_START", "channel=6 rate=11M", reply, sizeof reply);   {"status":0,"power":-12.5}
 *
 * Loops that send one command thousands of times prepare it, set its fields by index, and send:
 *
 *     KRAL_CMD_Prepare(handle, "WLAN.SET_LEVEL", &call);
 *     KRAL_CMD_GetFieldIndex(handle, call, 0, "level", &level);
 *     for (i = 0; i < 1000; ++i) {
 *       KRAL_CMD_SetInteger(handle, call, level, 0, i);
 *       KRAL_CMD_Send(handle, call);
 *       KRAL_CMD_GetReal(handle, call, power, 0, &measured[i]);
 *     }
 *
 * Beside the rules of kral.h:
 *
 * - Definitions and prepared calls belong to the handle, until its release. A command has the name of its family in
 *   front: "WLAN.TX_START".
 * - Fields are set as a text: field=value, separated by blanks. Numbers are decimal, hexadecimal behind 0x, or words of
 *   the field's enumeration; texts with blanks stand in quotation marks; bytes are pairs of hexadecimal digits; the
 *   elements of an array are separated by commas. Parts are named as in "points[2].level=7" and "flags.on=1".
 * - Before anything is sent, everything is checked: fields that are unknown, out of range, or missing and without
 *   default are refused with KRAL_ERROR_ARGUMENT, and KRAL_GetLastError names field, range and unit.
 * - A request goes out once. A reply that is not as defined is KRAL_ERROR_LINK. One whose status field does not mean
 *   success is KRAL_ERROR_REFUSED, with the field's value as KRAL_ERROR_STATUS_COMMAND.
 * - Replies are given as JSON, as bytes, or value by value. Wait: time-out 0 (4,000 ms).
 */
#ifndef KRAL_CMD_H
#define KRAL_CMD_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** @name Definitions */
/**@{*/

/**
 * Loads a definition file. What was loaded before stays; a command that is there already is not accepted again. With a
 * fault in the file nothing of it is loaded: KRAL_ERROR_BAD_FILE, with the line.
 *
 * @param      handle   from a connect function
 * @param      file     path of the file
 * @param[out] commands how many it defines; may be null
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_LoadDefinitions(KRAL_HANDLE handle, const char* file, uint32_t* commands);

/** Forgets all definitions. Prepared calls stay usable. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_ClearDefinitions(KRAL_HANDLE handle);

/**
 * Gets how many commands are defined.
 *
 * @param      handle from a connect function
 * @param[out] count  commands
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetCount(KRAL_HANDLE handle, uint32_t* count);

/**
 * Gets the name of a command.
 *
 * @param      handle from a connect function
 * @param      index  from 0, in the order in which they were loaded
 * @param[out] name   [size] "FAMILY.NAME", terminated
 * @param      size   bytes of name; 128 hold every name
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetName(KRAL_HANDLE handle, uint32_t index, char* name, uint32_t size);

/**
 * Describes a command as a JSON object: its id, frame and documentation, and the fields of its request and reply with
 * types, ranges, units, defaults, words of enumerations, and what else the file says.
 *
 * @param      handle  from a connect function
 * @param      command "FAMILY.NAME"
 * @param[out] text    [size] terminated, in UTF-8
 * @param      size    bytes of text, KRAL_CMD_DescribeLength of them
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_Describe(KRAL_HANDLE handle, const char* command, char* text, uint32_t size);

/**
 * Gets what room the description needs.
 *
 * @param      handle  from a connect function
 * @param      command "FAMILY.NAME"
 * @param[out] length  bytes, zero included
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_DescribeLength(KRAL_HANDLE handle, const char* command, uint32_t* length);

/** @name Frames of a family */
/**@{*/
#define KRAL_CMD_FRAME_FTM 0u       /**< 75, 11, mode id, command id; or command code 59 where that is in force */
#define KRAL_CMD_FRAME_FTM59 1u     /**< command code 59 always */
#define KRAL_CMD_FRAME_DIAG 2u      /**< the id is the command code */
#define KRAL_CMD_FRAME_SUBSYSTEM 3u /**< 75, subsystem, id */
/**@}*/

/** @name KRAL_CMD_COMMAND::mode_id of commands without one of their own */
/**@{*/
#define KRAL_CMD_MODE_CURRENT 0xFFFFFFFFu    /**< the current one */
#define KRAL_CMD_MODE_BY_RF_MODE 0xFFFFFFFEu /**< the one of the RF mode that the first field is */
/**@}*/

/** One command: 256 bytes without padding. Its text is UTF-8, terminated, and cut where it is too long. */
typedef struct KRAL_CMD_COMMAND {
  uint32_t size;           /**< sizeof(KRAL_CMD_COMMAND), filled in by the caller */
  uint32_t id;             /**< of the command */
  uint32_t frame;          /**< KRAL_CMD_FRAME_... */
  uint32_t mode_id;        /**< with KRAL_CMD_FRAME_FTM: the dispatcher, or KRAL_CMD_MODE_... */
  uint32_t subsystem;      /**< with KRAL_CMD_FRAME_SUBSYSTEM */
  uint32_t request_fields; /**< fields of the request for KRAL_CMD_GetField, groups included */
  uint32_t reply_fields;   /**< fields of the reply */
  uint32_t reserved;       /**< 0 */
  char documentation[224]; /**< what the file says of it */
} KRAL_CMD_COMMAND;

/**
 * Gets what is defined of a command, beside its fields.
 *
 * @param         handle  from a connect function
 * @param         command "FAMILY.NAME"
 * @param[in,out] record  `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetCommand(KRAL_HANDLE handle, const char* command, KRAL_CMD_COMMAND* record);

/** @name Kinds of fields */
/**@{*/
#define KRAL_CMD_KIND_UNSIGNED 0u
#define KRAL_CMD_KIND_SIGNED 1u
#define KRAL_CMD_KIND_REAL 2u
#define KRAL_CMD_KIND_TEXT 3u
#define KRAL_CMD_KIND_BYTES 4u
#define KRAL_CMD_KIND_RECORD 5u /**< a group of the fields that follow with a greater depth; so are these two: */
#define KRAL_CMD_KIND_BITS 6u   /**< parts of one word */
#define KRAL_CMD_KIND_ZLIB 7u   /**< kept as a zlib stream */
/**@}*/

/** @name Bits of KRAL_CMD_FIELD::flags */
/**@{*/
#define KRAL_CMD_FIELD_ARRAY 1u       /**< has elements */
#define KRAL_CMD_FIELD_VARIABLE 2u    /**< of elements or bytes there may be fewer than count, or room, says */
#define KRAL_CMD_FIELD_CONDITIONAL 4u /**< not always there */
#define KRAL_CMD_FIELD_STATUS 8u      /**< tells whether the handset did what it was asked */
#define KRAL_CMD_FIELD_DEFAULT 16u    /**< may be left out */
#define KRAL_CMD_FIELD_WORDS 32u      /**< has an enumeration */
#define KRAL_CMD_FIELD_COUNTS 64u     /**< counts another field, and follows from it where it is not set */
/**@}*/

/** Index of a group, which has no value of its own. */
#define KRAL_CMD_NO_INDEX 0xFFFFFFFFu

/** One field: 448 bytes without padding. Texts are UTF-8, terminated, and cut where they are too long. */
typedef struct KRAL_CMD_FIELD {
  uint32_t size;           /**< sizeof(KRAL_CMD_FIELD), filled in by the caller */
  uint32_t index;          /**< for the functions that set and get values; KRAL_CMD_NO_INDEX of a group */
  uint32_t kind;           /**< KRAL_CMD_KIND_... */
  uint32_t bits;           /**< of a number, or of the word of a group of bits */
  uint32_t depth;          /**< how many groups it is in */
  uint32_t count;          /**< elements, at most; 1 for no array */
  uint32_t room;           /**< bytes of a text or block, at most */
  uint32_t flags;          /**< KRAL_CMD_FIELD_... */
  double least;            /**< of a number: what it may be at least */
  double most;             /**< and at most */
  double preset;           /**< the default, with KRAL_CMD_FIELD_DEFAULT */
  char name[64];           /**< its own; with those of the groups around it in path */
  char path[128];          /**< "points.level" */
  char unit[16];           /**< such as "dBm" */
  char documentation[184]; /**< what the file says of it */
} KRAL_CMD_FIELD;

/**
 * Gets one field of a command, for programs that show or generate something. Groups stand in front of their fields.
 *
 * @param         handle   from a connect function
 * @param         command  "FAMILY.NAME"
 * @param         of_reply 1: the reply's; 0: the request's
 * @param         number   from 0; the first that fails is behind the last field
 * @param[in,out] field    `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetField(KRAL_HANDLE handle, const char* command, uint8_t of_reply, uint32_t number,
                                             KRAL_CMD_FIELD* field);

/**
 * Gets a word of a field's enumeration.
 *
 * @param      handle   from a connect function
 * @param      command  "FAMILY.NAME"
 * @param      of_reply 1: of the reply; 0: of the request
 * @param      index    of the field, KRAL_CMD_FIELD::index
 * @param      number   from 0; the first that fails is behind the last word
 * @param[out] word     [size] terminated
 * @param      size     bytes of word
 * @param[out] value    the number that it stands for
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetWord(KRAL_HANDLE handle, const char* command, uint8_t of_reply, uint32_t index,
                                            uint32_t number, char* word, uint32_t size, int64_t* value);

/**@}*/
/** @name Calls */
/**@{*/

/**
 * Calls a command.
 *
 * @param      handle  from a connect function
 * @param      command "FAMILY.NAME"
 * @param      fields  of the request, "channel=6 rate=11M"; may be null or empty
 * @param[out] reply   [size] a JSON object with the fields of the reply, terminated; null where it is not wanted
 * @param      size    bytes of reply. With too little room the call fails with KRAL_ERROR_ARGUMENT though the handset
 *                     has answered: KRAL_CMD_GetReply then has the reply, and nothing needs to be sent again
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_Call(KRAL_HANDLE handle, const char* command, const char* fields, char* reply,
                                         uint32_t size);

/**
 * Calls a command with the bytes of its fields, which are held to the definition as well.
 *
 * @param         handle       from a connect function
 * @param         command      "FAMILY.NAME"
 * @param         request      [request_size] what stands behind the header; may be null when request_size is 0
 * @param         request_size bytes
 * @param[out]    reply        [reply_size] what stands behind the header of the reply
 * @param[in,out] reply_size   in: room of `reply`; out: bytes of the reply. With too little room as KRAL_CMD_Call
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_CallBytes(KRAL_HANDLE handle, const char* command, const uint8_t* request,
                                              uint32_t request_size, uint8_t* reply, uint32_t* reply_size);

/**
 * Gets the latest reply on the handle, of whichever call, as JSON.
 *
 * @param      handle from a connect function
 * @param[out] reply  [size] terminated
 * @param      size   bytes of reply, KRAL_CMD_GetReplyLength of them
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetReply(KRAL_HANDLE handle, char* reply, uint32_t size);

/**
 * Gets what room that needs.
 *
 * @param      handle from a connect function
 * @param[out] length bytes, zero included
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetReplyLength(KRAL_HANDLE handle, uint32_t* length);

/**@}*/
/** @name Prepared calls */
/**@{*/

/**
 * Looks a command up, for many calls.
 *
 * @param      handle  from a connect function
 * @param      command "FAMILY.NAME"
 * @param[out] call    stands for the prepared call in the functions below; never 0
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_Prepare(KRAL_HANDLE handle, const char* command, uint32_t* call);

/** Forgets a prepared call. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_Release(KRAL_HANDLE handle, uint32_t call);

/**
 * Gets the index of a field, by which it is set and got.
 *
 * @param      handle   from a connect function
 * @param      call     from KRAL_CMD_Prepare
 * @param      of_reply 1: of the reply; 0: of the request
 * @param      path     "level", "points.level"
 * @param[out] index    the field's
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetFieldIndex(KRAL_HANDLE handle, uint32_t call, uint8_t of_reply, const char* path,
                                                  uint32_t* index);

/** Sets fields as KRAL_CMD_Call does; what was set before and is not named stays. With a fault nothing is set. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_SetFields(KRAL_HANDLE handle, uint32_t call, const char* fields);

/**
 * Sets a whole number. One out of range is refused, as by all functions that set. What is set stays set for the calls
 * to come.
 *
 * @param handle  from a connect function
 * @param call    from KRAL_CMD_Prepare
 * @param index   of the field
 * @param element from 0, for arrays; 0 for others. In arrays within arrays they are numbered through: record 2 of 10
 *                with 4 levels each begins with element 8
 * @param value   of u64 fields the same 64 bits
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_SetInteger(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                               int64_t value);

/** The same with a real number; for a field of whole numbers it must be one. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_SetReal(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                            double value);

/**
 * Sets a text or a block of bytes.
 *
 * @param handle  from a connect function
 * @param call    from KRAL_CMD_Prepare
 * @param index   of the field
 * @param element as for KRAL_CMD_SetInteger
 * @param bytes   [size] the bytes; may be null when size is 0
 * @param size    bytes
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_SetBytes(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                             const uint8_t* bytes, uint32_t size);

/** Takes back what a field of the request was set to, all elements of it. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_ClearField(KRAL_HANDLE handle, uint32_t call, uint32_t index);

/** Sends the request as it is set, and takes the reply, which is kept until the next one. */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_Send(KRAL_HANDLE handle, uint32_t call);

/**
 * Gets how many elements of a field the reply has: 0 for a field that is not there.
 *
 * @param      handle from a connect function
 * @param      call   from KRAL_CMD_Prepare
 * @param      index  of the field
 * @param[out] count  elements
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetElements(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t* count);

/**
 * Gets a whole number of the reply.
 *
 * @param      handle  from a connect function
 * @param      call    from KRAL_CMD_Prepare
 * @param      index   of the field
 * @param      element as for KRAL_CMD_SetInteger
 * @param[out] value   the number
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetInteger(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                               int64_t* value);

/**
 * The same of any number, as a real one.
 *
 * @param      handle  from a connect function
 * @param      call    from KRAL_CMD_Prepare
 * @param      index   of the field
 * @param      element as for KRAL_CMD_SetInteger
 * @param[out] value   the number
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetReal(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                            double* value);

/**
 * Gets a text or a block of bytes of the reply.
 *
 * @param         handle  from a connect function
 * @param         call    from KRAL_CMD_Prepare
 * @param         index   of the field
 * @param         element as for KRAL_CMD_SetInteger
 * @param[out]    bytes   [size] the bytes; a text is not terminated
 * @param[in,out] size    in: room of `bytes`; out: how many there are
 */
KRAL_API uint8_t KRAL_CALL KRAL_CMD_GetBytes(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                             uint8_t* bytes, uint32_t* size);

/**@}*/

#ifdef __cplusplus
}
#endif

#endif
