// Linux threads have no window messages.
#include "platform/message_pump.h"

namespace kral {

void PumpPendingMessages() {}

}  // namespace kral
