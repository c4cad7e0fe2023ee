/* Logs, events and messages; captures and traces of them. */
#include <stdio.h>

#include "kral/kral.h"

void collect_logs(KRAL_HANDLE handle) {
  //! [Collect logs]
  const uint16_t codes[] = {0x1001, 0x1002};
  uint8_t packet[KRAL_LONGEST_PACKET];
  uint16_t size = sizeof packet;

  KRAL_DIAG_SetPhoneLoggingState(handle, 1);
  if (!KRAL_DIAG_AddExtendedLogCodes(handle, 1, codes, 2)) return; /* codes 0x1000 to 0x1FFF are of equipment id 1 */
  while (KRAL_DIAG_WaitNextPhoneLog(handle, &size, packet, 5000)) {
    printf("%u bytes\n", size);
    size = sizeof packet;
  }
  KRAL_DIAG_ClearExtendedLogCodes(handle, 1, codes, 2);
  //! [Collect logs]
}

void single_codes(KRAL_HANDLE handle) {
  //! [Which codes are on]
  uint32_t items[KRAL_EQUIPMENT_IDS], bits;
  uint8_t mask[KRAL_LONGEST_MASK];
  uint16_t size = sizeof mask;

  if (!KRAL_DIAG_GetLogRanges(handle, items)) return;
  KRAL_DIAG_SetExtendedLogCode(handle, 1, 0x1001, (uint16_t)items[1]); /* this one, and no other */
  KRAL_DIAG_AddExtendedLogCode(handle, 1, 0x1002);                     /* this one, too */
  KRAL_DIAG_ClearExtendedLogCode(handle, 1, 0x1001);
  if (KRAL_DIAG_GetLogMask(handle, 1, &bits, &size, mask)) printf("%u items\n", (unsigned)bits);
  KRAL_DIAG_ClearAllLogCodes(handle, 1);
  //! [Which codes are on]
}

void poll_queues(KRAL_HANDLE handle) {
  //! [Look into the queues now and then]
  uint8_t packet[KRAL_LONGEST_PACKET];
  uint16_t size = sizeof packet;
  uint32_t waiting;
  KRAL_EVENT event;

  if (KRAL_DIAG_GetPhoneLogQueueSize(handle, &waiting)) printf("%u packets wait\n", (unsigned)waiting);
  if (KRAL_DIAG_GetNextPhoneLog(handle, &size, packet)) printf("%u bytes\n", size);
  if (KRAL_DIAG_GetNextEvent(handle, &event)) printf("event %u\n", event.event_id[0] | event.event_id[1] << 8);

  KRAL_DIAG_ClearPhoneLogQueue(handle);
  KRAL_DIAG_ClearEventQueue(handle);
  KRAL_DIAG_ClearCommandResponseQueue(handle);
  //! [Look into the queues now and then]
}

void collect_events(KRAL_HANDLE handle) {
  //! [Collect events]
  const uint16_t ids[] = {290, 291};
  KRAL_EVENT event;
  char text[128] = "";

  KRAL_LoadNameTable(handle, KRAL_TABLE_EVENT_TEXTS, "events.txt");
  KRAL_DIAG_SetEventMaskBits(handle, ids, 2, 1);
  KRAL_DIAG_SetEventMaskBit(handle, 292, 1);
  while (KRAL_DIAG_WaitNextEvent(handle, &event, 5000)) {
    const uint16_t id = (uint16_t)(event.event_id[0] | event.event_id[1] << 8);
    if (KRAL_GetEventText(handle, id, sizeof text, text)) puts(text);
  }

  uint8_t mask[KRAL_LONGEST_MASK];
  uint16_t bits, size = sizeof mask;
  if (KRAL_DIAG_GetEventMask(handle, &bits, &size, mask)) printf("%u events are known\n", bits);
  KRAL_DIAG_SetEntireEventMaskState(handle, 0);
  //! [Collect events]
}

