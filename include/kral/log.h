/**
 * @file log.h
 * Logs, events and messages: what a handset sends of its own accord, chosen by masks and collected into queues.
 *
 * Beside the rules of kral.h:
 *
 * - Log packets (first byte 16), messages (31 and 121), event reports (96) and packets that begin with 146 (in the
 *   framed packet mode these are discarded uncounted) are put into the log queue of the handset while collection is
 *   on; while it is off they are dropped, and counted. Every event of a report is also put into the event queue. Each
 *   queue holds 4,096 records and drops its oldest one when full.
 * - Answers to requests come the same way as collected packets, one after the other: a callback that takes long, and a
 *   text log that takes long to write them down, hold up everything that comes after, answers too. Requests then run
 *   into their time-outs, and what has been received meanwhile waits in memory without a bound. Callers that may take
 *   long read the queues instead.
 * - Collection is off by default. It is switched on by KRAL_DIAG_SetPhoneLoggingState, and by every call that switches
 *   logs or messages on or changes the event mask.
 * - The mask functions are requests and wait for time-out 0 (4,000 ms) once for each request they make: at most three
 *   for logs, two for events. They must not be called from a callback. All others never wait for a running request,
 *   and wait only where they say so.
 * - An equipment id (0 to 15) has the log codes from its number times 4,096 on, as many as the handset reports. Codes
 *   outside that range are refused, and so is the whole list that contains them.
 * - Functions and records marked as an addition are additions of this library.
 *
 * The files that the functions read and write are described in docs/logs.md.
 */
#ifndef KRAL_LOG_H
#define KRAL_LOG_H

#include "kral/transport.h"
#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Bytes of the longest packet, its two FCS bytes included. */
#define KRAL_LONGEST_PACKET 4096u

/** Bytes that hold every log mask, and the event mask. */
#define KRAL_LONGEST_MASK 4096u

/** Equipment ids of a handset. */
#define KRAL_EQUIPMENT_IDS 16u

/** One event, as taken out of a report. */
typedef struct KRAL_EVENT {
  uint8_t time_stamp_length; /**< 8, or 2 for a truncated one */
  uint8_t time_stamp[8];     /**< of a truncated one the first two bytes */
  uint8_t event_id[2];       /**< little-endian, 0 to 4,095 */
  uint8_t payload_length;    /**< 0 also for payloads of one and of two bytes that go without a length */
  uint8_t payload[256];      /**< what belongs to the event, in its first payload_length bytes */
} KRAL_EVENT;

/* --- Collecting --------------------------------------------------------------------------------------------------- */

/**
 * Switches collection on or off. What is in the queues stays there.
 *
 * @param handle  from a connect function
 * @param enable  1: on; every other value: off
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SetPhoneLoggingState(KRAL_HANDLE handle, uint8_t enable);

/**
 * Takes the oldest packet out of the log queue.
 *
 * @param      handle  from a connect function
 * @param[out] size    bytes of the packet, its two FCS bytes at the end included
 * @param[out] buffer  [KRAL_LONGEST_PACKET] the packet
 * @return [answer] 1, or 0 when the queue is empty
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer);

/**
 * The same, waiting for a packet when the queue is empty. An addition.
 *
 * @param      handle       from a connect function; released meanwhile, it ends the wait
 * @param[out] size         as above
 * @param[out] buffer       [KRAL_LONGEST_PACKET] as above
 * @param      time_out_ms  0 does not wait
 * @return [answer] 1, or 0 when no packet came in time; at once, too, when the handset is unplugged (KRAL_GetPortState)
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_WaitNextPhoneLog(KRAL_HANDLE handle, uint16_t* size, uint8_t* buffer,
                                                      uint32_t time_out_ms);

/** Empties the log queue. @return 1 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearPhoneLogQueue(KRAL_HANDLE handle);

/**
 * Reports how many packets wait in the log queue.
 *
 * @param      handle  from a connect function
 * @param[out] count   written for an empty queue as well
 * @return [answer] 1 when there are any, 0 when the queue is empty
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetPhoneLogQueueSize(KRAL_HANDLE handle, uint32_t* count);

/**
 * Takes the oldest event out of the event queue.
 *
 * @param      handle  from a connect function
 * @param[out] event   the event
 * @return [answer] 1, or 0 when the queue is empty
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event);

/**
 * The same, waiting for an event when the queue is empty. An addition.
 *
 * @param      handle       from a connect function; released meanwhile, it ends the wait
 * @param[out] event        the event
 * @param      time_out_ms  0 does not wait
 * @return [answer] 1, or 0 when no event came in time; at once, too, when the handset is unplugged (KRAL_GetPortState)
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_WaitNextEvent(KRAL_HANDLE handle, KRAL_EVENT* event, uint32_t time_out_ms);

/** Empties the event queue. @return 1 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearEventQueue(KRAL_HANDLE handle);

/** Empties the queue of answers: one that a request waits for is lost, too. @return 1 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearCommandResponseQueue(KRAL_HANDLE handle);

/**
 * Sees an event as it is put into the event queue; rules as for KRAL_RAW_PACKET_CALLBACK. The report, which the
 * callback for packets has seen before, shows how long the payload of an event without a length is. An addition.
 */
