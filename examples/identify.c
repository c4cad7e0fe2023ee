/*
 * identify PORT: connects to the handset on a COM port, asks for its version and disconnects.
 * Exit codes: 0 the version was read, 1 it was not, 2 usage.
 */
#include <stdio.h>
#include <stdlib.h>

#include "kral/kral.h"

static void print_field(const char *label, const char *text, int size) {
  printf("%-15s%.*s\n", label, size, text);
}

static int print_version(KRAL_HANDLE handle) {
  char compile_date[KRAL_VERNO_DATE_SIZE];
  char compile_time[KRAL_VERNO_TIME_SIZE];
  char release_date[KRAL_VERNO_DATE_SIZE];
  char release_time[KRAL_VERNO_TIME_SIZE];
  char version_directory[KRAL_VERNO_DIRECTORY_SIZE];
  uint8_t station_class, revision, model, slot_cycle, vocoder_major, vocoder_minor;
  uint16_t firmware;

  if (!KRAL_DIAG_VERNO_F(handle, compile_date, compile_time, release_date, release_time, version_directory,
                         &station_class, &revision, &model, &firmware, &slot_cycle, &vocoder_major, &vocoder_minor)) {
    fprintf(stderr, "the handset does not tell its version\n");
    return 1;
  }
  /* The texts have a fixed width and no terminator. */
  print_field("compiled", compile_date, (int)sizeof compile_date);
  print_field("", compile_time, (int)sizeof compile_time);
  print_field("released", release_date, (int)sizeof release_date);
  print_field("", release_time, (int)sizeof release_time);
  print_field("version", version_directory, (int)sizeof version_directory);
  printf("%-15s%u\n", "mobile model", (unsigned)model);
  printf("%-15s%u\n", "firmware", (unsigned)firmware);
  return 0;
}

int main(int argc, char **argv) {
  KRAL_HANDLE handle;
  int result = 1;

  if (argc != 2) {
    fprintf(stderr, "usage: identify PORT\n");
    return 2;
  }
  handle = KRAL_ConnectServer((uint32_t)strtoul(argv[1], NULL, 10));
  if (handle == 0) {
    fprintf(stderr, "no more handsets can be connected\n");
    return 1;
  }
  /* A handle says nothing about the port: whether it opened and a handset answers has to be asked. */
  if (KRAL_IsPhoneConnected(handle)) {
    printf("connected to port %s\n", argv[1]);
    result = print_version(handle);
  } else {
    fprintf(stderr, "no handset answers on port %s\n", argv[1]);
  }
  KRAL_DisconnectServer(handle);
  return result;
}