void messages(KRAL_HANDLE handle) {
  //! [Messages by category]
  uint32_t count = 0;
  KRAL_LoadNameTable(handle, KRAL_TABLE_MESSAGE_CATEGORIES, "categories.txt");
  KRAL_ExtendedTextMessage_GetCategoryListSize(handle, &count);
  for (uint32_t i = 0; i < count; ++i) {
    uint16_t category;
    char name[128];
    if (KRAL_ExtendedTextMessage_GetCategoryListItem(handle, i, &category, sizeof name, name)) {
      KRAL_ExtendedTextMessage_SetCategoryEnable(handle, category, 1);
    }
  }
  char text[128];
  KRAL_LoadNameTable(handle, KRAL_TABLE_LOG_NAMES, "logs.txt");
  if (KRAL_GetLogCodeText(handle, 0x1001, sizeof text, text)) puts(text);
  //! [Messages by category]
}

//! [Called for each packet]
static void KRAL_CALL on_packet(uint32_t size, const uint8_t *bytes, uintptr_t value) {
  (void)bytes;
  *(uint64_t *)value += size;
}

static void KRAL_CALL on_event(const KRAL_EVENT *event, uintptr_t value) {
  *(uint64_t *)value += event->payload_length;
}

void count_bytes(KRAL_HANDLE handle, uint64_t *bytes) { /* which must live as long as the callbacks are set */
  KRAL_ConfigureCollectionCallBacks(handle, on_packet, on_event, (uintptr_t)bytes);
  KRAL_DIAG_SetPhoneLoggingState(handle, 1);

  KRAL_TRAFFIC_COUNTERS counters;
  if (KRAL_GetTrafficCounters(handle, &counters)) printf("%llu dropped\n", (unsigned long long)counters.dropped_logs);
}
//! [Called for each packet]

void capture_for_weeks(KRAL_HANDLE handle) {
  //! [Capture into the latest of several files]
  KRAL_StartCaptureWith(handle, "soak.cap", 100 * 1024 * 1024, 3600, 24, 1); /* an hour or 100 MiB each, compressed */
  /* ... */
  KRAL_StopCapture(handle);
  //! [Capture into the latest of several files]
}

void capture(KRAL_HANDLE handle) {
  //! [Capture into a file]
  uint64_t packets, skipped;
  uint32_t cut;

  KRAL_StartCapture(handle, "night.cap");
  /* ... */
  KRAL_StopCapture(handle);

  if (KRAL_ExportCapture("night.cap", "night.pcapng", &packets, &cut)) printf("%llu\n", (unsigned long long)packets);
  KRAL_ImportCapture("night.pcapng", "again.cap", &packets, &skipped, &cut);
  //! [Capture into a file]
}

//! [Play a capture]
static void KRAL_CALL on_played(uint64_t microseconds, uint32_t length, const uint8_t *bytes, uintptr_t value) {
  (void)bytes, (void)value;
  printf("%llu: %u bytes\n", (unsigned long long)microseconds, (unsigned)length);
}

void play(KRAL_HANDLE handle) {
  int32_t state = KRAL_PLAYBACK_NONE;
  uint64_t packets, skipped;

  KRAL_ConfigurePlaybackCallBack(handle, on_played, 0);
  KRAL_StartPlayback(handle, "night.cap", KRAL_PLAY_AS_RECORDED);
  KRAL_StopPlayback(handle);
  KRAL_StartPlaybackBetween(handle, "night.cap", KRAL_PLAY_AT_ONCE, 1772373600000000u, UINT64_MAX);
  do KRAL_GetPlaybackState(handle, &state, &packets, &skipped);
  while (state == KRAL_PLAYBACK_RUNNING); /* a program would sleep in between */
}
//! [Play a capture]

void trace(KRAL_HANDLE handle) {
  //! [Trace what passes over the port]
  KRAL_TRACE_COUNTERS counters;
  KRAL_StartTrace(handle, "port.pcapng");
  /* ... */
  if (KRAL_GetTraceCounters(handle, &counters) && counters.lost != 0) puts("the disk was too slow");
  KRAL_StopTrace(handle);

  KRAL_KeepTrace(handle, 8 * 1024 * 1024);                                      /* the last of it, in memory ... */
  if (!KRAL_IsPhoneConnected(handle)) KRAL_SaveTrace(handle, "failure.pcapng"); /* ... for when something fails */
  //! [Trace what passes over the port]
}