typedef void(KRAL_CALL* KRAL_EVENT_CALLBACK)(const KRAL_EVENT* event, uintptr_t value);

/**
 * Sets the functions that see collected packets and events, beside the queues. An addition.
 *
 * @param handle  from a connect function
 * @param packet  called for every packet that is put into the log queue; null: none
 * @param event   called for every event that is put into the event queue; null: none
 * @param value   passed to both. Calls to the former functions that are under way still end
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigureCollectionCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK packet,
                                                             KRAL_EVENT_CALLBACK event, uintptr_t value);

/** What came over a connection, and what was lost of it; all counted since the handle was made. An addition. */
typedef struct KRAL_TRAFFIC_COUNTERS {
  uint64_t bytes_received;   /**< from the port; 0 through a phone server, as are the next, bad_fcs */
  uint64_t packets_received; /**< made of the bytes, answers included, or played from a file */
  uint64_t collected;        /**< packets put into the log queue */
  uint64_t events;           /**< events put into the event queue */
  uint64_t dropped_logs;     /**< thrown out of the full log queue before they were read, or no memory for them */
  uint64_t dropped_events;   /**< ... out of the event queue */
  uint64_t dropped_answers;  /**< ... out of the queue of answers */
  uint64_t dropped_off;      /**< packets that came while collection was off */
  uint64_t bad_fcs;          /**< answers with a wrong frame check sequence; logs and the like are not checked */
  uint64_t oversized;        /**< packets shorter than 2 or longer than 4,096 bytes, and runs of bytes without an end */
  uint64_t captured;         /**< packets written to capture files */
  uint64_t capture_lost;     /**< packets that a full or slow disk, or no memory, has cost one */
  uint64_t capture_pending;  /**< packets taken for a capture file that are not in it yet */
  uint64_t waiting;          /**< packets received that still wait for callbacks and queues; 0 through a phone server */
  uint64_t most_waiting;     /**< the most that ever waited so */
} KRAL_TRAFFIC_COUNTERS;

/**
 * Reads the counters. An addition.
 *
 * @param      handle    from a connect function
 * @param[out] counters  each is exact; traffic that comes meanwhile may be in one of them and not yet in another
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetTrafficCounters(KRAL_HANDLE handle, KRAL_TRAFFIC_COUNTERS* counters);

/* --- Log masks ---------------------------------------------------------------------------------------------------- */

/**
 * Switches one log code on, and all others of the equipment id off.
 *
 * @param handle        from a connect function
 * @param equipment_id  0 to 15
 * @param log_code      of that equipment id
 * @param last_item     the number of items of the equipment id, as KRAL_DIAG_GetLogRanges reports it
 * @return 1 when the handset has the mask
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SetExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code,
                                                        uint16_t last_item);

/**
 * Switches a log code on and leaves the others as they are. Nothing is sent for one that is on already.
 *
 * @param handle        from a connect function
 * @param equipment_id  0 to 15
 * @param log_code      of that equipment id, and on the list of allowed ones if there is one
 * @return 1 when the code is on
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_AddExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code);

/**
 * The same for several.
 *
 * @param handle        from a connect function
 * @param equipment_id  0 to 15
 * @param log_codes     [count] one that is refused fails the call, and nothing is changed
 * @param count         codes of the list
 * @return 1 when all are on
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_AddExtendedLogCodes(KRAL_HANDLE handle, uint8_t equipment_id,
                                                         const uint16_t* log_codes, uint16_t count);

/** Switches a log code off; arguments as for KRAL_DIAG_AddExtendedLogCode. @return 1 when it is off */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code);

