// The end of a thread that its host is ending, on its way through our frames.
#ifndef KRAL_PLATFORM_FORCED_UNWIND_H
#define KRAL_PLATFORM_FORCED_UNWIND_H

namespace kral {

// Stands first in every catch (...) behind which a function of the caller's may run. A host can end a thread inside its
// function (on POSIX by pthread_exit or pthread_cancel, as an interpreter does that is going down): the stack is then
// unwound through ours, which looks like an exception, and the process is aborted where that is swallowed. So it goes
// on from here; for every exception this returns.
void PassForcedUnwind();

// Whether that has happened to this thread: it calls no function of the caller's any more.
bool IsThreadEnding();

}  // namespace kral

#endif
