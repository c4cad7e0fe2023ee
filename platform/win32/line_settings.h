// The line settings and time-outs of a COM port. All functions give 0 or the system's error code.
#ifndef KRAL_PLATFORM_WIN32_LINE_SETTINGS_H
#define KRAL_PLATFORM_WIN32_LINE_SETTINGS_H

#include <windows.h>

#include <cstdint>

namespace kral {

// Raw bytes, 8 data bits, no parity, one stop bit, no flow control.
DWORD ApplyLineSettings(HANDLE port, uint32_t baud_rate);

DWORD ChangeBaudRate(HANDLE port, uint32_t baud_rate);

// Reads return at once with what the driver holds; writes end after 1 ms per byte and 50 ms.
DWORD ApplyTimeOuts(HANDLE port);

// A read returns at once when the driver holds bytes, and otherwise as soon as the first ones come.
DWORD ApplyWaitingTimeOuts(HANDLE port);

}  // namespace kral

#endif