/** Switches several off; arguments as for KRAL_DIAG_AddExtendedLogCodes. @return 1 when all are off */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearExtendedLogCodes(KRAL_HANDLE handle, uint8_t equipment_id,
                                                           const uint16_t* log_codes, uint16_t count);

/**
 * Switches every log code of an equipment id off. When the handset does not report its ranges, it is sent a mask
 * without any items.
 *
 * @param handle        from a connect function
 * @param equipment_id  0 to 15
 * @return 1 when the handset has answered the mask that it was sent: with its ranges unknown, that mask names no item,
 *         and what was on may still be
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_ClearAllLogCodes(KRAL_HANDLE handle, uint8_t equipment_id);

/**
 * Reads how many log items each equipment id has. An addition.
 *
 * @param      handle      from a connect function
 * @param[out] last_items  KRAL_EQUIPMENT_IDS numbers
 * @return 1 when the handset answered
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetLogRanges(KRAL_HANDLE handle, uint32_t* last_items);

/**
 * Reads the log mask of an equipment id. An addition.
 *
 * @param         handle        from a connect function
 * @param         equipment_id  0 to 15
 * @param[out]    bits          items of the equipment id
 * @param[in,out] size          in: bytes of room; out: bytes of the mask
 * @param[out]    mask          [size] item i is bit (i mod 8) of byte (i / 8)
 * @return 1; 0 also when there is not enough room (KRAL_LONGEST_MASK bytes always are)
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetLogMask(KRAL_HANDLE handle, uint8_t equipment_id, uint32_t* bits,
                                                uint16_t* size, uint8_t* mask);

/* --- Event mask --------------------------------------------------------------------------------------------------- */

/**
 * Switches one event.
 *
 * @param handle    from a connect function
 * @param event_id  that the handset has, and on the list of allowed ones if there is one
 * @param state     1: on; every other value: off
 * @return 1 when the handset has taken the mask
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SetEventMaskBit(KRAL_HANDLE handle, uint16_t event_id, uint8_t state);

/**
 * Switches several events.
 *
 * @param handle     from a connect function
 * @param event_ids  [count] one that is refused fails the call, and nothing is changed
 * @param count      ids of the list
 * @param state      1: on; every other value: off
 * @return 1 when the handset has taken the mask
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SetEventMaskBits(KRAL_HANDLE handle, const uint16_t* event_ids, uint16_t count,
                                                      uint8_t state);

/**
 * Switches all events. A list of allowed events has no say in it.
 *
 * @param handle  from a connect function
 * @param state   1: on; every other value: off
 * @return 1 when the handset has taken the mask
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_SetEntireEventMaskState(KRAL_HANDLE handle, uint8_t state);

/**
 * Reads the event mask. An addition.
 *
 * @param         handle  from a connect function
 * @param[out]    bits    events that the handset has
 * @param[in,out] size    in: bytes of room; out: bytes of the mask
 * @param[out]    mask    [size] event i is bit (i mod 8) of byte (i / 8)
 * @return 1; 0 also when there is not enough room (KRAL_LONGEST_MASK bytes always are)
 */
KRAL_API uint8_t KRAL_CALL KRAL_DIAG_GetEventMask(KRAL_HANDLE handle, uint16_t* bits, uint16_t* size, uint8_t* mask);

/* --- Names and lists ---------------------------------------------------------------------------------------------- */

/** The tables of a handle, all of them empty by default. */
#define KRAL_TABLE_EVENT_TEXTS 0u
#define KRAL_TABLE_MESSAGE_CATEGORIES 1u
#define KRAL_TABLE_LOG_NAMES 2u
#define KRAL_TABLE_ALLOWED_LOGS 3u   /**< the only log codes that may be switched; empty: all may be */
#define KRAL_TABLE_ALLOWED_EVENTS 4u /**< the same for single events */

/**
 * Loads a table from a text file: one id and its name a line. An addition.
 *
 * @param handle     from a connect function
 * @param table      KRAL_TABLE_...
 * @param file_name  null empties the table
 * @return 1; 0 when the file cannot be read or has a mistake, which the text log names: the table is then as it was
 *
 * Wait: the reading of the file.
 */
KRAL_API uint8_t KRAL_CALL KRAL_LoadNameTable(KRAL_HANDLE handle, uint32_t table, const char* file_name);

