// Keeps the flag that Ctrl-C sets; verbs look at it between library calls.
#include "tools/kral/interrupt.h"

#include <atomic>

#include "platform/console.h"

namespace kral::tool {
namespace {

std::atomic<bool> interrupted{false};

}  // namespace

void CatchInterrupts() {
  kral::CatchInterrupts(&interrupted);
  OutliveClosedPipes();
}

bool Interrupted() {
  return interrupted;
}

ToolError InterruptedError() {
  return {ExitCode::kInterrupted, "interrupted", "run the command again when ready"};
}

void ThrowIfInterrupted() {
  if (Interrupted()) throw InterruptedError();
}

}  // namespace kral::tool
