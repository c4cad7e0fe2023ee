/*
 * flood FOLDER [SECONDS [RATE [MODE [COMPRESS]]]]: logs of a caller's transport, 100,000 a second when nothing else is
 * said, with a capture and a trace of them in FOLDER and a reader of the log queue. Whatever the machine has no time
 * for, each packet is in each of the three, or counted as lost there; the files hold what the counters say.
 * Exit codes: 0 it is so, 1 it is not, 2 usage.
 */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kral/kral.h"
#include "tests/flood/now.h"

#define PAYLOAD 44 /* bytes of a log packet without its FCS */
#define NUMBER 8   /* where its number stands */
#define FRAME (2 * (PAYLOAD + 2) + 1)

/* What the receive function sees: it alone changes it once there is a connection. */
static struct {
  double begin;
  double rate;
  uint64_t total;
  uint64_t sent;
  double last; /* when it had sent all */
} line;

static uint16_t table[256];

static uint64_t load(const uint8_t* bytes, int count) {
  uint64_t value = 0;
  while (count-- > 0) value = value << 8 | bytes[count];
  return value;
}

static void make_table(void) {
  for (int byte = 0; byte < 256; ++byte) {
    unsigned value = (unsigned)byte;
    for (int bit = 0; bit < 8; ++bit) value = (value & 1) != 0 ? value >> 1 ^ 0x8408 : value >> 1;
    table[byte] = (uint16_t)value;
  }
}

static uint32_t append(uint8_t* frame, uint32_t size, uint8_t byte) {
  if (byte == 0x7E || byte == 0x7D) {
    frame[size++] = 0x7D;
    byte ^= 0x20;
  }
  frame[size++] = byte;
  return size;
}

static uint32_t make_frame(uint8_t* frame, uint64_t number) {
  uint8_t packet[PAYLOAD] = {16, 0, PAYLOAD - 4, 0, PAYLOAD - 4, 0, 1, 0x10};
  uint16_t fcs = 0xFFFF;
  uint32_t size = 0;
  for (int i = 0; i < 8; ++i) packet[NUMBER + i] = (uint8_t)(number >> 8 * i);
  for (int i = 0; i < PAYLOAD; ++i) {
    fcs = (uint16_t)(fcs >> 8 ^ table[(fcs ^ packet[i]) & 0xFF]);
    size = append(frame, size, packet[i]);
  }
  fcs ^= 0xFFFF;
  size = append(frame, size, (uint8_t)(fcs & 0xFF));
  size = append(frame, size, (uint8_t)(fcs >> 8));
  frame[size++] = 0x7E;
  return size;
}

static uint32_t KRAL_CALL take_all(uintptr_t context, uintptr_t transport, uint32_t count, const uint8_t* data,
                                   uint32_t* written) {
  (void)context;
  (void)transport;
  (void)data;
  *written = count;
  return 0;
}

static uint32_t KRAL_CALL give_logs(uintptr_t context, uintptr_t transport, uint32_t* count, uint8_t* buffer) {
  const double due = (now() - line.begin) * line.rate;
  uint32_t size = 0;
  (void)context;
  (void)transport;
  while (line.sent < line.total && (double)line.sent < due && size + FRAME <= *count) {
    size += make_frame(buffer + size, line.sent++);
    if (line.sent == line.total) line.last = now();
  }
  *count = size;
  return 0;
}

static uint32_t KRAL_CALL forget_nothing(uintptr_t context, uintptr_t transport) {
  (void)context;
  (void)transport;
  return 0;
}

static int check(int is_so, const char* what, uint64_t one, uint64_t other) {
  if (!is_so) fprintf(stderr, "%s: %.0f and %.0f\n", what, (double)one, (double)other);
  return is_so;
}

static uint8_t* whole_file(const char* name, size_t* size) {
  FILE* file = fopen(name, "rb");
  uint8_t* bytes = NULL;
  size_t room = 0;
  *size = 0;
  if (file == NULL) return NULL;
  for (;;) {
    if (*size == room) {
      uint8_t* more = realloc(bytes, room = 2 * room + 65536);
      if (more == NULL) break;
      bytes = more;
    }
    const size_t got = fread(bytes + *size, 1, room - *size, file);
    if (got == 0) break;
    *size += got;
  }
  fclose(file);
  return bytes;
}

/* Records of a capture that is not compressed: numbers only grow. */
static int count_records(const char* name, uint64_t* records) {
  size_t size;
  uint8_t* bytes = whole_file(name, &size);
  size_t at = 16;
  int64_t last = -1;
  int good = bytes != NULL;
  *records = 0;
  while (good && at + 12 <= size) {
    const size_t length = (size_t)load(bytes + at + 8, 2);
    good = length == PAYLOAD + 2 && at + 12 + length <= size && (int64_t)load(bytes + at + 12 + NUMBER, 8) > last;
    if (!good) break;
    last = (int64_t)load(bytes + at + 12 + NUMBER, 8);
    at += 12 + length;
    ++*records;
  }
  free(bytes);
  return check(good && at == size, "the capture is not whole", at, size);
}

