/**
 * @file connection.h
 * Library settings, port lists, connecting to a handset and letting go of it, liveness, time-outs.
 *
 * Beside the rules of kral.h:
 *
 * - A connect takes one of 50 contexts, one per port. A second connect to the same port returns the same handle and
 *   counts: the context and its connection live until every connect has been released.
 * - Any thread may connect and disconnect, several at the same time as well. A disconnect waits until a request that
 *   another thread is running on the handset has ended. KRAL_GetAvailablePhonesPortList and a connect to KRAL_PORT_ANY
 *   close every connection of the process, those of other threads too; a handset that another thread connects meanwhile
 *   may find its port closed again, and opens it with its next request.
 * - A port that is opened again, after a time-out or a lost cable, is the one that the connect opened. On Linux a
 *   number has a row of names (variable, link, tty of the system): it is opened by the name that it had, wherever that
 *   leads by then, or by one in front of it. Where only names behind it are left, the port is gone. On Windows the
 *   number is the name. A connect chooses anew.
 * - Release every handle before the library is unloaded.
 */
#ifndef KRAL_CONNECTION_H
#define KRAL_CONNECTION_H

#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** A connect to this port picks the first port on which a handset answers, and closes every open connection first. */
#define KRAL_PORT_ANY 65535u
/** A connect to this port moves no bytes: it always counts as connected, and every request fails. */
#define KRAL_PORT_NULL 65534u

/* --- Library-wide settings ---------------------------------------------------------------------------------------- */

/** Library modes. */
#define KRAL_LIBRARY_MODE_DIRECT 0 /* the library drives the port itself */
#define KRAL_LIBRARY_MODE_SERVER 1 /* through the phone server */

/**
 * Chooses how handsets are reached by the connections made afterwards.
 *
 * @param mode  KRAL_LIBRARY_MODE_SERVER; any other value is KRAL_LIBRARY_MODE_DIRECT (the default)
 */
KRAL_API void KRAL_CALL KRAL_SetLibraryMode(uint8_t mode);

/** Target types: where the diagnostic service of a handset runs. */
#define KRAL_TARGET_MODEM 0       /* on the modem chip */
#define KRAL_TARGET_APPLICATION 1 /* on an application processor */

/**
 * Chooses where the diagnostic service runs on the handsets connected afterwards.
 *
 * @param type  KRAL_TARGET_MODEM (the default) or KRAL_TARGET_APPLICATION; other values are ignored
 */
KRAL_API void KRAL_CALL KRAL_SetTargetType(uint8_t type);

/** Bytes that hold the text of KRAL_GetLibraryVersion. */
#define KRAL_LIBRARY_VERSION_SIZE 32

/**
 * Returns the version, such as "KRAL V6.0.29,VENTRIMS" (direct mode) or "KRAL V6.0.29,ORBT" (server mode).
 *
 * @param[out] text  [KRAL_LIBRARY_VERSION_SIZE] terminated; that the buffer can hold it is not tested
 */
KRAL_API void KRAL_CALL KRAL_GetLibraryVersion(char* text);

/**
 * Returns the version of the library in use as a number, to compare with KRAL_VERSION_NUMBER.
 * An addition to the given interface.
 *
 * @return major * 65536 + minor * 256 + patch
 */
KRAL_API uint32_t KRAL_CALL KRAL_GetLibraryVersionNumber(void);

/** Receive modes: how the receive thread of a connection waits for bytes. */
#define KRAL_RECEIVE_MODE_POLL 0 /* sleeps 1 ms between reads, which costs each request about that much */
#define KRAL_RECEIVE_MODE_WAKE 1 /* waits in the port; a thread that awaits a reply may do so in its place */

/**
 * Chooses how the receive threads of the connections made afterwards wait for bytes.
 * An addition to the given interface.
 *
 * @param mode  as for KRAL_SetReceiveMode; other values are refused
 * @return 1, or 0 for an unknown mode
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetDefaultReceiveMode(uint8_t mode);

/* --- Ports -------------------------------------------------------------------------------------------------------- */

