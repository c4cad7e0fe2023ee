// Ctrl-C and termination requests: the first one asks the running verb to stop, the second ends the process.
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
