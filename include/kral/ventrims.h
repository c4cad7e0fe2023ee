/**
 * @file ventrims.h
 * Jobs: the same work for many handsets at once, as a fixture with many sockets needs it. "Flash, restart, restore,
 * verify" is one job with one verdict for each handset.
 *
 * The way of a job: create it, add steps and handsets, start it, look at it now and then (or have a callback called),
 * take the result of each handset, free it. docs/station.md shows a whole station.
 *
 * Beside the rules of kral.h:
 *
 * - A job has a handle of its own, which stands where other functions have the handset's. KRAL_GetLastError takes it,
 *   too. Handsets of a job are counted from 0 in the order in which they were added.
 * - Steps run in the order in which they were added, on every handset alike. A job is set up, started once, and then
 *   not changed any more. What fails before it runs says why and leaves the job as it was, to be mended.
 * - Every file is opened, checked and decoded once, when the job is started, and shared by all handsets. It must not
 *   change before the job has ended.
 * - Direct mode only.
 * - All records begin with their size, which the caller fills in; so much of them is read or written. Later versions
 *   may append to them.
 * - Nothing waits but KRAL_VENTRIMS_Start (for files and ports), KRAL_VENTRIMS_Wait and KRAL_VENTRIMS_Free.
 */
#ifndef KRAL_VENTRIMS_H
#define KRAL_VENTRIMS_H

#include "kral/error.h"
#include "kral/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/** A job; 0 is never valid, and no value is that of a handset. */
typedef uint32_t KRAL_VENTRIMS_JOB;

/** @name Creating a job */
/**@{*/

/** Makes a job without steps and handsets. Gives 0 when there is no memory. */
KRAL_API KRAL_VENTRIMS_JOB KRAL_CALL KRAL_VENTRIMS_Create(void);

/**
 * Frees a job. One that runs is aborted first: the handsets end as with KRAL_VENTRIMS_Abort. The ports that the job has
 * opened are closed. Not to be called from the job's callback, where it is refused.
 *
 * Wait: for the threads of the job, as long as an abort takes; at most 15 s. A thread that a callback holds up longer
 * ends on its own.
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_Free(KRAL_VENTRIMS_JOB job);

/**
 * Before the first step of the download the handsets are in diagnostics: each is sent into its loader
 * (KRAL_DIAG_DLOAD_F) before the flash programmer. Without this they must be in the loader, or boot loader, when the
 * job starts.
 */
#define KRAL_VENTRIMS_ENTER_LOADER 1u
/** After the last step of the download each handset is restarted, and awaited until it answers in diagnostics. */
#define KRAL_VENTRIMS_RESET 2u

/** How a job does its work. */
typedef struct KRAL_VENTRIMS_OPTIONS {
  uint32_t size;       /**< sizeof(KRAL_VENTRIMS_OPTIONS) */
  uint32_t flags;      /**< KRAL_VENTRIMS_ENTER_LOADER, KRAL_VENTRIMS_RESET; 0 at first */
  uint32_t at_once;    /**< handsets that are worked on at the same time; 0, as at first: all */
  uint32_t retries;    /**< how often a handset may be lost, or fall silent, and is taken up again; 2 at first */
  uint32_t return_ms;  /**< how long a lost port, and a hello after it, may take; 30,000 at first */
  uint32_t start_ms;   /**< how long a restarted handset may take to answer; 60,000 at first */
  uint32_t command_ms; /**< time-out 0 while the job runs, and a hello's longest wait; 0, as at first: as they are */
  uint32_t block_size; /**< the most that a write to flash carries; 0, as at first: what the programmer announces */
  uint32_t hello_ms;   /**< how long the hello of a boot loader may take; 0, as at first: start_ms */
} KRAL_VENTRIMS_OPTIONS;

/**
 * Gets the options, for a caller that changes some of them.
 *
 * @param[in,out] options `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetOptions(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_OPTIONS* options);
/** Sets them all: flags as above, at most 50 at once, 100 retries, and 3,600,000 ms. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_SetOptions(KRAL_VENTRIMS_JOB job, const KRAL_VENTRIMS_OPTIONS* options);

/**@}*/
/**
 * @name Steps
 * Those of a download (programmer, partition table, images) follow each other in that order, without others in between.
 * Those in diagnostics may stand in front of them, with KRAL_VENTRIMS_ENTER_LOADER, and behind them, with
 * KRAL_VENTRIMS_RESET. KRAL_VENTRIMS_Start checks this.
 */
/**@{*/

#define KRAL_VENTRIMS_PROGRAMMER_BOOT 0u /**< fetched by the boot loader (kivrat.h) */
#define KRAL_VENTRIMS_PROGRAMMER_HEX 1u  /**< Intel HEX, loaded and started by the loader (KRAL_KOVA_...) */

