/* Jobs: the same work for many handsets at once. */
#include <stdio.h>

#include "kral/kral.h"

//! [A job with every kind of step]
static void KRAL_CALL on_change(KRAL_VENTRIMS_JOB job, uint32_t handset, uintptr_t value) {
  KRAL_VENTRIMS_PROGRESS progress = {0};
  progress.size = sizeof progress;
  if (KRAL_VENTRIMS_GetProgress(job, handset, &progress))
    fprintf((FILE *)value, "%u: %s\n", progress.port, progress.step_name);
}

KRAL_VENTRIMS_JOB make_job(void) {
  KRAL_VENTRIMS_JOB job = KRAL_VENTRIMS_Create();
  KRAL_VENTRIMS_OPTIONS options = {0};

  options.size = sizeof options;
  KRAL_VENTRIMS_GetOptions(job, &options);
  options.flags = KRAL_VENTRIMS_ENTER_LOADER | KRAL_VENTRIMS_RESET;
  options.at_once = 8;
  KRAL_VENTRIMS_SetOptions(job, &options);

  KRAL_VENTRIMS_AddIdentity(job);
  KRAL_VENTRIMS_AddProgrammer(job, "programmer.hex", KRAL_VENTRIMS_PROGRAMMER_HEX);
  KRAL_VENTRIMS_AddPartitionTable(job, "partition.bin", 0);
  KRAL_VENTRIMS_AddImage(job, "modem.hex", KRAL_IMAGE_FORMAT_BY_CONTENT, 5, NULL, KRAL_STREAM_MULTI_IMAGE);
  KRAL_VENTRIMS_AddMode(job, KRAL_MODE_OFFLINE_DIGITAL);
  KRAL_VENTRIMS_AddRestore(job, "golden.pkv");
  KRAL_VENTRIMS_AddVerify(job, "golden.pkv");
  KRAL_VENTRIMS_SetCallback(job, on_change, (uintptr_t)stderr);
  return job;
}
//! [A job with every kind of step]

int run_job(KRAL_VENTRIMS_JOB job, KRAL_HANDLE connected) {
  //! [Run a job]
  uint32_t handset;
  KRAL_HANDLE handle;
  KRAL_VENTRIMS_STATE state = {0};

  KRAL_VENTRIMS_AddPort(job, 7, &handset);
  if (KRAL_VENTRIMS_GetHandle(job, handset, &handle)) KRAL_StartLogging(handle, "slot1.log");
  KRAL_VENTRIMS_AddHandle(job, connected, NULL);
  if (!KRAL_VENTRIMS_Start(job)) return 0; /* nothing was sent to any handset; KRAL_GetLastError(job, ...) */

  state.size = sizeof state;
  while (!KRAL_VENTRIMS_Wait(job, 200)) {
    if (KRAL_VENTRIMS_GetState(job, &state) && state.elapsed_ms > 600000) KRAL_VENTRIMS_Abort(job, KRAL_VENTRIMS_ALL);
  }
  //! [Run a job]
  return 1;
}

void tell_results(KRAL_VENTRIMS_JOB job, uint32_t handsets) {
  //! [The verdict on each handset]
  for (uint32_t handset = 0; handset < handsets; ++handset) {
    KRAL_VENTRIMS_RESULT result = {0};
    char step[64] = "";
    result.size = sizeof result;
    if (!KRAL_VENTRIMS_GetResult(job, handset, &result)) continue;
    KRAL_VENTRIMS_GetStepName(job, result.progress.step, step, sizeof step);
    printf("%s: %s %s\n", result.progress.serial, result.passed ? "passed" : step, result.error.text);
  }
  KRAL_VENTRIMS_Free(job);
  //! [The verdict on each handset]
}
