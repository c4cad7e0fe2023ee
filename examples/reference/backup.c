/* Backups of a handset's items and files. */
#include <stdio.h>

#include "kral/kral.h"

//! [Back up, restore, compare]
static uint8_t KRAL_CALL on_item(const KRAL_PKV_ITEM *item, const char *path, uint32_t done, uint32_t total,
                                 KRAL_HANDLE handle) {
  if (item->result == KRAL_PKV_REFUSED) fprintf(stderr, "refused: %u %s\n", item->id, path == NULL ? "" : path);
  fprintf(stderr, "%u: %u of %u\r", (unsigned)handle, (unsigned)done, (unsigned)total);
  return 1; /* 0 stops */
}

int clone(KRAL_HANDLE golden, KRAL_HANDLE copy) {
  uint32_t status;
  KRAL_PKV_COUNTS counts;

  KRAL_PKV_ConfigureCallBack(golden, on_item);
  KRAL_PKV_ConfigureBackup(golden, 0, 9999, 1); /* these ids, and one subscription */
  if (!KRAL_BackupNVFromMobileToPKV(golden, "golden.pkv", &status)) return 0;

  if (!KRAL_RestoreNVFromPKV(copy, "golden.pkv", &status)) return 0;
  if (!KRAL_PKV_Verify(copy, "golden.pkv", &status) && status == KRAL_PKV_STATUS_DIFFERENT) puts("not the same");
  if (KRAL_PKV_GetCounts(copy, &counts))
    printf("%u equal, %u differ\n", (unsigned)counts.done, (unsigned)counts.different);
  return 1;
}
//! [Back up, restore, compare]

void through_the_server(KRAL_HANDLE handle) {
  //! [Through the phone server's agent]
  if (KRAL_DownloadPkvFile(handle, "phone.pkv", 0)) KRAL_UploadPkvFile(handle, "phone.pkv", 0);
  //! [Through the phone server's agent]
}
