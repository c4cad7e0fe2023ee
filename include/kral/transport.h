/**
 * @file transport.h
 * Requests of the caller's own making, packet modes, and the lines of the port.
 *
 * Beside the rules of kral.h:
 *
 * - A request is framed by the library: flag bytes, escapes and FCS are not part of what is given here.
 * - A closed port is opened again by the three send functions and by a packet mode that the handset must agree to.
 *   KRAL_FlushRxBuffer, KRAL_SetDTR_State and KRAL_SetRTS_State return 0 while the port is closed; what only sets
 *   something works then as well.
 * - Time-out 7 bounds the writing of a whole request to a port; a caller's send function takes its own time.
 * - One request of a handle is on its way at a time: a call waits until one of another thread has ended.
 */
#ifndef KRAL_TRANSPORT_H
#define KRAL_TRANSPORT_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** Bytes of the longest request, without flags, escapes and FCS. */
#define KRAL_LONGEST_REQUEST 16381

/* --- Requests ----------------------------------------------------------------------------------------------------- */

/**
 * Sends a request and awaits the reply that begins with the request's first byte.
 *
 * Earlier replies are discarded. The first reply decides: one with another first byte (a refusal, for
 * example) fails the call at once, and is still returned in `response`, so that its reason can be read.
 *
 * @param         handle         from a connect function
 * @param         request_size   1 to 16,381 bytes
 * @param         request        [request_size] command code first
 * @param[in,out] response_size  in: bytes of room; out: bytes of the reply without its two FCS bytes, at most the room
 * @param[out]    response       [response_size] the reply, cut at the room; where there is room its FCS bytes follow.
 * Written, as the size is, whenever a reply came; untouched when none did
 * @param         time_out_ms    for the reply, after the request has been written
 * @return 1 when the reply came; 0 also after the time-out, which closes the port
 *
 * Wait: the time-out, and time-out 7 for the writing.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SendSync(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                         uint16_t* response_size, uint8_t* response, uint32_t time_out_ms);

/**
 * Sends a request and awaits nothing. What the handset answers stays in the response queue until the next request.
 *
 * @param handle        from a connect function
 * @param request_size  1 to 16,381 bytes
 * @param request       [request_size] command code first
 * @param time_out_ms   only shown in the text log
 * @param start_flag    1: a flag byte goes before the frame, whatever KRAL_SetStartFlag says
 * @return 1 when the request was written; always 0 through a phone server
 *
 * Wait: time-out 7.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SendASync(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                          uint32_t time_out_ms, uint8_t start_flag);

/**
 * Sends bytes as the packet mode has it and takes whatever packet comes next.
 *
 * In packet modes 1 and 2 a request that begins with "AT" lets the reply end with "OK" or "ERROR" instead of with the
 * bytes that were read at once.
 *
 * @param         handle         from a connect function
 * @param         request_size   1 to 16,381 bytes
 * @param         request        [request_size] framed in packet mode 0, written as it is in the others
 * @param[in,out] response_size  in: bytes of room; out: bytes of the packet, FCS included where it has one, at most
 *                               the room; untouched when nothing came
 * @param[out]    response       [response_size] the packet, cut at the room
 * @param         time_out_ms    for the packet; a time-out leaves the port open
 * @return 1 when a packet came. Through a phone server always 1, although nothing is sent
 *
 * Wait: the time-out, and time-out 7 for the writing.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SendRAW(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                        uint16_t* response_size, uint8_t* response, uint32_t time_out_ms);

/* --- Packets ------------------------------------------------------------------------------------------------------ */

/**
 * Lets every frame begin with a flag byte, or not (the default).
 *
 * @param handle      from a connect function
 * @param start_flag  1: on; 0: off
 * @return [answer] whether the setting was on before the call, not whether the call worked: 0 for the first call on a
 *         connection. Always 0 through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetStartFlag(KRAL_HANDLE handle, uint8_t start_flag);

/** Packet modes. */
#define KRAL_PACKET_MODE_FRAMED 0     /* frames with flags, escapes and FCS */
#define KRAL_PACKET_MODE_UNFRAMED 1   /* what is read at once is one packet */
#define KRAL_PACKET_MODE_UNFRAMED_2 2 /* the same */
#define KRAL_PACKET_MODE_LENGTH 3     /* each packet begins with its length, big-endian in bytes 1 and 2 */

/**
 * Chooses how the packets on the port are separated.
 *
 * Going from 0 to 1 asks the handset (command 68) and needs its consent; going from 1 to 0 brings its port back into
 * diagnostic mode with an AT command. Every other change is made at once and the handset is not asked.
 *
 * @param handle  from a connect function
 * @param mode    KRAL_PACKET_MODE_...
 * @return 1 when the mode is set; always 0 through a phone server
 *
 * Wait: 80 ms from 0 to 1, about 500 ms from 1 to 0.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetPacketMode(KRAL_HANDLE handle, uint32_t mode);

/**
 * Discards the bytes that wait in the port, and the packet of which only a part has been read.
 *
 * @return 1, or 0 while the port is closed
 */