/**
 * Lists the serial ports of the machine without opening any; in server mode, those that the phone server knows.
 *
 * @param[in,out] count  in: entries of `ports`; out: entries written, also on failure
 * @param[out]    ports  [count] COM numbers, in the system's order
 * @return 1 on success; 0 when the ports cannot be listed, and in server mode also when there are none
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetAllPortList(uint16_t* count, uint16_t* ports);

/**
 * Lists the ports on which a handset answers.
 *
 * In direct mode every open connection of the process is closed first and all handles become invalid, because each
 * port is opened exclusively and asked. In server mode the server's list is given as it is.
 *
 * @param[in,out] count         in: entries of `ports`; out: entries written
 * @param[out]    ports         [count] COM numbers, in the system's order
 * @param         ignore_count  entries of `ignore_list`
 * @param         ignore_list   [ignore_count] ports that are not to be touched; not consulted in server mode
 * @return 1 when the ports could be listed, even if no handset answered; in server mode 0 when there are none
 *
 * Wait: twice time-out 1 (80 ms) for each port that opens.
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetAvailablePhonesPortList(uint16_t* count, uint16_t* ports, uint16_t ignore_count,
                                                           const uint16_t* ignore_list);

/**
 * Lets KRAL_ConnectServer_LogicalPort find `physical` under the number `logical`. Of several entries for one logical
 * port the oldest counts.
 *
 * @return always 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_AddPortAliasEntry(uint16_t logical, uint16_t physical);

/**
 * Forgets all port aliases.
 *
 * @return always 1
 */
KRAL_API uint8_t KRAL_CALL KRAL_ClearPortAliasList(void);

/**
 * Gives the port of a handle.
 *
 * @param      handle  from a connect function
 * @param[out] port    the COM number
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetComPortNumber(KRAL_HANDLE handle, uint16_t* port);

/* --- Connecting --------------------------------------------------------------------------------------------------- */

/**
 * Connects to the handset on a port.
 *
 * The handle is returned whether or not the port could be opened: ask KRAL_IsPhoneConnected.
 *
 * @param port  COM number (the low 16 bits count), KRAL_PORT_ANY or KRAL_PORT_NULL
 * @return the handle; 0 when all 50 contexts are taken, or when KRAL_PORT_ANY finds no handset
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServer(uint32_t port);

/** As KRAL_ConnectServer, and writes a loopback frame twice when the port has been opened. */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithHandShake(uint32_t port);

/**
 * As KRAL_ConnectServer, but returns 0 when the port cannot be opened. The context then stays taken (its handle is
 * found with another connect to the port) until KRAL_DisconnectAllServers.
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithVerify(uint32_t port);

/**
 * As KRAL_ConnectServer, on the physical port that KRAL_AddPortAliasEntry has entered.
 *
 * @param logical_port  the low 16 bits count
 * @return the handle; 0 also when there is no alias of that number
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_LogicalPort(uint32_t logical_port);

/**
 * Connects again and again until the handset answers. Each attempt counts as a connect of its own, and a failure
 * releases one of them.
 *
 * @param port     as for KRAL_ConnectServer
 * @param wait_ms  no further attempt begins after this time; 0: exactly one attempt. The end is reckoned in the 32-bit
 *                 tick count of the machine, so a time that reaches beyond its wrap, as 0xFFFFFFFF does, ends at once
 * @return the handle; 0 when no handset answered in time
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithWait(uint32_t port, uint32_t wait_ms);

/**
 * Functions of a caller-supplied transport. Each is given the caller's two values first and returns 0 for success.
 *
 * The send function runs on the thread that makes a request. The receive function runs on the receive thread of the
 * connection, and on the calling thread while that one is paused or stopped: in KRAL_SetPacketMode from 1 to 0 and in
 * the boot transfer (kivrat.h). The flush function runs on the calling thread, in KRAL_FlushRxBuffer and in the same
 * two. Send or flush and the receive function may run at the same time; none runs twice at a time.
 */
/** Writes bytes. @param data  [count] them @param[in,out] written  preset to `count`; out: how many were written */
typedef uint32_t(KRAL_CALL* KRAL_SEND_FUNCTION)(uintptr_t context, uintptr_t transport, uint32_t count,
                                                const uint8_t* data, uint32_t* written);
/** Reads what is there, and waits no longer than KRAL_SetReceiveWait was told. @param[in,out] count  in: room; out:
 * bytes @param[out] buffer  [count] them */
typedef uint32_t(KRAL_CALL* KRAL_RECEIVE_FUNCTION)(uintptr_t context, uintptr_t transport, uint32_t* count,
                                                   uint8_t* buffer);
/** Forgets what has been received; its result is ignored. */
typedef uint32_t(KRAL_CALL* KRAL_FLUSH_FUNCTION)(uintptr_t context, uintptr_t transport);

/**
 * Connects to a handset through three functions of the caller instead of a COM port. Sets direct mode, as
 * KRAL_SetLibraryMode(KRAL_LIBRARY_MODE_DIRECT) does. The functions must stay callable until the handle is released.
 *
 * @param port       number of the context; KRAL_PORT_NULL is the null port even here
 * @param transport  the caller's handle of the transport, the second argument of each function
 * @param context    another value of the caller, the first argument of each function
 * @param send  null: the COM port of that number is opened, as KRAL_ConnectServer does
 * @param receive, flush  both are needed beside a send function for the connection to open
 * @return the handle; 0 when all 50 contexts are taken
 */
