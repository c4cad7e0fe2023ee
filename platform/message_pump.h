// Keeps a host's window messages flowing while the library waits on the host's thread.
#ifndef KRAL_PLATFORM_MESSAGE_PUMP_H
#define KRAL_PLATFORM_MESSAGE_PUMP_H

namespace kral {

// Dispatches the messages waiting for the calling thread; nothing to do on Linux.
void PumpPendingMessages();

}  // namespace kral

#endif
