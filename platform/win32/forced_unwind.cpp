#include "platform/forced_unwind.h"

namespace kral {

// A thread that ends here is not unwound.
void PassForcedUnwind() {}

bool IsThreadEnding() {
  return false;
}

}  // namespace kral