KRAL_API uint8_t KRAL_CALL KRAL_FlushRxBuffer(KRAL_HANDLE handle);

/**
 * Called for every packet of 2 to 4,096 bytes as it was de-framed, FCS bytes included, before it is put into a queue.
 *
 * Comes on a thread of the library and must not call functions that send requests. The bytes are valid during the
 * call only. Everything that is received waits while it runs, the answers to requests of other threads as well: one
 * that takes long makes them run into their time-outs.
 *
 * @param length  bytes of the packet
 * @param bytes   [length] the packet
 * @param value   as given to KRAL_ConfigureCallBacks
 */
typedef void(KRAL_CALL* KRAL_RAW_PACKET_CALLBACK)(uint32_t length, const uint8_t* bytes, uintptr_t value);

/**
 * Sets the function that sees every packet.
 *
 * @param handle    from a connect function
 * @param callback  replaces the former one; null: none. A call to the former one that is under way still ends
 * @param value     handed to the callback
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigureCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK callback,
                                                   uintptr_t value);

/**
 * Chooses whether a request that follows one without an answer is preceded by a loopback (an addition to the protocol's
 * own exchange, one more request on the wire).
 *
 * A handset answers in order, and may answer late: after the time-out. Replies that repeat their request (NV items,
 * memory, subsystem requests) are compared with it, factory test commands up to their command id, and a late one is
 * passed over. Others repeat nothing (switches, error log, KRAL_SendSync): there a late reply would be taken for the
 * next request's. With this on the library sends a loopback with a number of its own first, and passes over everything
 * in front of its echo. When the echo does not come within the time-out of the request, that counts as not answered and
 * is not sent. An answer to KRAL_SendASync, or to KRAL_SendRAW after its time-out, counts as late, too. KRAL_SendRAW
 * itself and the download functions send no loopback.
 *
 * Off by default; always on in backups, restores, comparisons and the NV tool.
 *
 * @param handle  from a connect function
 * @param on      1: on; other values: off
 * @return 1, or 0 for an unknown handle
 *
 * Wait: none. Any thread.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetResynchronise(KRAL_HANDLE handle, uint8_t on);

/* --- Functions of the caller -------------------------------------------------------------------------------------- */
/* What these two say is forgotten when the handle is connected through other functions. */

/**
 * Tells that a caller's transport has bytes: the receive function is called at once. For receive mode 1; in mode 0 it
 * is called every millisecond anyway.
 *
 * From the first call on, the library relies on it: an idle connection does not call the receive function any more.
 * While a request awaits its answer it is called every 20 ms all the same. Calls that come faster than bytes can be
 * taken count as one, and those from inside the receive function count as none: after it has brought bytes it is
 * called again anyway.
 *
 * @param handle  from KRAL_ConnectServer_UserDefinedTransport
 * @return 1; 0 on a COM port, through a phone server, and for an unknown handle, such as one already disconnected
 *
 * Wait: none. Any thread, also inside the three functions. Writes no line into the text log.
 */
KRAL_API uint8_t KRAL_CALL KRAL_NotifyReceived(KRAL_HANDLE handle);

/** Milliseconds that a receive function may wait: a disconnect waits for it, and gives up after 1,000. */
#define KRAL_LONGEST_RECEIVE_WAIT 500

/**
 * Says that the receive function of a caller's transport waits for bytes itself, so that it can be called again at
 * once. For receive mode 1. One that comes back at once with nothing is called every millisecond even so; one that
 * waits longer than it should delays a disconnect, which goes on without it after 1,000 ms.
 *
 * @param handle        from a connect function
 * @param milliseconds  the longest that the function waits, at most KRAL_LONGEST_RECEIVE_WAIT; 0: it does not wait (the
 *                      default)
 * @return 1, or 0 for more and through a phone server
 *
 * Wait: none. Any thread.
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetReceiveWait(KRAL_HANDLE handle, uint32_t milliseconds);

/* --- The port ----------------------------------------------------------------------------------------------------- */

/**
 * Raises or clears the DTR line.
 *
 * @param handle  from a connect function
 * @param state   0: clear; other values: raise
 * @return 1 while the port is open, even when the line could not be changed; 0 through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetDTR_State(KRAL_HANDLE handle, uint8_t state);

/**
 * Raises or clears the RTS line.
 *
 * @param handle  from a connect function
 * @param state   0: clear; other values: raise
 * @return 1 while a COM port is open, even when the line could not be changed; 0 on a caller's transport and through
 *         a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetRTS_State(KRAL_HANDLE handle, uint8_t state);

/**
 * Limits how many bytes are written to the port's driver at a time (4,099 by default).
 *
 * @param handle  from a connect function
 * @param bytes   at least 1
 * @return 1, or 0 for a limit of 0 and through a phone server
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetSendDataSerialWriteSizeLimit(KRAL_HANDLE handle, uint32_t bytes);

#ifdef __cplusplus
}
#endif

#endif