/**
 * The text of an event, from the table of event texts.
 *
 * @param      handle    from a connect function
 * @param      event_id  0 to 4,095
 * @param      size      bytes of room, at least 1
 * @param[out] text      [size] terminated; a longer one is cut
 * @return 1, or 0 when the table has no such event
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetEventText(KRAL_HANDLE handle, uint16_t event_id, uint16_t size, char* text);

/** The name of a log code, from the table of log names; arguments as for KRAL_GetEventText. An addition. */
KRAL_API uint8_t KRAL_CALL KRAL_GetLogCodeText(KRAL_HANDLE handle, uint16_t log_code, uint16_t size, char* text);

/**
 * The number of message categories in the table.
 *
 * @param      handle  from a connect function
 * @param[out] count   written on success
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_ExtendedTextMessage_GetCategoryListSize(KRAL_HANDLE handle, uint32_t* count);

/**
 * One message category of the table, in the order of the file.
 *
 * @param      handle    from a connect function
 * @param      index     from 0
 * @param[out] category  its id
 * @param      size      bytes of room for the name, at least 1
 * @param[out] name      [size] terminated; a longer one is cut
 * @return 1, or 0 for an index outside the table
 */
KRAL_API uint8_t KRAL_CALL KRAL_ExtendedTextMessage_GetCategoryListItem(KRAL_HANDLE handle, uint32_t index,
                                                                        uint16_t* category, uint16_t size, char* name);

/**
 * Lets the handset send the messages of a category, of every level, or none of them.
 *
 * @param handle    from a connect function
 * @param category  in the table of message categories; while that is empty, any
 * @param enable    1: on; every other value: off
 * @return 1 when the handset has taken it
 */
KRAL_API uint8_t KRAL_CALL KRAL_ExtendedTextMessage_SetCategoryEnable(KRAL_HANDLE handle, uint16_t category,
                                                                      uint8_t enable);

/* --- Capture files (additions) ------------------------------------------------------------------------------------ */

/**
 * Writes everything that is collected from now on to a file, beside the queues. The disk never holds up the connection:
 * packets that it is too slow for are counted as lost, and so are those after a write that fails. Switches nothing on.
 *
 * @param handle     from a connect function
 * @param file_name  an ordinary file, emptied first
 * @return 1; 0 when the file cannot be written, and, with no file touched, while another capture of the handle runs or
 *         has not written its rest, or while the file is written by another capture or played
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartCapture(KRAL_HANDLE handle, const char* file_name);

/**
 * The same, compressed, or in several files. Of those each begins where the one before ends, and each can be played by
 * itself: for "night.cap" they are "night-00001.cap", "night-00002.cap" and so on, behind the last that is there. When
 * the next cannot be opened, what comes is lost and counted. A compressed file can be played, exported and entered at a
 * time as others; a crash loses the last second of it.
 *
 * @param handle        from a connect function
 * @param file_name     an ordinary file, emptied first; of several files this name without a number
 * @param file_bytes    the next file begins with the packet that would make this one longer: 65536 and more; 0: never
 * @param file_seconds  the next file begins with the first packet that comes so long after the first of this; 0: never.
 *                      With either number one also begins where the clock was set back by more than a second
 * @param keep          when a file begins, the oldest are removed until so many are left with it, those of former
 *                      captures of that name too; 0: none are
 * @param compress      1: with zlib
 * @return 1; 0 as for KRAL_StartCapture, and with a number that is refused
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartCaptureWith(KRAL_HANDLE handle, const char* file_name, uint64_t file_bytes,
                                                 uint32_t file_seconds, uint32_t keep, uint32_t compress);

/**
 * Ends the capture and closes its file. What was collected until then is written still, and while the disk is too slow
 * for that (capture_pending of the counters is not 0) another call waits for it again. The disconnect that releases the
 * handle ends a capture as well; one that leaves it to another connect does not.
 *
 * @return 1 when every packet that was collected is in the file; 0 when some were lost, when the rest has not been
 *         written in time, and when no capture runs
 *
 * Wait: until the rest is written, at most 1,200 ms; longer after another thread's call that starts or ends a capture.
 */
KRAL_API uint8_t KRAL_CALL KRAL_StopCapture(KRAL_HANDLE handle);

