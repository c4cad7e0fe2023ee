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

// From now on Ctrl-C, a polite request to end and the closing of the terminal set `flag` instead of ending the program;
// a second Ctrl-C or request ends it with exit code 130. (A closed terminal says so more than once. One that a program
// was told to outlive, by nohup, says nothing.) Null gives the default back. `flag` must outlive that.
void CatchInterrupts(std::atomic<bool>* flag);

// From now on what is written to a pipe that nobody reads any more is a failed write and not the end of the program.
void OutliveClosedPipes();

}  // namespace kral

#endif
