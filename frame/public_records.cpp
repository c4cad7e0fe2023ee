// The records that callers share with the library: their sizes are the same on all platforms and under every packing.
// Here and not in the headers, which other languages read.
#include "kral/kral.h"

static_assert(sizeof(KRAL_ERROR) == 360);
static_assert(sizeof(KRAL_EFS_ENTRY) == 536);
static_assert(sizeof(KRAL_EFS_STATFS) == 36);
static_assert(sizeof(KRAL_EFS_DEVICE_INFO) == 92);
static_assert(sizeof(KRAL_EVENT) == 268);
static_assert(sizeof(KRAL_IMAGE_INFO) == 28);
static_assert(sizeof(KRAL_PORT_INFO) == 596);
static_assert(sizeof(KRAL_PKV_COUNTS) == 28);
static_assert(sizeof(KRAL_PKV_ITEM) == 16);
static_assert(sizeof(KRAL_TRAFFIC_COUNTERS) == 120);
static_assert(sizeof(KRAL_TRACE_COUNTERS) == 48);
static_assert(sizeof(KRAL_VENTRIMS_OPTIONS) == 36);
static_assert(sizeof(KRAL_VENTRIMS_STATE) == 56);
static_assert(sizeof(KRAL_VENTRIMS_PROGRESS) == 264);
static_assert(sizeof(KRAL_VENTRIMS_RESULT) == 632);
