// Windows offers no serial line made of software without a driver; its handsets come through the caller's functions.
#include "platform/pseudo_terminal.h"

namespace kral {

std::unique_ptr<PseudoTerminal> OpenPseudoTerminal(std::string& error) {
  error = "no pseudo terminal: Windows has none; use a pair of linked COM ports, or the caller-supplied transport";
  return nullptr;
}

}  // namespace kral
