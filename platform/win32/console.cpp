// The console on Windows.
#include "platform/console.h"

#include <fcntl.h>
#include <io.h>
#include <unistd.h>
#include <windows.h>

namespace kral {
namespace {

constexpr int kDefaultWidth = 80;
constexpr UINT kInterrupted = 130;

// The system calls the handler on a thread of its own, without an argument to carry this.
std::atomic<std::atomic<bool>*> interrupt_flag{nullptr};

BOOL WINAPI OnControl(DWORD event) {
  std::atomic<bool>* flag = interrupt_flag.load();
  if (flag == nullptr) return FALSE;
  const bool was_set = flag->exchange(true);
  const bool is_key = event == CTRL_C_EVENT || event == CTRL_BREAK_EVENT;
  // A closed window, a log-off: the program is ended when this returns, or after some seconds. Its own end comes first.
  if (!is_key) ::Sleep(INFINITE);
  if (was_set) ::ExitProcess(kInterrupted);
  return TRUE;
}

HANDLE Handle(StandardStream stream) {
  switch (stream) {
    case StandardStream::kInput:
      return ::GetStdHandle(STD_INPUT_HANDLE);
    case StandardStream::kOutput:
      return ::GetStdHandle(STD_OUTPUT_HANDLE);
    default:
      return ::GetStdHandle(STD_ERROR_HANDLE);
  }
}

}  // namespace

bool IsTerminal(StandardStream stream) {
  DWORD mode = 0;
  return ::GetConsoleMode(Handle(stream), &mode) != 0;
}

int TerminalWidth(StandardStream stream) {
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (!::GetConsoleScreenBufferInfo(Handle(stream), &info)) return kDefaultWidth;
  return info.srWindow.Right - info.srWindow.Left + 1;
}

void UseBinaryOutput() {
  ::_setmode(STDOUT_FILENO, _O_BINARY);
}

void CatchInterrupts(std::atomic<bool>* flag) {
  interrupt_flag = flag;
  ::SetConsoleCtrlHandler(OnControl, flag != nullptr);
}

void OutliveClosedPipes() {}  // they never end a program

}  // namespace kral
