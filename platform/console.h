// The terminal a command-line program talks through.
#ifndef KRAL_PLATFORM_CONSOLE_H
#define KRAL_PLATFORM_CONSOLE_H

#include <atomic>

namespace kral {

enum class StandardStream { kInput, kOutput, kError };

bool IsTerminal(StandardStream stream);
int TerminalWidth(StandardStream stream);  // columns; 80 when it is no terminal

// Bytes written to the standard output come out as they are, line ends included.
void UseBinaryOutput();

// From now on Ctrl-C and a polite request to end set `flag` instead of ending the program; the second one ends it
// with exit code 130. Null gives the default back. `flag` must outlive that.
void CatchInterrupts(std::atomic<bool>* flag);

}  // namespace kral

#endif