/** Pace of a playback. */
#define KRAL_PLAY_FOR_LOG_READER 0u   /**< waits for room in the log queue: no packet is dropped from it */
#define KRAL_PLAY_FOR_EVENT_READER 1u /**< the same for the event queue */
#define KRAL_PLAY_AS_RECORDED 2u      /**< with the time between packets as it was */
#define KRAL_PLAY_AT_ONCE 3u          /**< for callbacks; the queues drop what they do not hold */

/** States of a playback. */
#define KRAL_PLAYBACK_NONE 0
#define KRAL_PLAYBACK_RUNNING 1
#define KRAL_PLAYBACK_DONE 2
#define KRAL_PLAYBACK_CUT 3     /**< played up to the last whole packet of a file that is cut or damaged there */
#define KRAL_PLAYBACK_FOREIGN 4 /**< not a capture file */
#define KRAL_PLAYBACK_STOPPED 5

/**
 * Plays a capture file: its packets come as if the handset had sent them, on a thread of the library, through counters,
 * callbacks and queues. Switches collection on. The playback is done once its last packet has been through all of them.
 * The callback for playbacks receives the time at which they first came. A connection to KRAL_PORT_NULL is enough.
 *
 * @param handle     from a connect function
 * @param file_name  written by KRAL_StartCapture
 * @param pace       KRAL_PLAY_...
 * @return 1 when the playback has begun; 0 when the file cannot be read or a capture writes it, while another is
 *         played, and through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartPlayback(KRAL_HANDLE handle, const char* file_name, uint32_t pace);

/**
 * Plays a part of a capture file: the packets that came from one time to another, both included. What is in front is
 * not read: it begins at once in a file of any length. Where the clock of the PC was set back, its packets of that time
 * are played as well. A file whose capture never ended is read as a whole, and the text log says so.
 *
 * @param handle     from a connect function
 * @param file_name  as for KRAL_StartPlayback
 * @param pace       KRAL_PLAY_...
 * @param from       microseconds since 1970-01-01 UTC; 0: from the beginning
 * @param to         the same; UINT64_MAX: to the end
 * @return 1; 0 as for KRAL_StartPlayback
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartPlaybackBetween(KRAL_HANDLE handle, const char* file_name, uint32_t pace,
                                                     uint64_t from, uint64_t to);

/**
 * Sees a packet of a file just before it is played, with the time at which it was collected. It comes on the thread of
 * the playback, which waits while it runs, and must not call functions that send requests. Packets that are left out
 * are not seen.
 *
 * @param microseconds  since 1970-01-01 UTC, by the clock of the PC that wrote the file
 * @param length        bytes of the packet
 * @param bytes         [length] the packet; valid during the call only
 * @param value         as given to KRAL_ConfigurePlaybackCallBack
 */
typedef void(KRAL_CALL* KRAL_PLAYBACK_CALLBACK)(uint64_t microseconds, uint32_t length, const uint8_t* bytes,
                                                uintptr_t value);

/**
 * Sets the function that sees the packets of files that are played.
 *
 * @param handle    from a connect function
 * @param callback  null: none. A call to the former one that is under way still ends
 * @param value     handed to the callback
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigurePlaybackCallBack(KRAL_HANDLE handle, KRAL_PLAYBACK_CALLBACK callback,
                                                          uintptr_t value);

/**
 * Ends a playback before its time. Called by the callback for playbacks, it waits for nothing: the playback ends when
 * the callback returns, without the packet that it was shown.
 *
 * @return 1; 0 when a callback did not come back within 1,000 ms
 */
KRAL_API uint8_t KRAL_CALL KRAL_StopPlayback(KRAL_HANDLE handle);

/**
 * Reports how far the last playback has got. Any output may be null.
 *
 * @param      handle   from a connect function
 * @param[out] state    KRAL_PLAYBACK_...
 * @param[out] packets  played so far
 * @param[out] skipped  packets of the file that no handset sends unasked: they were left out
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetPlaybackState(KRAL_HANDLE handle, int32_t* state, uint64_t* packets,
                                                 uint64_t* skipped);

/**
 * Makes a pcapng file of a capture file, for other tools to read: the packets with their times, FCS included, under
 * link type 147. docs/traffic.md describes it.
 *
 * @param      capture  written by KRAL_StartCapture
 * @param      pcapng   the new file; what was there stays until it is whole
 * @param[out] packets  packets in it; may be null
 * @param[out] cut      1 when the capture file is cut or damaged: what is in front is in the new file; may be null
 * @return 1; 0 when one of the files cannot be read or written, and when the first is no capture file
 *
 * Wait: the reading and writing of the files.
 */