/* Enhanced packet blocks of a pcapng file. */
static int count_blocks(const char* name, uint64_t* blocks) {
  size_t size;
  uint8_t* bytes = whole_file(name, &size);
  size_t at = 0;
  *blocks = 0;
  while (bytes != NULL && at + 12 <= size) {
    const size_t length = (size_t)load(bytes + at + 4, 4);
    if (length < 12 || at + length > size) break;
    if (load(bytes + at, 4) == 6) ++*blocks;
    at += length;
  }
  free(bytes);
  return check(bytes != NULL && at == size, "the trace is not whole", at, size);
}

/* Takes packets out of the queue until all have come, and has 30 seconds beyond the time that they take. */
static int read_logs(KRAL_HANDLE handle, double seconds, uint64_t* read) {
  static uint8_t buffer[KRAL_LONGEST_PACKET];
  uint16_t size = 0;
  int64_t last = -1;
  KRAL_TRAFFIC_COUNTERS counters;
  const double end = now() + seconds + 30;
  *read = 0;
  memset(&counters, 0, sizeof counters);
  while (now() < end) {
    while (KRAL_DIAG_WaitNextPhoneLog(handle, &size, buffer, 50)) {
      const int64_t number = (int64_t)load(buffer + NUMBER, 8);
      if (!check(number > last, "out of order", (uint64_t)number, (uint64_t)last)) return 0;
      last = number;
      ++*read;
    }
    KRAL_GetTrafficCounters(handle, &counters);
    if (counters.collected == line.total && counters.waiting == 0) return 1;
  }
  return check(0, "not all have come", counters.collected, line.total);
}

static int judge(KRAL_HANDLE handle, const char* capture, const char* trace, int compress, uint64_t read) {
  KRAL_TRAFFIC_COUNTERS counters;
  KRAL_TRACE_COUNTERS traced;
  uint64_t records = 0;
  uint64_t blocks = 0;
  int good = 1;
  do {
    KRAL_StopCapture(handle);
    KRAL_StopTrace(handle);
    memset(&traced, 0, sizeof traced);
    good &= KRAL_GetTrafficCounters(handle, &counters) && KRAL_GetTraceCounters(handle, &traced);
  } while (good && counters.capture_pending + traced.pending != 0);
  printf(
      "%.0f packets, %.0f a second; lost to the reader %.0f, the capture %.0f, the trace %.0f; at most %.0f waited\n",
      (double)line.total, (double)line.total / (line.last - line.begin), (double)counters.dropped_logs,
      (double)counters.capture_lost, (double)traced.lost, (double)counters.most_waiting);
  good &= check(read + counters.dropped_logs == line.total, "read and dropped", read, counters.dropped_logs);
  good &= check(counters.captured + counters.capture_lost == line.total, "captured and lost", counters.captured,
                counters.capture_lost);
  good &= check(traced.frames + traced.lost == line.total, "traced and lost", traced.frames, traced.lost);
  good &= check(traced.bad == 0 && counters.oversized == 0, "bad and oversized", traced.bad, counters.oversized);
  if (!compress) good &= count_records(capture, &records);
  if (!compress) good &= check(records == counters.captured, "in the capture", records, counters.captured);
  good &= count_blocks(trace, &blocks);
  good &= check(blocks == traced.frames + traced.others, "in the trace", blocks, traced.frames);
  return good;
}

int main(int argc, char** argv) {
  const double seconds = argc > 2 ? atof(argv[2]) : 10;
  const double rate = argc > 3 ? atof(argv[3]) : 100000;
  const int mode = argc > 4 ? atoi(argv[4]) : KRAL_RECEIVE_MODE_WAKE;
  const int compress = argc > 5 && atoi(argv[5]) != 0;
  static char capture[4096];
  static char trace[4096];
  uint64_t read = 0;
  KRAL_HANDLE handle;
  int good;
  if (argc < 2 || seconds <= 0 || rate <= 0 || strlen(argv[1]) > sizeof capture - 20) {
    fprintf(stderr, "usage: flood FOLDER [SECONDS [RATE [MODE [COMPRESS]]]]\n");
    return 2;
  }
  snprintf(capture, sizeof capture, "%s/flood.cap", argv[1]);
  snprintf(trace, sizeof trace, "%s/flood.pcapng", argv[1]);
  make_table();
  line.rate = rate;
  line.total = (uint64_t)(seconds * rate);
  line.begin = now() + 0.5; /* when all is set up */
  handle = KRAL_ConnectServer_UserDefinedTransport(900, 1, 0, take_all, give_logs, forget_nothing);
  good = handle != 0 && KRAL_SetReceiveMode(handle, (uint8_t)mode) && KRAL_DIAG_SetPhoneLoggingState(handle, 1) &&
         KRAL_StartCaptureWith(handle, capture, 0, 0, 0, (uint8_t)compress) && KRAL_StartTrace(handle, trace);
  if (good) {
    good = read_logs(handle, seconds, &read) && judge(handle, capture, trace, compress, read);
  } else {
    fprintf(stderr, "no connection, or no file in %s\n", argv[1]);
  }
  if (handle != 0) KRAL_DisconnectServer(handle);
  remove(capture);
  remove(trace);
  return good ? 0 : 1;
}
