// Ctrl-C, termination requests and a closed terminal: the first one asks the running verb to stop, a second request
// ends the process. A closed pipe ends nothing by itself: the write fails.
#ifndef KRAL_TOOLS_INTERRUPT_H
#define KRAL_TOOLS_INTERRUPT_H

#include "tools/kral/exit_codes.h"

namespace kral::tool {

void CatchInterrupts();
bool Interrupted();
ToolError InterruptedError();
void ThrowIfInterrupted();

}  // namespace kral::tool

#endif
