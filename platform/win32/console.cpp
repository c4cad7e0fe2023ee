// The console on Windows.
#include "platform/console.h"

#include <fcntl.h>
#include <io.h>
#include <unistd.h>
#include <windows.h>

#include <array>
#include <cstdio>

#include "platform/win32/wide_text.h"

// Of the C runtime, declared in no header: what the start of a program with wide arguments calls.
extern "C" __declspec(dllimport) int __cdecl __wgetmainargs(int* count, wchar_t*** values, wchar_t*** environment,
                                                            int expand_wildcards, int* new_mode);

namespace kral {
namespace {

constexpr int kDefaultWidth = 80;
constexpr int kDefaultHeight = 24;
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

int TerminalHeight(StandardStream stream) {
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (!::GetConsoleScreenBufferInfo(Handle(stream), &info)) return kDefaultHeight;
  return info.srWindow.Bottom - info.srWindow.Top + 1;
}

// Older ones do not know the mode.
bool ObeysCursorSequences(StandardStream stream) {
  DWORD mode = 0;
  return ::GetConsoleMode(Handle(stream), &mode) != 0 &&
         ::SetConsoleMode(Handle(stream), mode | ENABLE_VIRTUAL_TERMINAL_PROCESSING) != 0;
}

// Not those that are given: they have been through the ANSI code page, which knows few characters.
std::vector<std::string> ProgramArguments(int, char**) {
  int count = 0;
  wchar_t** values = nullptr;
  wchar_t** environment = nullptr;
  int new_mode = 0;
  ::__wgetmainargs(&count, &values, &environment, 0, &new_mode);
  std::vector<std::string> arguments;
  for (int i = 1; i < count; ++i) arguments.push_back(Utf8Text(values[i]));
  return arguments;
}

Utf8Terminal::Utf8Terminal() : former_(::GetConsoleOutputCP()) {
  ::SetConsoleOutputCP(CP_UTF8);
}

Utf8Terminal::~Utf8Terminal() {
  if (former_ != 0) ::SetConsoleOutputCP(former_);
}

void UseBinaryOutput() {
  ::_setmode(STDOUT_FILENO, _O_BINARY);
}

bool ReadStandardInput(size_t limit, std::vector<uint8_t>& bytes) {
  ::_setmode(STDIN_FILENO, _O_BINARY);
  std::array<uint8_t, 65536> piece{};
  while (const size_t count = std::fread(piece.data(), 1, piece.size(), stdin)) {
    if (count > limit - bytes.size()) return false;
    bytes.insert(bytes.end(), piece.begin(), piece.begin() + static_cast<std::ptrdiff_t>(count));
  }
  return std::ferror(stdin) == 0;
}

void CatchInterrupts(std::atomic<bool>* flag) {
  interrupt_flag = flag;
  ::SetConsoleCtrlHandler(OnControl, flag != nullptr);
}

void OutliveClosedPipes() {}  // they never end a program

}  // namespace kral
