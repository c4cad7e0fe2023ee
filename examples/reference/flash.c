/* Software download: images, the loader, the flash programmer, the boot loader. */
#include <stdio.h>

#include "kral/kral.h"

int flash_from_cold(uint32_t port) {
  //! [Flash a handset without software]
  const char *const images[] = {"boot.bin", "modem.hex"};
  const uint8_t types[] = {2, 5};
  uint32_t result = 0, failed = KRAL_FLASH_NO_IMAGE;

  KRAL_HANDLE handle = KRAL_Kivrat_ConnectServer(port);
  KRAL_Kivrat_Configure(handle, 20, 500, 0); /* it may take 10 s to say hello */
  const int done = KRAL_Kivrat_FlashAll(handle, "programmer.bin", images, types, 2, &result, &failed);
  if (!done) fprintf(stderr, "%s: %u\n", failed < 2 ? images[failed] : "programmer.bin", (unsigned)result);
  KRAL_DisconnectServer(handle);
  //! [Flash a handset without software]
  return done;
}

int boot_transfer(KRAL_HANDLE handle) {
  //! [The boot transfer, step by step]
  uint32_t version, chip;
  if (!KRAL_Kivrat_Connect(handle, &version, &chip)) return 0;
  printf("chip %08X\n", (unsigned)chip);
  if (!KRAL_Kivrat_DownloadFlashProgrammer(handle, "programmer.bin")) return 0;
  KRAL_Kivrat_End(handle);
  //! [The boot transfer, step by step]
  return 1;
}

void hello_behavior(KRAL_HANDLE handle) {
  //! [Hellos through the phone server]
  uint16_t behavior;
  if (KRAL_GetKivratHelloBehavior(handle, &behavior) && behavior != 1) KRAL_SetKivratHelloBehavior(handle, 1);
  //! [Hellos through the phone server]
}

//! [Flash a handset that runs its software]
static void KRAL_CALL on_progress(KRAL_HANDLE handle, uint32_t acknowledged, uint32_t total, uintptr_t value) {
  const int *const stop = (const int *)value;
  fprintf(stderr, "%u of %u\r", (unsigned)acknowledged, (unsigned)total);
  if (*stop) KRAL_AbortDownload(handle);
}

int flash(KRAL_HANDLE handle, int *stop) {
  uint32_t result, block_size;
  uint16_t window;

  KRAL_ConfigureDownloadCallBack(handle, on_progress, (uintptr_t)stop);
  if (!KRAL_DIAG_DLOAD_F(handle)) return 0; /* it comes back as its loader */
  if (!KRAL_KOVA_LoadFlashProgrammer(handle, "programmer.hex", 0, &result)) return 0;

  KRAL_STREAM_ConfigureHello(handle, 5, 500);
  if (!KRAL_STREAM_HELLO(handle, KRAL_STREAM_HELLO_VARIANT, &block_size, &window)) return 0;
  KRAL_STREAM_SECURITY_MODE(handle, 1);
  return KRAL_STREAM_WriteImageFile(handle, "modem.hex", KRAL_IMAGE_FORMAT_BY_CONTENT, 5, NULL, KRAL_STREAM_MULTI_IMAGE,
                                    block_size, window, &result);
}
//! [Flash a handset that runs its software]

void loader(KRAL_HANDLE handle) {
  //! [Talk to the loader]
  uint8_t version[256];
  if (KRAL_KOVA_NOP(handle) && KRAL_KOVA_SW_VERSION(handle, version)) KRAL_KOVA_RESET(handle);
  //! [Talk to the loader]
}

int partitions(KRAL_HANDLE handle, const uint8_t *image, uint32_t size) {
  //! [A partition table, and an image from memory]
  uint8_t status;
  uint32_t result;
  if (!KRAL_STREAM_PARTITION_TABLE(handle, "partition.bin", 0, &status) &&
      status == KRAL_STREAM_PARTITION_USE_OVERRIDE) {
    KRAL_STREAM_PARTITION_TABLE(handle, "partition.bin", 1, &status); /* in place of a different one */
  }
  if (!KRAL_STREAM_WriteImageMem(handle, image, size, 0, 5, NULL, 0, KRAL_STREAM_MULTI_IMAGE, 1024, 15, &result))
    return 0;
  //! [A partition table, and an image from memory]
  return 1;
}

void look_at_image(const char *file) {
  //! [What is in an image file]
  KRAL_IMAGE_INFO info;
  uint32_t result, line = 0, base = 0;
  uint64_t lost;

  if (KRAL_IMAGE_GetInfo(file, KRAL_IMAGE_FORMAT_BY_CONTENT, &info, &result))
    printf("%u bytes\n", (unsigned)info.size[0]);
  if (KRAL_HEX_FindLoss(file, &line, &lost, &result) && line != 0)
    printf("bytes are lost from line %u on\n", (unsigned)line);
  if (KRAL_HEX_Convert(file, "image.bin", KRAL_HEX_TO_BINARY, &base, &result)) printf("from %08X\n", (unsigned)base);
  //! [What is in an image file]
}
