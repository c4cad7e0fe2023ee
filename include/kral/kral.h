/**
 * @file kral.h
 * The whole C interface of kral, the manufacturing and test support library for mobile handsets.
 *
 * Rules that hold for every function unless its own text says otherwise:
 *
 * - The handle comes first. It is what a connect function returned; 0 is never valid. With an unknown or released
 *   handle a function returns 0, causes no traffic and leaves the outputs untouched. A value that was released may come
 *   back from a later connect; programs forget it with the release.
 * - Results are uint8_t: 1 for success, 0 for failure. KRAL_GetLastError (error.h) says why a call failed, and so does
 *   the text log of the handset (text_log.h). A status that the handset itself reports comes back through an output
 *   argument. Where 0 or 1 means something else:
 *     - KRAL_NV_ functions (nv_tool.h) return an error code, 0 for success.
 *     - A caller's send and receive functions (connection.h) return 0 for success; the result of the flush function is
 *       ignored. KRAL_PKV_CALLBACK returns 1 to go on and 0 to stop. All other callbacks return nothing.
 *     - KRAL_SetStartFlag returns the former value of the setting, not whether the call worked.
 *     - A result that is an answer, as of KRAL_IsLoggingStarted or KRAL_IsPhoneConnected, is 1 for yes and 0 for no.
 *     - Connect functions return the handle, 0 for failure; KRAL_GetTimeOut, counts and the band functions a value.
 * - Outputs are written on success only. The caller owns all buffers; sizes are in bytes. [N] in front of a parameter's
 *   text is how many elements its buffer has. Narrow integers are passed and returned zero-extended.
 * - Values that carry a caller's pointer are uintptr_t. Multi-byte fields of handset records are little-endian.
 * - Calls that send a request may block for the time-out they name (KRAL_ConfigureTimeOut). A request that gets no
 *   answer closes the port, and so does the handset's going away; the next request on the handle opens it again, with
 *   the functions of the last connect where it gave any, and without a handshake.
 * - Any thread may call with any handle, connect and disconnect; requests of one handle are carried out one after the
 *   other. Text-log, queue, time-out and abort calls never wait for a running request. Callbacks come on the library's
 *   own threads and must not call functions that send requests.
 * - Names are UTF-8 on every system: those of files on the PC and those on the handset, which go over the wire as they
 *   are. On Windows a PC name that is no UTF-8 is taken to be in the ANSI code page. Paths may be longer than 260
 *   characters there.
 * - A program disconnects before it unloads the library. Otherwise the connections stay open: the library stays in
 *   memory, goes on receiving, and calls the callbacks, whose code must stay too. Loaded again it is the same, with the
 *   same handles. (On Linux it stays in memory in any case, until the process ends. On Windows each load and free
 *   leaves two handles of the thread library that is linked in, and where there was a connection up to five, and some
 *   25 KiB of memory.)
 * - KRAL_DisconnectServer is not called from a DllMain, nor are connects: no thread starts or ends meanwhile. Such a
 *   disconnect waits for each thread of the connection (1,000 ms), leaves it to end on its own, and the library stays
 *   in memory.
 * - No C++ exception leaves a function. One that leaves a callback ends there: the operation goes on, or is stopped
 *   where the callback's result would have decided. (That of another language is not caught, and ends the process: it
 *   must not leave a callback.) On Linux a host may end a thread inside a callback (pthread_exit),
 *   as interpreters do that are going down. The library's threads run none of the host's signal handlers.
 * - Functions are __cdecl on Windows, with undecorated names.
 */
#ifndef KRAL_KRAL_H
#define KRAL_KRAL_H

/** The version of these headers. That of the library in use may differ: KRAL_GetLibraryVersionNumber. */
#define KRAL_VERSION_MAJOR 6
#define KRAL_VERSION_MINOR 0
#define KRAL_VERSION_PATCH 29

/** The version as one number: later versions have larger ones. */
#define KRAL_VERSION_NUMBER (KRAL_VERSION_MAJOR * 65536u + KRAL_VERSION_MINOR * 256u + KRAL_VERSION_PATCH)

#include "kral/types.h"

#include "kral/band.h"
#include "kral/cmd.h"
#include "kral/connection.h"
#include "kral/diag.h"
#include "kral/download.h"
#include "kral/efs.h"
#include "kral/error.h"
#include "kral/ftm.h"
#include "kral/kivrat.h"
#include "kral/log.h"
#include "kral/nv.h"
#include "kral/nv_tool.h"
#include "kral/pkv.h"
#include "kral/text_log.h"
#include "kral/transport.h"
#include "kral/ventrims.h"

#endif
