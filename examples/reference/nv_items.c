/* NV items: one by one, and as sets with definitions. */
#include <stdio.h>
#include <stdlib.h>

#include "kral/kral.h"

void single_items(KRAL_HANDLE handle) {
  //! [Read and write an item]
  uint8_t data[128] = {0};
  uint16_t status;

  if (KRAL_DIAG_NV_READ_F(handle, 453, data, sizeof data, &status)) {
    data[0] = 1;
    if (!KRAL_DIAG_NV_WRITE_F(handle, 453, data, 1, &status)) printf("not written: status %u\n", status);
  } else if (status == KRAL_NV_STATUS_NEVER_WRITTEN) {
    printf("it has no value\n");
  }
  //! [Read and write an item]
}

void item_kinds(KRAL_HANDLE handle) {
  //! [Elements and subscriptions]
  uint8_t data[128] = {0};
  uint16_t status;

  if (KRAL_DIAG_NV_READ_ARRAY_F(handle, 1016, 3, data, sizeof data, &status)) { /* element 3 */
    KRAL_DIAG_NV_WRITE_ARRAY_F(handle, 1016, 3, data, sizeof data, &status);
  }
  if (KRAL_DIAG_NV_READ_EXT_F(handle, 10, data, 1, sizeof data, &status)) { /* subscription 1 */
    KRAL_DIAG_NV_WRITE_EXT_F(handle, 10, data, 1, sizeof data, &status);
  }
  //! [Elements and subscriptions]
}

void batch(KRAL_HANDLE handle, const uint8_t *value) {
  //! [Many writes in few requests]
  const uint16_t may_be_read_only[] = {0, 447};
  uint16_t item, total_status, status;
  uint8_t item_status;

  KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle, may_be_read_only, 2);
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle, 1);
  for (uint16_t id = 4000; id < 4100; ++id) KRAL_DIAG_NV_WRITE_F(handle, id, value, 1, &status);
  if (!KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle, &item, &total_status, &item_status)) {
    printf("item %u: status %u\n", item, item_status);
  }
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle, 0);
  //! [Many writes in few requests]
}

void load_definitions(KRAL_HANDLE handle) {
  //! [Definitions of items]
  uint32_t count = 0, files = 0, length = 0;
  uint32_t error = KRAL_NV_LoadNVDataTypeDictinary(handle, "nv_types.xml");
  if (error == 0) error = KRAL_NV_LoadNVDefinitionFile(handle, "nv_definitions.xml");
  if (error != 0) {
    char text[128];
    if (KRAL_NV_GetErrorText(handle, error, text, sizeof text) == 0) fprintf(stderr, "%s\n", text);
  }
  KRAL_NV_GetNumOfNVDefinition(handle, &count);
  KRAL_NV_GetNumOfNVEfsDefinition(handle, &files);
  for (uint32_t i = 0; i < count; ++i) {
    /* Of each text there is a companion that tells how much room it needs. */
    if (KRAL_NV_GetNVDefinitionByIndexStringLength(handle, i, &length) != 0) continue;
    char *text = malloc(length);
    if (text != NULL && KRAL_NV_GetNVDefinitionByIndex(handle, i, text, length) == 0) puts(text);
    free(text);
  }
  KRAL_NV_ClearNVDefinition(handle);
  //! [Definitions of items]
}

void look_up_definitions(KRAL_HANDLE handle) {
  //! [Definitions by name]
  const char *const file = "/nv/item_files/conf/version";
  char text[4096];
  uint32_t length;

  if (KRAL_NV_GetNVEfsFilenamesStringLength(handle, &length) == 0 && length <= sizeof text) {
    if (KRAL_NV_GetNVEfsFilenames(handle, text, sizeof text) == 0) printf("item files: %s\n", text);
  }
  if (KRAL_NV_GetNVDefinitionByEfsFilenameStringLength(handle, file, &length) == 0 && length <= sizeof text) {
    if (KRAL_NV_GetNVDefinitionByEfsFilename(handle, file, text, sizeof text) == 0) puts(text);
  }
  if (KRAL_NV_GetNVDefinitionFieldNamesStringLength(handle, 0, &length) == 0 && length <= sizeof text) {
    if (KRAL_NV_GetNVDefinitionFieldNames(handle, 0, text, sizeof text) == 0) printf("members: %s\n", text);
  }
  if (KRAL_NV_GetNVDataTypeDefinitionStringLength(handle, "point", &length) == 0 && length <= sizeof text) {
    if (KRAL_NV_GetNVDataTypeDefinition(handle, "point", text, sizeof text) == 0) puts(text);
  }
  //! [Definitions by name]
}

void values(KRAL_HANDLE handle) {
  //! [Values as text]
  char text[1024];
  uint16_t status;
  uint32_t length;

  if (KRAL_NV_ReadNVItemFromMobileByNVID(handle, 453, &status) == 0 &&
      KRAL_NV_GetNVValueStringByNVIDStringLength(handle, 453, 0, &length) == 0 && length <= sizeof text &&
      KRAL_NV_GetNVValueStringByNVID(handle, 453, 0, text, sizeof text) == 0) {
    printf("453 is %s\n", text);
  }
  if (KRAL_NV_SetNVValueStringByNVID(handle, 453, 0, "1") == 0) {
    KRAL_NV_WriteNVItemToMobileByNVID(handle, 453, &status);
  }
  //! [Values as text]
}