/** Loads a flash programmer, starts and greets it. Without this step it must be running already. At most one. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddProgrammer(KRAL_VENTRIMS_JOB job, const char* file, uint32_t kind);

/** Sends a partition table, of at most 512 bytes; as KRAL_STREAM_PARTITION_TABLE. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddPartitionTable(KRAL_VENTRIMS_JOB job, const char* file,
                                                           uint8_t override_table);

/**
 * Writes an image; as KRAL_STREAM_WriteImageFile.
 *
 * @param job         the job
 * @param file        path of the image
 * @param format      KRAL_IMAGE_FORMAT_...
 * @param image_type  of the opening packet
 * @param header_file path of the header that goes with it, at most 512 bytes; null for none
 * @param method      KRAL_STREAM_MULTI_IMAGE or KRAL_STREAM_NOR
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddImage(KRAL_VENTRIMS_JOB job, const char* file, uint32_t format,
                                                  uint8_t image_type, const char* header_file, uint8_t method);

/**
 * Reads model, software revision and serial number, and fails where the handset does not tell them. A job that begins
 * in diagnostics asks for them in any case, first of all, and takes what it is told; so does a restart.
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddIdentity(KRAL_VENTRIMS_JOB job);

/** Sets the operating mode, KRAL_MODE_...; after KRAL_MODE_RESET the handset is awaited. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddMode(KRAL_VENTRIMS_JOB job, uint32_t mode);

/** Restores a PKV file to the handset; as KRAL_RestoreNVFromPKV. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddRestore(KRAL_VENTRIMS_JOB job, const char* file);

/** Compares the handset with a PKV file; as KRAL_PKV_Verify. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddVerify(KRAL_VENTRIMS_JOB job, const char* file);

/**
 * Gets the name of a step, "image 2 (modem.hex)", also of those that the options add.
 *
 * @param      step from 0
 * @param[out] text [size] terminated
 * @param      size bytes; 64 hold any name
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetStepName(KRAL_VENTRIMS_JOB job, uint32_t step, char* text, uint32_t size);

/**@}*/
/** @name Handsets */
/**@{*/

/**
 * Adds the handset on a COM port, 1 to 255, which the job opens when it is started, and closes when it is freed. A
 * connection of this program that has the port already is used, and stays as it is. On one of its own the job finds
 * the largest packets of file transfers (KRAL_SetEfsAutomaticPacketSize).
 *
 * @param      job     the job
 * @param      port    number of the port
 * @param[out] handset its number in the job; may be null
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddPort(KRAL_VENTRIMS_JOB job, uint32_t port, uint32_t* handset);

/**
 * Adds a handset that is connected. It must stay so until the job has ended; its callbacks of downloads and backups are
 * not called meanwhile, and requests of others on the handle wait for the end of a step.
 *
 * @param[out] handset its number in the job; may be null
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_AddHandle(KRAL_VENTRIMS_JOB job, KRAL_HANDLE handle, uint32_t* handset);

/**
 * Gets the handle of a handset, for its text log and settings: KRAL_StartLogging, KRAL_ConfigureTimeOut.
 *
 * @param[out] handle of the connection
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetHandle(KRAL_VENTRIMS_JOB job, uint32_t handset, KRAL_HANDLE* handle);

/**@}*/
/** @name Running a job */
/**@{*/

/**
 * Where a job may be looked at. Called on a thread of the job when the step or state of a handset changes, and about
 * ten times a second while bytes go. Every function of this header may be called from it but KRAL_VENTRIMS_Free and
 * KRAL_VENTRIMS_Wait, and none that sends requests. Its handset waits until it returns, the others do not. Nothing has
 * to be called from it.
 *
 * @param job      the job
 * @param handset  whose number it is
 * @param value    as given to KRAL_VENTRIMS_SetCallback
 */
typedef void(KRAL_CALL* KRAL_VENTRIMS_CALLBACK)(KRAL_VENTRIMS_JOB job, uint32_t handset, uintptr_t value);

/** Sets the callback of a job that has not been started; null for none. */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_SetCallback(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_CALLBACK callback,
                                                     uintptr_t value);

/**
 * Checks the steps, looks at all files, opens all ports, and then begins the work on threads of the job. Nothing is
 * sent to any handset before all of this has succeeded; where it has not, the job may be mended and started again.
 *
 * @return 1 when the job runs. 0 with KRAL_ERROR_ARGUMENT for wrong steps, KRAL_ERROR_BAD_FILE, KRAL_ERROR_NO_PORT,
 *         KRAL_ERROR_PORT_IN_USE or, when another thread has aborted or freed the job meanwhile, KRAL_ERROR_ABORTED
 *
 * Wait: until the files are read, and each port is open.
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_Start(KRAL_VENTRIMS_JOB job);

#define KRAL_VENTRIMS_ALL 0xFFFFFFFFu /**< every handset */

