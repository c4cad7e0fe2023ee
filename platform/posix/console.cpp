// The terminal on Linux.
#include "platform/console.h"

#include <signal.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "platform/posix/poll_wait.h"

namespace kral {
namespace {

constexpr int kDefaultWidth = 80;
constexpr int kDefaultHeight = 24;
constexpr int kInterrupted = 130;

// A signal handler reaches nothing but process-wide lock-free state.
std::atomic<std::atomic<bool>*> interrupt_flag{nullptr};
static_assert(std::atomic<std::atomic<bool>*>::is_always_lock_free && std::atomic<bool>::is_always_lock_free);

void OnSignal(int number) {
  std::atomic<bool>* flag = interrupt_flag.load();
  if (flag == nullptr) ::_exit(kInterrupted);
  // Kernel and shell both tell of a closed terminal.
  if (flag->exchange(true) && number != SIGHUP) ::_exit(kInterrupted);
}

int Descriptor(StandardStream stream) {
  switch (stream) {
    case StandardStream::kInput:
      return STDIN_FILENO;
    case StandardStream::kOutput:
      return STDOUT_FILENO;
    default:
      return STDERR_FILENO;
  }
}

}  // namespace

bool IsTerminal(StandardStream stream) {
  return ::isatty(Descriptor(stream)) != 0;
}

int TerminalWidth(StandardStream stream) {
  winsize size{};
  if (::ioctl(Descriptor(stream), TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kDefaultWidth;
  return size.ws_col;
}

int TerminalHeight(StandardStream stream) {
  winsize size{};
  if (::ioctl(Descriptor(stream), TIOCGWINSZ, &size) != 0 || size.ws_row == 0) return kDefaultHeight;
  return size.ws_row;
}

bool ObeysCursorSequences(StandardStream stream) {
  const char* const kind = std::getenv("TERM");
  return IsTerminal(stream) && kind != nullptr && std::string_view(kind) != "dumb";
}

std::vector<std::string> ProgramArguments(int count, char** values) {
  return {values + std::min(count, 1), values + count};
}

// The terminal's encoding is its owner's choice.
Utf8Terminal::Utf8Terminal() = default;
Utf8Terminal::~Utf8Terminal() = default;

void UseBinaryOutput() {}  // they always do

bool ReadStandardInput(size_t limit, std::vector<uint8_t>& bytes) {
  constexpr uint32_t kLookAroundMs = 100;
  std::array<uint8_t, 65536> piece{};
  std::array<pollfd, 1> input{{{STDIN_FILENO, POLLIN, 0}}};
  for (;;) {
    const auto* const flag = interrupt_flag.load();
    if (flag != nullptr && *flag) return false;
    if (!PollFor(input, kLookAroundMs)) continue;
    const auto count = ::read(STDIN_FILENO, piece.data(), piece.size());
    if (count <= 0) return count == 0;
    if (static_cast<size_t>(count) > limit - bytes.size()) return false;
    bytes.insert(bytes.end(), piece.begin(), piece.begin() + count);
  }
}

void CatchInterrupts(std::atomic<bool>* flag) {
  interrupt_flag = flag;
  struct sigaction action {};
  if (flag != nullptr) {
    action.sa_handler = OnSignal;
  } else {
    action.sa_handler = SIG_DFL;
  }
  // A write that waits for a slow reader is no failure. Whoever waits for long looks at the flag.
  action.sa_flags = SA_RESTART;
  ::sigaction(SIGINT, &action, nullptr);
  ::sigaction(SIGTERM, &action, nullptr);
  struct sigaction former {};
  if (::sigaction(SIGHUP, nullptr, &former) == 0 && former.sa_handler != SIG_IGN) {
    ::sigaction(SIGHUP, &action, nullptr);
  }
}

void OutliveClosedPipes() {
  ::signal(SIGPIPE, SIG_IGN);
}

}  // namespace kral
