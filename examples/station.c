/*
 * station PROGRAMMER.hex IMAGE BACKUP.pkv PORT...: flashes every handset, restarts it, restores the backup and compares
 * the handset with it: one job, with one verdict for each handset.
 * Exit codes: 0 all passed, 1 some failed, 2 usage, 3 the job could not be started.
 */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kral/kral.h"

static int complain(KRAL_VENTRIMS_JOB job, const char *what) {
  KRAL_ERROR error;

  if (KRAL_GetLastError(job, &error)) {
    fprintf(stderr, "%s: %s\n", what, error.text);
  } else {
    fprintf(stderr, "%s failed\n", what);
  }
  return 0;
}

/* From diagnostics into the loader, the image into flash, and back to diagnostics for the rest. */
static int add_steps(KRAL_VENTRIMS_JOB job, char **files) {
  KRAL_VENTRIMS_OPTIONS options;

  memset(&options, 0, sizeof options);
  options.size = sizeof options;
  if (!KRAL_VENTRIMS_GetOptions(job, &options)) return complain(job, "options");
  options.flags = KRAL_VENTRIMS_ENTER_LOADER | KRAL_VENTRIMS_RESET;
  options.retries = 1;
  if (!KRAL_VENTRIMS_SetOptions(job, &options)) return complain(job, "options");
  if (!KRAL_VENTRIMS_AddProgrammer(job, files[0], KRAL_VENTRIMS_PROGRAMMER_HEX)) return complain(job, files[0]);
  if (!KRAL_VENTRIMS_AddImage(job, files[1], KRAL_IMAGE_FORMAT_BY_CONTENT, 0, NULL, KRAL_STREAM_MULTI_IMAGE))
    return complain(job, files[1]);
  if (!KRAL_VENTRIMS_AddRestore(job, files[2])) return complain(job, files[2]);
  if (!KRAL_VENTRIMS_AddVerify(job, files[2])) return complain(job, files[2]);
  return 1;
}

static int add_ports(KRAL_VENTRIMS_JOB job, int count, char **ports) {
  int i;

  for (i = 0; i < count; ++i) {
    if (!KRAL_VENTRIMS_AddPort(job, (uint32_t)strtoul(ports[i], NULL, 10), NULL)) return complain(job, ports[i]);
  }
  return 1;
}

/* One line a second: what a station would draw as a bar for each socket. */
static void watch(KRAL_VENTRIMS_JOB job) {
  KRAL_VENTRIMS_STATE state;

  do {
    memset(&state, 0, sizeof state);
    state.size = sizeof state;
    if (!KRAL_VENTRIMS_GetState(job, &state)) return;
    fprintf(stderr, "%u waiting, %u working, %u passed, %u failed, %.1f of %.1f MB\n", (unsigned)state.waiting,
            (unsigned)state.working, (unsigned)state.passed, (unsigned)state.failed, (double)state.bytes_done / 1e6,
            (double)state.bytes_total / 1e6);
  } while (!KRAL_VENTRIMS_Wait(job, 1000));
}

static int print_verdicts(KRAL_VENTRIMS_JOB job, int count) {
  int i;
  int failed = 0;

  for (i = 0; i < count; ++i) {
    KRAL_VENTRIMS_RESULT result;

    memset(&result, 0, sizeof result);
    result.size = sizeof result;
    if (!KRAL_VENTRIMS_GetResult(job, (uint32_t)i, &result)) return complain(job, "result");
    printf("COM%-4u %-8s %-8s %6.1f s  %s", (unsigned)result.progress.port, result.progress.model,
           result.progress.serial, result.progress.elapsed_ms / 1000.0, result.passed ? "passed" : "FAILED");
    if (!result.passed) printf(" in %s: %s", result.progress.step_name, result.error.text);
    printf("\n");
    if (!result.passed) failed = 1;
  }
  return !failed;
}

int main(int argc, char **argv) {
  KRAL_VENTRIMS_JOB job;
  int code = 3;

  if (argc < 5) {
    fprintf(stderr, "usage: station PROGRAMMER.hex IMAGE BACKUP.pkv PORT...\n");
    return 2;
  }
  job = KRAL_VENTRIMS_Create();
  if (add_steps(job, argv + 1) && add_ports(job, argc - 4, argv + 4)) {
    if (KRAL_VENTRIMS_Start(job)) {
      watch(job);
      code = print_verdicts(job, argc - 4) ? 0 : 1;
    } else {
      complain(job, "start");
    }
  }
  KRAL_VENTRIMS_Free(job);
  return code;
}