void values_by_index(KRAL_HANDLE handle) {
  //! [Values of the n-th definition]
  char text[1024];
  uint16_t status;
  uint32_t length;

  if (KRAL_NV_GetNVValueStringByIndexStringLength(handle, 0, 0, &length) == 0 && length <= sizeof text &&
      KRAL_NV_GetNVValueStringByIndex(handle, 0, 0, text, sizeof text) == 0 &&
      KRAL_NV_SetNVValueStringByIndex(handle, 0, 0, text) == 0) {
    KRAL_NV_WriteNVItemToMobileByIndex(handle, 0, &status);
  }
  KRAL_NV_ClearNVValueByIndex(handle, 0);
  //! [Values of the n-th definition]
}

void file_values(KRAL_HANDLE handle) {
  //! [Values of item files]
  const char *const file = "/nv/item_files/conf/version";
  char text[1024];
  uint32_t length;

  if (KRAL_NV_ReadNVItemFromMobileByEfsFilename(handle, file) == 0 &&
      KRAL_NV_GetNVValueStringByEfsFilenameStringLength(handle, file, &length) == 0 && length <= sizeof text &&
      KRAL_NV_GetNVValueStringByEfsFilename(handle, file, text, sizeof text) == 0 &&
      KRAL_NV_SetNVValueStringByEfsFilename(handle, file, text) == 0) {
    KRAL_NV_WriteNVItemToMobileByEfsFilename(handle, file);
  }
  //! [Values of item files]
}

void byte_values(KRAL_HANDLE handle) {
  //! [Values as bytes]
  uint8_t data[128];
  uint32_t size = sizeof data;

  if (KRAL_NV_GetNVValueByteStreamByNVID(handle, 453, 0, data, &size) == 0) {
    KRAL_NV_SetNVValueByteStreamByNVID(handle, 453, 0, data, size);
  }
  size = sizeof data;
  if (KRAL_NV_GetNVValueByteStreamByIndex(handle, 0, 0, data, &size) == 0) {
    KRAL_NV_SetNVValueByteStreamByIndex(handle, 0, 0, data, size);
  }
  KRAL_NV_ClearNVValueByNVID(handle, 453);
  //! [Values as bytes]
}

//! [Sets: from a handset into files, and back]
static void KRAL_CALL show_item(uint32_t operation, uint32_t done, uint32_t total, const char *item, uint32_t status,
                                KRAL_HANDLE handle) {
  fprintf(stderr, "%u, %u: %s, %u of %u", (unsigned)handle, (unsigned)operation, item, (unsigned)done, (unsigned)total);
  fprintf(stderr, status == 0 ? "\n" : " failed with %u\n", (unsigned)status);
}

void copy_values(KRAL_HANDLE from, KRAL_HANDLE to) {
  KRAL_NV_ConfigureCallBack(from, show_item);
  if (KRAL_NV_LoadReadFilter(from, "calibration_items.xml") == 0 && KRAL_NV_LoadNVsFromMobile(from) == 0) {
    KRAL_NV_WriteNVsToSource(from, "values.xml"); /* to be edited */
    KRAL_NV_WriteNVsToPKV(from, "values.pkv");
    KRAL_NV_GenerateQDF(from, "values.txt"); /* to be read */
  }
  KRAL_NV_ClearReadFilters(from);

  KRAL_NV_ClearNVValues(to);
  if (KRAL_NV_LoadNVsFromSource(to, "values.xml") == 0 || KRAL_NV_LoadNVsFromPKV(to, "values.pkv") == 0) {
    KRAL_NV_LoadWriteFilter(to, "calibration_items.xml");
    if (KRAL_NV_WriteNVsToMobile(to) == 11) fprintf(stderr, "it refused some; the others are written\n");
    KRAL_NV_ClearWriteFilters(to);
  }
}
//! [Sets: from a handset into files, and back]

void make_filters(KRAL_HANDLE handle) {
  //! [Filters from what has a value]
  KRAL_NV_CreateNVFilter(handle, "has_a_value.xml");
  KRAL_NV_CreateComplementNVFilter(handle, "has_none.xml");
  //! [Filters from what has a value]
}

void subscriptions(KRAL_HANDLE handle) {
  //! [Values of another subscription]
  uint16_t current;
  KRAL_NV_SetTargetSupportMultiSIM(handle, 1);
  KRAL_NV_SetCurrentSubscriptionIndex(handle, 1);
  if (KRAL_NV_GetCurrentSubscriptionIndex(handle, &current) == 0) printf("subscription %u\n", current);
  KRAL_NV_LoadNVsFromMobile(handle);
  //! [Values of another subscription]
}

void compare_backups(KRAL_HANDLE handle) {
  //! [What differs between two backups]
  if (KRAL_NV_PKV_Diff(handle, "before.pkv", "after.pkv", "difference.html") == 0) puts("see difference.html");
  //! [What differs between two backups]
}
