#include "platform/signals.h"

#include <pthread.h>

#include <cerrno>
#include <csignal>
#include <ctime>

namespace kral {
namespace {

// Signals that are blocked on the calling thread beside those that are already.
class BlockedSignals {
 public:
  explicit BlockedSignals(const sigset_t& signals) { pthread_sigmask(SIG_BLOCK, &signals, &before_); }
  ~BlockedSignals() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
  BlockedSignals(const BlockedSignals&) = delete;
  BlockedSignals& operator=(const BlockedSignals&) = delete;

  bool WasBlocked(int signal) const { return sigismember(&before_, signal) == 1; }

 private:
  sigset_t before_;
};

// Takes the signal that the calling thread has been sent.
void TakePending(const sigset_t& signals) {
  const timespec at_once{};
  while (sigtimedwait(&signals, nullptr, &at_once) == -1 && errno == EINTR) {
  }
}

}  // namespace

void CallWithSignalsBlocked(const std::function<void()>& start) {
  sigset_t signals;
  sigfillset(&signals);
  for (const int fault : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS}) sigdelset(&signals, fault);
  // Runtimes that collect garbage stop each thread that has run their code with one of these, and wait until it has.
  for (const int stop : {SIGPWR, SIGXCPU}) sigdelset(&signals, stop);
  for (int real_time = SIGRTMIN; real_time <= SIGRTMAX; ++real_time) sigdelset(&signals, real_time);
  const BlockedSignals blocked(signals);
  start();
}

void CallWithoutPipeSignal(const std::function<void()>& write) {
  sigset_t pipe;
  sigemptyset(&pipe);
  sigaddset(&pipe, SIGPIPE);
  const BlockedSignals blocked(pipe);
  write();
  // Where it was blocked before, one that is pending may be the host's own.
  sigset_t pending;
  if (blocked.WasBlocked(SIGPIPE) || sigpending(&pending) != 0 || sigismember(&pending, SIGPIPE) != 1) return;
  TakePending(pipe);
}

}  // namespace kral