KRAL_API KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_UserDefinedTransport(uint32_t port, uintptr_t transport,
                                                                       uintptr_t context, KRAL_SEND_FUNCTION send,
                                                                       KRAL_RECEIVE_FUNCTION receive,
                                                                       KRAL_FLUSH_FUNCTION flush);

/**
 * Closes the port and the text log, and releases one connect. While other connects of the port remain, the handle
 * stays valid and the next request opens the port again.
 */
KRAL_API void KRAL_CALL KRAL_DisconnectServer(KRAL_HANDLE handle);

/** Releases every handle of the process, however often it was connected. */
KRAL_API void KRAL_CALL KRAL_DisconnectAllServers(void);

/** Ends the process of the phone server, if it runs on this machine. */
KRAL_API void KRAL_CALL KRAL_TerminateORBTServer(void);

/**
 * Asks whether the handset answers: opens a closed port, sends a loopback and a version request (target type 1: asks
 * for the diagnostic service). @return [answer] 1 when it does; always 1 on the null port
 *
 * Wait: twice time-out 1 (80 ms).
 */
KRAL_API uint8_t KRAL_CALL KRAL_IsPhoneConnected(KRAL_HANDLE handle);

/** States of a port, as KRAL_GetPortState reports them. */
#define KRAL_PORT_OPEN 0          /* open */
#define KRAL_PORT_CLOSED 1        /* closed, and nothing stood in the way when it was last opened */
#define KRAL_PORT_NOT_FOUND 2     /* could not be opened: there is no such port */
#define KRAL_PORT_BUSY 3          /* could not be opened: another program holds it */
#define KRAL_PORT_NOT_PERMITTED 4 /* could not be opened: not allowed to this user */
#define KRAL_PORT_FAILED 5        /* could not be opened for another reason; the text log says which */
#define KRAL_PORT_GONE 6          /* vanished while it was open, and has not been there since */

/**
 * Tells whether the port of a handset is open, and if not why. Opens nothing and sends nothing. A connection through
 * the phone server or through functions of the caller knows KRAL_PORT_OPEN and KRAL_PORT_CLOSED only.
 * An addition to the given interface.
 *
 * @param      handle  from a connect function
 * @param[out] state   one of the states above
 * @return 1, or 0 for an unknown handle
 *
 * Wait: for a request that another thread is running on the handset.
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetPortState(KRAL_HANDLE handle, int32_t* state);

/** Who answers on a port, as KRAL_GetPortInfo finds out. */
#define KRAL_ANSWERS_NOT_ASKED 0        /* not asked, or the port could not be opened */
#define KRAL_ANSWERS_NOTHING 1          /* nothing came */
#define KRAL_ANSWERS_DIAGNOSTICS 2      /* the software of a handset, which may answer late */
#define KRAL_ANSWERS_LOADER 3           /* the loader, which takes a flash programmer */
#define KRAL_ANSWERS_FLASH_PROGRAMMER 4 /* a flash programmer, which writes images */
#define KRAL_ANSWERS_BOOT_LOADER 5      /* the primary boot loader, in its hello */

/** What is known of a port: 596 bytes without padding, the same on all platforms. Texts are UTF-8 and terminated. */
typedef struct KRAL_PORT_INFO {
  uint32_t state;         /**< one of KRAL_PORT_: closed when it may be opened, open when this process has it */
  uint32_t answers;       /**< one of KRAL_ANSWERS_ */
  uint32_t process;       /**< which process has it open, where the system tells; 0 when not known */
  uint16_t vendor;        /**< of a USB device, otherwise 0 */
  uint16_t product;       /**< of a USB device, otherwise 0 */
  uint32_t usb_interface; /**< of a USB device: tells its ports apart */
  char device[256];       /**< what is opened: "/dev/ttyUSB0", "\\\\.\\COM7" */
  char description[128];  /**< what it calls itself; may be empty */
  char usb_path[64]; /**< the socket that it is plugged into, such as "1-4.2": stays the same for whatever is there */
  char serial[64];   /**< serial number of the USB device; may be empty */
  char process_name[64]; /**< of that process; may be empty */
} KRAL_PORT_INFO;

/**
 * Tells what is known of a port, and who answers on it. For a port that does not exist, is in use or is not permitted
 * the state says so. Without `ask` nothing is opened, and a program that holds the port is found as far as the system
 * tells: on Linux users of this library always, other programs where this user may look into them; on Windows none.
 *
 * With `ask` a port that is free is opened and asked; one that this process has connected is asked on that connection.
 * Where a job works on it, or a request takes longer than 300 ms, nobody is asked: the port is KRAL_PORT_OPEN. So is
 * one whose device this process has open under another number.
 * A boot loader says its hello once, and loses it by this: power the handset off and on then. An addition to the given
 * interface.
 *
 * @param      port  COM number
 * @param      ask   1: find out who answers; other values: open nothing
 * @param[out] info  the record
 * @return 1 on success; 0 in server mode and for KRAL_PORT_ANY and KRAL_PORT_NULL
 *
 * Wait: with `ask` 50 ms, and up to 1,700 ms where nothing answers.
 */