KRAL_API uint8_t KRAL_CALL KRAL_ExportCapture(const char* capture, const char* pcapng, uint64_t* packets,
                                              uint32_t* cut);

/**
 * Makes a capture file of a pcapng file: one of KRAL_ExportCapture, also when other tools have taken packets out of it,
 * or a trace. What is no packet that a handset sends unasked is left out. An exported and imported capture is the same.
 *
 * @param      pcapng   little-endian
 * @param      capture  the new file; what was there stays until it is whole
 * @param[out] packets  packets in it; may be null
 * @param[out] skipped  packets that were left out; may be null
 * @param[out] cut      1 when the pcapng file is cut or damaged: what is in front is in the new file; may be null
 * @return 1; 0 when one of the files cannot be read or written, and when the first is no pcapng file
 *
 * Wait: the reading and writing of the files.
 */
KRAL_API uint8_t KRAL_CALL KRAL_ImportCapture(const char* pcapng, const char* capture, uint64_t* packets,
                                              uint64_t* skipped, uint32_t* cut);

/* --- Traces (additions) ------------------------------------------------------------------------------------------- */

/**
 * Writes every frame of the connection to a pcapng file from now on, sent and received, requests, answers and what
 * comes unasked, with its time, direction and port; bytes that are no frame as well, and marked as such. It goes on
 * while the port is closed and opened again. The disk never holds up the connection, and what it is too slow for is
 * counted. docs/traffic.md describes the file and what reads it.
 *
 * @param handle     from a connect function
 * @param file_name  an ordinary file, emptied first
 * @return 1; 0 when the file cannot be written, and, with no file touched, while another trace of the handle runs or
 *         has not written its rest, while another trace or capture writes the file, and through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_StartTrace(KRAL_HANDLE handle, const char* file_name);

/**
 * Ends the trace and closes its file, or throws away what KRAL_KeepTrace keeps. While the disk is too slow for the rest
 * (pending of the counters is not 0) another call waits for it again. The disconnect that releases the handle ends a
 * trace as well.
 *
 * @return 1 when everything that passed is in the file; 0 when some was lost, when the rest has not been written in
 *         time, and when no trace runs
 *
 * Wait: until the rest is written, at most 1,000 ms; longer after another thread's call that starts or ends a trace.
 */
KRAL_API uint8_t KRAL_CALL KRAL_StopTrace(KRAL_HANDLE handle);

/**
 * Keeps the latest traffic in memory, for KRAL_SaveTrace: no file is written unless something has gone wrong.
 *
 * @param handle  from a connect function
 * @param bytes   of traffic at most, at some 20 more for each read and write; it begins anew when it is called again
 * @return 1; 0 while a trace is written, and through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_KeepTrace(KRAL_HANDLE handle, uint32_t bytes);

/**
 * Writes what is kept, as KRAL_StartTrace would have. It goes on being kept.
 *
 * @param handle     from a connect function
 * @param file_name  an ordinary file, emptied first
 * @return 1; 0 when the file cannot be written, and when nothing is being kept
 *
 * Wait: the writing of the file.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SaveTrace(KRAL_HANDLE handle, const char* file_name);

/** What became of the traces of a handle, those of KRAL_SaveTrace not included. */
typedef struct KRAL_TRACE_COUNTERS {
  uint64_t frames; /**< written to files, bad ones included */
  uint64_t bad;    /**< of these; whose FCS does not fit */
  uint64_t others; /**< runs of bytes that are no frame, written to files */
  uint64_t lost;   /**< frames, and reads and writes without frames, that a full or slow disk, or no memory, has cost */
  uint64_t lost_bytes; /**< of those that the disk was too slow for */
  uint64_t pending;    /**< reads and writes that are taken for a file and not in it yet */
} KRAL_TRACE_COUNTERS;

/**
 * Reads the counters of traces.
 *
 * @param      handle    from a connect function
 * @param[out] counters  each is exact; what passes meanwhile may be in one of them and not yet in another
 * @return 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetTraceCounters(KRAL_HANDLE handle, KRAL_TRACE_COUNTERS* counters);

#ifdef __cplusplus
}
#endif

#endif
