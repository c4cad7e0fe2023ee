// Signals of the process in which the library is a guest: it neither handles them nor lets its own work raise them.
#ifndef KRAL_PLATFORM_SIGNALS_H
#define KRAL_PLATFORM_SIGNALS_H

#include <functional>

namespace kral {

// A thread that `start` makes runs none of the host's signal handlers, which expect to be on a thread of the host.
// Faults are left out: they are handled where they happen. So are the signals by which a host's runtime stops threads
// that have called into it.
void CallWithSignalsBlocked(const std::function<void()>& start);

// What `write` writes to a pipe that nobody reads any more is a failed write, and not the end of the process.
void CallWithoutPipeSignal(const std::function<void()>& write);

}  // namespace kral

#endif
