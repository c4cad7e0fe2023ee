// Calls of the caller's functions, which may do anything.
#ifndef KRAL_BASE_GUARDED_CALL_H
#define KRAL_BASE_GUARDED_CALL_H

#include "platform/forced_unwind.h"

namespace kral {

// Each call of a caller's function is guarded alone: an exception out of it stays here, and costs nobody what comes
// after the call. False after one. What does not stay is the end of the thread (see PassForcedUnwind), and an exception
// of another language's, which cannot be told from it.
template <class Call>
bool CallGuarded(Call&& call) {
  if (IsThreadEnding()) return false;
  try {
    call();
    return true;
  } catch (...) {
    PassForcedUnwind();
    return false;
  }
}

}  // namespace kral

#endif
