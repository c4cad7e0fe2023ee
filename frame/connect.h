// The ways of connecting to a handset, and of letting go of it.
#ifndef KRAL_FRAME_CONNECT_H
#define KRAL_FRAME_CONNECT_H

#include <cstdint>

#include "frame/diag_ftm.h"
#include "kral/types.h"

namespace kral {

// The handle, whether or not the port opened; 0 when there is no context for it. `function` is the exported one.
KRAL_HANDLE Connect(const char* function, uint16_t port, OpenArguments arguments);

// 0 also when the port does not open.
KRAL_HANDLE ConnectWithVerify(uint16_t port);

// Tries until the handset answers or the time is up.
KRAL_HANDLE ConnectWithWait(uint16_t port, uint32_t wait_ms, Clock& clock = SystemClock());

void Disconnect(KRAL_HANDLE handle);

}  // namespace kral

#endif