KRAL_API uint8_t KRAL_CALL KRAL_GetPortInfo(uint16_t port, uint8_t ask, KRAL_PORT_INFO* info);

/* --- Settings of a handset ---------------------------------------------------------------------------------------- */

/** Time-outs that have a name. */
#define KRAL_TIME_OUT_COMMAND 0         /* answers to commands: "time-out 0" in these headers */
#define KRAL_TIME_OUT_LIVENESS 1        /* answers to the requests of KRAL_IsPhoneConnected */
#define KRAL_TIME_OUT_SERVER_CONNECT 2  /* server mode: the server connects the port */
#define KRAL_TIME_OUT_NV_BACKUP 5       /* KRAL_DIAG_NV_CNV_DIAG_BACKUP_F */
#define KRAL_TIME_OUT_PORT_WRITE 7      /* direct mode: writing to the port */
#define KRAL_TIME_OUT_PORT_READ 8       /* direct mode: reads of the receive thread */
#define KRAL_TIME_OUT_AFTER_FTM 11      /* delay after a switch to FTM mode */
#define KRAL_TIME_OUT_AFTER_ONLINE 12   /* delay after a switch to online mode */
#define KRAL_TIME_OUT_AFTER_OFFLINE 13  /* delay after a switch to an offline mode */
#define KRAL_TIME_OUT_GSM_RF_MODE 14    /* delay after a GSM RF mode is set */
#define KRAL_TIME_OUT_MODE_READ_BACK 18 /* reading the mode back */
#define KRAL_TIME_OUT_DOWNLOAD 20       /* server mode: software download */

/**
 * Sets a time-out. Never waits for a running request.
 *
 * | id | default | used for                                             |
 * |----|---------|------------------------------------------------------|
 * |  0 |    4000 | answers to commands                                  |
 * |  1 |      80 | answers to the requests of KRAL_IsPhoneConnected     |
 * |  2 |     200 | server mode: the server connects the port            |
 * |  7 |     900 | direct mode: writing to the port                     |
 * |  8 |     900 | direct mode: reads of the receive thread             |
 * | 11 |     150 | delay after a switch to FTM mode                     |
 * | 12 |     140 | delay after a switch to online mode                  |
 * | 13 |    3000 | delay after a switch to an offline mode              |
 * | 18 |     500 | reading the mode back                                |
 * | 20 |         | server mode: software download                       |
 *
 * The others up to 19 belong to the families that read them: 3: 3000; 4: 6000; 5, 6, 10, 19: 10000; 9: 3000;
 * 14, 15: 100; 16: 5000; 17: 2000. The word ConnectDelay and a number on a line of the file WLANEVKConfig.txt in the
 * current directory set 1 and 2 for every handset connected afterwards.
 *
 * @param handle        from a connect function
 * @param id            KRAL_TIME_OUT_..., or another of 0 to 20
 * @param milliseconds  the new value
 * @return 1 on success; 0 for another id, for 20 in direct mode, and for 7 and 8 in server mode (which store the
 *         value all the same)
 */
KRAL_API uint8_t KRAL_CALL KRAL_ConfigureTimeOut(KRAL_HANDLE handle, uint32_t id, int32_t milliseconds);

/**
 * Returns a time-out in milliseconds. Never waits for a running request.
 *
 * @return the value; 0 for an unknown handle or id
 */
KRAL_API int32_t KRAL_CALL KRAL_GetTimeOut(KRAL_HANDLE handle, uint32_t id);

/**
 * Chooses how the receive thread waits for bytes. Takes effect at once; never waits for a running request.
 * An addition to the given interface.
 *
 * @param handle  from a connect function
 * @param mode    KRAL_RECEIVE_MODE_POLL (the default) or KRAL_RECEIVE_MODE_WAKE (with a caller's transport: sleeps
 *                1 ms only when nothing came, and not at all with KRAL_NotifyReceived or KRAL_SetReceiveWait)
 * @return 1 on success; 0 for another mode and in server mode
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetReceiveMode(KRAL_HANDLE handle, uint8_t mode);

/**
 * Keeps whether a modem port may be searched for the switch from AT commands to diagnostic mode. Turned off by a
 * connect through functions of the caller.
 *
 * @param handle  from a connect function
 * @param search  1: on (the default); other values: off
 * @return 1, or 0 for an unknown handle
 */
KRAL_API uint8_t KRAL_CALL KRAL_SetData2DiagSearch(KRAL_HANDLE handle, uint8_t search);

#ifdef __cplusplus
}
#endif

#endif
