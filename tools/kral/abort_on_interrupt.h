// Ends the library's work with files of the handset when the tool is interrupted.
#ifndef KRAL_TOOLS_ABORT_ON_INTERRUPT_H
#define KRAL_TOOLS_ABORT_ON_INTERRUPT_H

#include <stop_token>
#include <thread>

#include "kral/kral.h"

namespace kral::tool {

// As long as it lives. A silent handset brings no callback in which Ctrl-C could be seen: a thread of its own looks.
class AbortOnInterrupt {
 public:
  explicit AbortOnInterrupt(KRAL_HANDLE handle);

 private:
  static void Watch(const std::stop_token& stop, KRAL_HANDLE handle);

  std::jthread thread_;
};

}  // namespace kral::tool

#endif
