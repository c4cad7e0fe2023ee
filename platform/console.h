// The terminal a command-line program talks through.
#ifndef KRAL_PLATFORM_CONSOLE_H
#define KRAL_PLATFORM_CONSOLE_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace kral {

enum class StandardStream { kInput, kOutput, kError };

bool IsTerminal(StandardStream stream);
int TerminalWidth(StandardStream stream);   // columns; 80 when it is no terminal
int TerminalHeight(StandardStream stream);  // lines; 24 when it is none
// A terminal on which "ESC [ 3 A" leads three lines up.
bool ObeysCursorSequences(StandardStream stream);

// What the program was started with, behind its own name, in UTF-8.
std::vector<std::string> ProgramArguments(int count, char** values);

// A terminal that shows UTF-8, for as long as this lives.
class Utf8Terminal {
 public:
  Utf8Terminal();
  ~Utf8Terminal();
  Utf8Terminal(const Utf8Terminal&) = delete;
  Utf8Terminal& operator=(const Utf8Terminal&) = delete;

 private:
  [[maybe_unused]] unsigned former_ = 0;  // Windows only
};

// Bytes written to the standard output come out as they are, line ends included.
void UseBinaryOutput();
// All that comes on the standard input, until its end; false where it is more than so many bytes, and when the flag of
// CatchInterrupts is set meanwhile.
bool ReadStandardInput(size_t limit, std::vector<uint8_t>& bytes);

// From now on Ctrl-C, a polite request to end and the closing of the terminal set `flag` instead of ending the program;
// a second Ctrl-C or request ends it with exit code 130. (A closed terminal says so more than once. One that a program
// was told to outlive, by nohup, says nothing.) Null gives the default back. `flag` must outlive that.
void CatchInterrupts(std::atomic<bool>* flag);

// From now on what is written to a pipe that nobody reads any more is a failed write and not the end of the program.
void OutliveClosedPipes();

}  // namespace kral

#endif
