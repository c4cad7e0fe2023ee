/* Files of the handset. */
#include <stdio.h>

#include "kral/kral.h"

//! [Copy files]
static void KRAL_CALL on_bytes(uintptr_t source, uintptr_t destination, uint32_t operation, uint32_t reserved,
                               uint32_t done, uint32_t total, KRAL_HANDLE context) {
  (void)source, (void)destination, (void)operation, (void)reserved;
  fprintf(stderr, "%u of %u bytes\r", (unsigned)done, (unsigned)total);
  if (done > 100u * 1024 * 1024) KRAL_AbortEFS_Operation(context);
}

void copy_files(KRAL_HANDLE handle) {
  uint8_t buffer[4096];
  uint32_t size = sizeof buffer;

  KRAL_SetEfsReadAndWritePacketSize(handle, 2048, 2048); /* at least so much in a packet ... */
  KRAL_SetEfsAutomaticPacketSize(handle, 1);             /* ... and as much as the handset takes */
  KRAL_ConfigureEfs2CallBacks(handle, on_bytes, NULL);
  KRAL_EfsWrite(handle, "rf.bin", "/rf/rf.bin");
  KRAL_EfsRead(handle, "copy.bin", "/rf/rf.bin");

  if (KRAL_EfsReadMem(handle, "/rf/rf.bin", buffer, &size)) KRAL_EfsWriteMem(handle, buffer, size, "/rf/copy.bin");
}
//! [Copy files]

void item_files(KRAL_HANDLE handle) {
  //! [Item files]
  const uint8_t version[] = {6, 0};
  KRAL_Efs2PutItem(handle, "version.bin", "/nv/item_files/conf/version");
  KRAL_EfsPutItemFromMem(handle, "/nv/item_files/conf/version", version, sizeof version);
  KRAL_Efs2GetItem(handle, "version.bin", "/nv/item_files/conf/version", sizeof version);
  //! [Item files]
}

void list_folder(KRAL_HANDLE handle) {
  //! [List a folder]
  static KRAL_EFS_ENTRY entries[256];
  uint32_t count = 256;

  if (KRAL_EfsDirectory(handle, "/nv", KRAL_EFS_FILTER_ALL, entries, &count)) {
    for (uint32_t i = 0; i < count; ++i) printf("%10u %s\n", (unsigned)entries[i].size, entries[i].name);
  }
  //! [List a folder]
}

void folders_and_names(KRAL_HANDLE handle) {
  //! [Folders, names and links]
  char target[KRAL_EFS_NAME_SIZE];
  uint32_t error;

  if (!KRAL_EfsMkDir(handle, "/station", &error) && error != KRAL_EFS_ERROR_EXISTS)
    printf("error %u\n", (unsigned)error);
  KRAL_EFS2_DIAG_RENAME(handle, "/station/new", "/station/old", &error);
  KRAL_EfsCreateLink(handle, "/station/old", "/station/current", &error);
  if (KRAL_EfsReadLink(handle, "/station/current", &error, target, sizeof target)) puts(target);
  KRAL_EfsDelete(handle, "/station/current", &error);
  KRAL_EfsRmDir(handle, "/station", &error); /* an empty one */
  //! [Folders, names and links]
}

void ask_about_files(KRAL_HANDLE handle) {
  //! [What is known of a file]
  uint32_t error, mode, size, links, accessed, modified, changed;

  if (KRAL_EFS2_DIAG_STAT(handle, "/rf/rf.bin", &error, &mode, &size, &links, &accessed, &modified, &changed)) {
    printf("%u bytes, mode %o\n", (unsigned)size, (unsigned)mode);
  } else if (error == KRAL_EFS_ERROR_NO_SUCH_FILE) {
    puts("it is not there");
  }
  if (!KRAL_EFS2_DIAG_ACCESS(handle, "/rf/rf.bin", 2, &error)) KRAL_EFS2_DIAG_CHMOD(handle, "/rf/rf.bin", 0644, &error);
  //! [What is known of a file]
}

void file_system(KRAL_HANDLE handle) {
  //! [The file system as a whole]
  KRAL_EFS_STATFS status;
  KRAL_EFS_DEVICE_INFO device;
  uint64_t used;
  uint32_t error, type, number;
  char text[64];

  if (KRAL_EFS2_DIAG_STATFS(handle, "/", &error, &status)) {
    printf("%u of %u blocks are free\n", (unsigned)status.free_blocks, (unsigned)status.total_blocks);
  }
  if (KRAL_EFS2_DIAG_DEV_INFO(handle, &error, &device)) puts(device.name);
  if (KRAL_EFS2_GetGroupInfo(handle, "/nv", &used)) printf("%llu bytes in /nv\n", (unsigned long long)used);
  if (KRAL_EFS2_DIAG_EXTENDED_INFO(handle, 0, &error, &type, &number, text, sizeof text) &&
      type == KRAL_EFS_DATA_TEXT) {
    puts(text);
  }
  KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY(handle, "/", &error); /* what it returns to when it is damaged */
  KRAL_EFS2_SyncWithWait(handle, "/", 10000);           /* nothing is in memory only */
  //! [The file system as a whole]
}

void by_the_server(KRAL_HANDLE handle) {
  //! [Done by the phone server]
  KRAL_EfsRmTree(handle, "/station"); /* with all that is in it */
  KRAL_DownloadCEFS_File(handle, "efs.img");
  KRAL_BackupCEFS_Legacy(handle, "efs.img");
  KRAL_BackupCEFS_Alternate(handle, "efs.img");
  KRAL_UploadCEFS_File(handle, "efs.img");
  KRAL_UploadCEFS_File2(handle, "efs.img");
  KRAL_UploadCEFS_ImageAlternate(handle, "efs.img");
  //! [Done by the phone server]
}