/**
 * Ends the work on one handset or on all of them; one that has ended stays as it is. From any thread, and with any lock
 * held: no callback comes on it. That of a handset which still waited comes when a thread of the job gets to it. A
 * handset ends within 250 ms, but for these: bytes that the port does not take (time-out 7), the 500 ms after a boot
 * transfer, and a callback.
 *
 * @return 0 for an unknown job or handset, and for a job that has not been started
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_Abort(KRAL_VENTRIMS_JOB job, uint32_t handset);

/**
 * Waits until the job has ended.
 *
 * @return 1 when it has, 0 when the time is up; that is an answer, and leaves no record. 0 with a record for an unknown
 *         job, one that was not started, and from the job's callback
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_Wait(KRAL_VENTRIMS_JOB job, uint32_t time_out_ms);

/** States of a job. */
#define KRAL_VENTRIMS_NEW 0u
#define KRAL_VENTRIMS_STARTING 1u /**< files and ports are looked at */
#define KRAL_VENTRIMS_RUNNING 2u
#define KRAL_VENTRIMS_ENDED 3u /**< every handset has passed, failed or was aborted */

/** A job as a whole. */
typedef struct KRAL_VENTRIMS_STATE {
  uint32_t size;        /**< sizeof(KRAL_VENTRIMS_STATE) */
  uint32_t state;       /**< KRAL_VENTRIMS_NEW, ... */
  uint32_t steps;       /**< how many, with those that the options add; 0 while they are in a wrong order */
  uint32_t handsets;    /**< how many; the next five add up to it */
  uint32_t waiting;     /**< for others to end */
  uint32_t working;     /**< also those that are awaited back */
  uint32_t passed;      /**< all steps done */
  uint32_t failed;      /**< see KRAL_VENTRIMS_GetResult */
  uint32_t aborted;     /**< by KRAL_VENTRIMS_Abort */
  uint32_t elapsed_ms;  /**< since the start, until the end */
  uint64_t bytes_done;  /**< acknowledged by all handsets */
  uint64_t bytes_total; /**< of all handsets */
} KRAL_VENTRIMS_STATE;

/**
 * Gets how far a job has come.
 *
 * @param[in,out] state `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetState(KRAL_VENTRIMS_JOB job, KRAL_VENTRIMS_STATE* state);

/** States of a handset. */
#define KRAL_VENTRIMS_WAITING 0u
#define KRAL_VENTRIMS_WORKING 1u
#define KRAL_VENTRIMS_RETURNING 2u /**< lost; the job waits for it to come back */
#define KRAL_VENTRIMS_PASSED 3u
#define KRAL_VENTRIMS_FAILED 4u
#define KRAL_VENTRIMS_ABORTED 5u

/** One handset of a job, while it is worked on and after. Texts are UTF-8, terminated; empty while they are not known.
 */
typedef struct KRAL_VENTRIMS_PROGRESS {
  uint32_t size;        /**< sizeof(KRAL_VENTRIMS_PROGRESS) */
  uint32_t state;       /**< KRAL_VENTRIMS_WAITING, ... */
  uint32_t port;        /**< its number */
  uint32_t handle;      /**< of the connection */
  uint32_t step;        /**< that is under way, or was last; from 0 */
  uint32_t step_done;   /**< of this step: bytes, or items and files */
  uint32_t step_total;  /**< 0 for a step that does not count */
  uint32_t attempts;    /**< 1, and one more each time it was taken up again */
  uint32_t elapsed_ms;  /**< since work on it began, until it ended */
  uint32_t reserved;    /**< 0 */
  uint64_t bytes_done;  /**< of programmer and images: acknowledged */
  uint64_t bytes_total; /**< of programmer and images */
  char step_name[64];   /**< as KRAL_VENTRIMS_GetStepName */
  char model[64];       /**< as the handset tells it */
  char revision[64];    /**< of its software, as told last */
  char serial[16];      /**< eight hexadecimal digits */
} KRAL_VENTRIMS_PROGRESS;

/**
 * Gets how far a handset has come.
 *
 * @param[in,out] progress `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetProgress(KRAL_VENTRIMS_JOB job, uint32_t handset,
                                                     KRAL_VENTRIMS_PROGRESS* progress);

/** What became of a handset: how far it came, and why not further. */
typedef struct KRAL_VENTRIMS_RESULT {
  uint32_t size;                   /**< sizeof(KRAL_VENTRIMS_RESULT) */
  uint32_t passed;                 /**< 1 when all steps are done */
  KRAL_ERROR error;                /**< code KRAL_ERROR_NONE, or what failed; text is the reason in words */
  KRAL_VENTRIMS_PROGRESS progress; /**< at the end: the step that failed, attempts, time, bytes, identity */
} KRAL_VENTRIMS_RESULT;

/**
 * Gets the verdict on a handset; 0 while there is none yet.
 *
 * @param[in,out] result `size` filled in by the caller
 */
KRAL_API uint8_t KRAL_CALL KRAL_VENTRIMS_GetResult(KRAL_VENTRIMS_JOB job, uint32_t handset,
                                                   KRAL_VENTRIMS_RESULT* result);

/**@}*/

#ifdef __cplusplus
}
#endif

#endif
