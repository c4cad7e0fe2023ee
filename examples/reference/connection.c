/* Ports, connections, time-outs, text log, errors: what every program does first. */
#include <stdio.h>

#include "kral/kral.h"

/* Gives the first handset that answers, or 0. */
KRAL_HANDLE connect_to_any(void) {
  //! [Connect to whatever is there]
  uint16_t ports[255];
  uint16_t count = 255;
  KRAL_HANDLE handle = 0;

  KRAL_GetAllPortList(&count, ports);
  for (uint16_t i = 0; i < count && handle == 0; ++i) {
    KRAL_PORT_INFO info;
    if (KRAL_GetPortInfo(ports[i], 1, &info) && info.answers == KRAL_ANSWERS_DIAGNOSTICS) {
      printf("COM%u: %s\n", ports[i], info.description);
      handle = KRAL_ConnectServer(ports[i]);
    }
  }
  //! [Connect to whatever is there]
  return handle;
}

int connect_and_ask(uint32_t port) {
  //! [Connect, use, disconnect]
  KRAL_HANDLE handle = KRAL_ConnectServerWithWait(port, 30000); /* a handset that is starting */
  if (handle == 0) return 0;

  uint16_t number = 0;
  int32_t state = 0;
  if (KRAL_IsPhoneConnected(handle) && KRAL_GetComPortNumber(handle, &number))
    printf("connected to COM%u\n", number);
  else if (KRAL_GetPortState(handle, &state) && state == KRAL_PORT_BUSY)
    printf("another program has the port\n");
  KRAL_DisconnectServer(handle);
  //! [Connect, use, disconnect]
  return 1;
}

void other_connects(void) {
  //! [Other ways to connect]
  KRAL_HANDLE greeted = KRAL_ConnectServerWithHandShake(7);
  KRAL_HANDLE verified = KRAL_ConnectServerWithVerify(8); /* 0 when the port cannot be opened */

  KRAL_AddPortAliasEntry(1, 9); /* socket 1 of the fixture is COM9 */
  KRAL_HANDLE socket = KRAL_ConnectServer_LogicalPort(1);
  KRAL_ClearPortAliasList();

  KRAL_SetData2DiagSearch(greeted, 0);
  printf("%u %u %u\n", (unsigned)greeted, (unsigned)verified, (unsigned)socket);
  KRAL_DisconnectAllServers();
  //! [Other ways to connect]
}

//! [A transport of your own]
static uint32_t KRAL_CALL send_bytes(uintptr_t context, uintptr_t transport, uint32_t count, const uint8_t *data,
                                     uint32_t *written) {
  *written = (uint32_t)fwrite(data, 1, count, (FILE *)transport);
  return context == 1 && *written == count ? 0 : 1; /* 0: done */
}

static uint32_t KRAL_CALL receive_bytes(uintptr_t context, uintptr_t transport, uint32_t *count, uint8_t *buffer) {
  *count = (uint32_t)fread(buffer, 1, *count, (FILE *)transport);
  return context == 1 ? 0 : 1;
}

static uint32_t KRAL_CALL flush_bytes(uintptr_t context, uintptr_t transport) {
  (void)context;
  return (uint32_t)fflush((FILE *)transport);
}

KRAL_HANDLE connect_through(FILE *stream) {
  return KRAL_ConnectServer_UserDefinedTransport(1, (uintptr_t)stream, 1, send_bytes, receive_bytes, flush_bytes);
}
//! [A transport of your own]

void configure(void) {
  //! [Settings for connections to come]
  char version[KRAL_LIBRARY_VERSION_SIZE];
  KRAL_GetLibraryVersion(version);
  printf("%s, %s\n", version, KRAL_GetLibraryVersionNumber() < KRAL_VERSION_NUMBER ? "older than its headers" : "fits");

  KRAL_SetLibraryMode(KRAL_LIBRARY_MODE_DIRECT);
  KRAL_SetTargetType(KRAL_TARGET_MODEM);
  KRAL_SetDefaultReceiveMode(KRAL_RECEIVE_MODE_WAKE);
  //! [Settings for connections to come]
}

void configure_connection(KRAL_HANDLE handle) {
  //! [Settings of a connection]
  KRAL_ConfigureTimeOut(handle, KRAL_TIME_OUT_COMMAND, 8000); /* a handset that takes its time */
  printf("answers are awaited for %ld ms\n", (long)KRAL_GetTimeOut(handle, KRAL_TIME_OUT_COMMAND));
  KRAL_SetReceiveMode(handle, KRAL_RECEIVE_MODE_WAKE);
  //! [Settings of a connection]
}

void phone_server(void) {
  //! [Through the phone server]
  uint16_t ports[255], ignored[] = {3};
  uint16_t count = 255;

  KRAL_SetLibraryMode(KRAL_LIBRARY_MODE_SERVER);
  if (KRAL_GetAvailablePhonesPortList(&count, ports, 1, ignored)) printf("%u handsets\n", count);
  KRAL_TerminateORBTServer();
  //! [Through the phone server]
}

void explain(KRAL_HANDLE handle) {
  //! [Why a call failed]
  uint32_t serial;
  if (!KRAL_DIAG_READ_ESN_F(handle, &serial)) {
    KRAL_ERROR error;
    char meaning[64] = "";
    if (KRAL_GetLastError(handle, &error)) {
      KRAL_GetErrorText(error.code, meaning, sizeof meaning); /* "no answer in time" */
      fprintf(stderr, "%s: %s (%s)\n", error.function, error.text, meaning);
      if (error.status_kind == KRAL_ERROR_STATUS_REFUSAL) fprintf(stderr, "refused with %u\n", (unsigned)error.status);
    }
  }
  //! [Why a call failed]
}

//! [The text log]
static void KRAL_CALL show_line(uint32_t category, const void *line, uint32_t size) {
  fprintf(stderr, "%04X %.*s\n", (unsigned)category, (int)size, (const char *)line);
}

void log_what_happens(KRAL_HANDLE handle) {
  KRAL_SetLogFlags(handle, KRAL_LOG_DEFAULT_MASK | KRAL_LOG_IO);
  if (!KRAL_StartLogging(handle, "station.log")) return;
  KRAL_ConfigureLibraryTextLogCallBack(handle, show_line);
  KRAL_AddUserMessageToTextLog(handle, KRAL_LOG_C_HIGH_LEVEL_START, "calibration of slot 3", 0);

  const uint8_t message[] = {0x79, 0x00};
  KRAL_AddUserAsyncLogMessageToTextLog(handle, KRAL_LOG_ASYNC, message, sizeof message, 1, 1);

  KRAL_ConfigureLibraryTextLogCallBack(handle, NULL);
  if (KRAL_IsLoggingStarted(handle)) KRAL_StopLogging(handle);
}
//! [The text log]
