/* Commands that a definition file describes. */
#include <stdio.h>
#include <stdlib.h>

#include "kral/kral.h"

int call_by_name(KRAL_HANDLE handle) {
  //! [Call a command by name]
  uint32_t count;
  char reply[256];
  if (!KRAL_CMD_LoadDefinitions(handle, "commands.xml", &count)) return 0;
  if (KRAL_CMD_Call(handle, "WLAN.TX_START", "channel=6 rate=11M", reply, sizeof reply)) puts(reply);

  const uint8_t request[] = {6, 3, 1, 0};
  uint8_t bytes[64];
  uint32_t size = sizeof bytes, length;
  if (KRAL_CMD_CallBytes(handle, "WLAN.TX_START", request, sizeof request, bytes, &size))
    printf("%u\n", (unsigned)size);

  /* The same reply once more, as text: for one that did not fit. */
  if (KRAL_CMD_GetReplyLength(handle, &length) && length <= sizeof reply)
    KRAL_CMD_GetReply(handle, reply, sizeof reply);
  KRAL_CMD_ClearDefinitions(handle);
  //! [Call a command by name]
  return 1;
}

int measure(KRAL_HANDLE handle, double *measured) {
  //! [The same command a thousand times]
  uint32_t call, channel, power;
  if (!KRAL_CMD_Prepare(handle, "WLAN.TX_START", &call)) return 0;
  KRAL_CMD_GetFieldIndex(handle, call, 0, "channel", &channel);
  KRAL_CMD_GetFieldIndex(handle, call, 1, "power", &power);
  KRAL_CMD_SetFields(handle, call, "rate=54M flags.antenna=1");
  for (int i = 0; i < 1000; ++i) {
    KRAL_CMD_SetInteger(handle, call, channel, 0, 1 + i % 14);
    if (KRAL_CMD_Send(handle, call)) KRAL_CMD_GetReal(handle, call, power, 0, &measured[i]);
  }
  KRAL_CMD_Release(handle, call);
  //! [The same command a thousand times]
  return 1;
}

int fields_of_all_kinds(KRAL_HANDLE handle, uint32_t call) {
  //! [Texts, arrays and real numbers]
  uint32_t label, power, value, name, count;
  int64_t number;
  uint8_t text[32];
  uint32_t size = sizeof text;

  KRAL_CMD_GetFieldIndex(handle, call, 0, "label", &label);
  KRAL_CMD_GetFieldIndex(handle, call, 0, "points.power", &power);
  KRAL_CMD_SetBytes(handle, call, label, 0, (const uint8_t *)"slot 3", 6);
  KRAL_CMD_SetReal(handle, call, power, 2, -1250.0); /* of element 2 */
  KRAL_CMD_ClearField(handle, call, label);          /* its default again */
  if (!KRAL_CMD_Send(handle, call)) return 0;

  KRAL_CMD_GetFieldIndex(handle, call, 1, "value", &value);
  KRAL_CMD_GetFieldIndex(handle, call, 1, "name", &name);
  if (KRAL_CMD_GetElements(handle, call, value, &count) && count != 0) {
    KRAL_CMD_GetInteger(handle, call, value, 0, &number);
    KRAL_CMD_GetBytes(handle, call, name, 0, text, &size);
  }
  //! [Texts, arrays and real numbers]
  return 1;
}

void list_definitions(KRAL_HANDLE handle) {
  //! [What is defined]
  uint32_t commands = 0;
  KRAL_CMD_GetCount(handle, &commands);
  for (uint32_t i = 0; i < commands; ++i) {
    char name[128];
    uint32_t length;
    if (!KRAL_CMD_GetName(handle, i, name, sizeof name) || !KRAL_CMD_DescribeLength(handle, name, &length)) continue;
    char *text = malloc(length);
    if (text != NULL && KRAL_CMD_Describe(handle, name, text, length)) printf("%s: %s\n", name, text); /* JSON */
    free(text);
  }
  //! [What is defined]
}

void list_fields(KRAL_HANDLE handle, const char *name) {
  //! [Fields one by one]
  KRAL_CMD_COMMAND command = {sizeof command, 0, 0, 0, 0, 0, 0, 0, ""};
  if (!KRAL_CMD_GetCommand(handle, name, &command)) return;
  for (uint32_t i = 0; i < command.request_fields; ++i) {
    KRAL_CMD_FIELD field = {0};
    field.size = sizeof field;
    if (!KRAL_CMD_GetField(handle, name, 0, i, &field)) continue;

    char word[64];
    int64_t value;
    for (uint32_t n = 0; KRAL_CMD_GetWord(handle, name, 0, field.index, n, word, sizeof word, &value); ++n) {
      printf("%s = %lld\n", word, (long long)value);
    }
  }
  //! [Fields one by one]
}
