/*
 * calibration_loop PORT: a transmit-power calibration in small. It takes the handset into factory test mode and finds,
 * for three WCDMA channels, the power setting at which the handset's own detector reads a target.
 * Exit codes: 0 every channel was calibrated, 1 something failed, 2 usage.
 */
#include <stdio.h>
#include <stdlib.h>

#include "kral/kral.h"

#define DETECTOR_TARGET 3000
#define DETECTOR_TOLERANCE 2

/* The payloads of these two commands belong to the handset's software: hundredths of a dBm, and a detector word. */
static int set_power(KRAL_HANDLE handle, int hundredths_of_dbm) {
  uint8_t payload[2];
  uint8_t response[16];
  uint16_t size = sizeof response;

  payload[0] = (uint8_t)(hundredths_of_dbm & 0xFF);
  payload[1] = (uint8_t)((hundredths_of_dbm >> 8) & 0xFF);
  return KRAL_FTM_SET_TX_POWER_DBM(handle, payload, sizeof payload, response, &size);
}

static int read_detector(KRAL_HANDLE handle, int *word) {
  uint8_t response[16];
  uint16_t size = sizeof response;

  if (!KRAL_FTM_GET_HDET_FROM_TX_SWEEP_CAL(handle, NULL, 0, response, &size) || size < 2) return 0;
  *word = response[0] | response[1] << 8;
  return 1;
}

/* The detector rises with the power, so the setting is found by halving the range. */
static int calibrate_channel(KRAL_HANDLE handle, uint16_t channel) {
  int low = -5000;
  int high = 2400;
  int middle = 0;
  int word = 0;

  if (!KRAL_FTM_SET_CHAN(handle, channel)) return 0;
  while (low <= high) {
    middle = low + (high - low) / 2;
    if (!set_power(handle, middle) || !read_detector(handle, &word)) return 0;
    if (abs(word - DETECTOR_TARGET) <= DETECTOR_TOLERANCE) {
      printf("channel %5u  power %7.2f dBm  detector %d\n", (unsigned)channel, middle / 100.0, word);
      return 1;
    }
    if (word < DETECTOR_TARGET) {
      low = middle + 1;
    } else {
      high = middle - 1;
    }
  }
  fprintf(stderr, "channel %u: no power setting reaches the target\n", (unsigned)channel);
  return 0;
}

static int calibrate(KRAL_HANDLE handle) {
  static const uint16_t channels[] = {9612, 9750, 9888};
  size_t i;
  int done = 1;

  if (!KRAL_ChangeFTM_ModeRuntime(handle, 1)) {
    fprintf(stderr, "the handset does not enter factory test mode\n");
    return 0;
  }
  if (!KRAL_FTM_SET_MODE(handle, KRAL_FTM_RF_MODE_WCDMA) || !KRAL_FTM_SET_TX_ON(handle)) {
    fprintf(stderr, "the transmitter cannot be switched on\n");
    done = 0;
  }
  for (i = 0; done && i < sizeof channels / sizeof channels[0]; ++i) done = calibrate_channel(handle, channels[i]);
  /* Whatever happened, no handset is left transmitting. */
  if (!KRAL_FTM_SET_TX_OFF(handle)) done = 0;
  return KRAL_ChangeFTM_ModeRuntime(handle, 0) && done;
}

int main(int argc, char **argv) {
  KRAL_HANDLE handle;
  int done;

  if (argc != 2) {
    fprintf(stderr, "usage: calibration_loop PORT\n");
    return 2;
  }
  KRAL_SetDefaultReceiveMode(KRAL_RECEIVE_MODE_WAKE);
  handle = KRAL_ConnectServer((uint32_t)strtoul(argv[1], NULL, 10));
  if (!KRAL_IsPhoneConnected(handle)) {
    fprintf(stderr, "no handset answers on port %s\n", argv[1]);
    KRAL_DisconnectServer(handle);
    return 1;
  }
  done = calibrate(handle);
  printf("%s\n", done ? "calibrated" : "not calibrated");
  KRAL_DisconnectServer(handle);
  return done ? 0 : 1;
}
