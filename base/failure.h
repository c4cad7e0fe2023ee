// Why an exported call fails. Whoever knows it says so, where it happens:
//
//   if (size > kLongest) return Fail(Failure(KRAL_ERROR_ARGUMENT, "a path of %zu bytes is too long", size));
//
// The exported call that is under way on this thread keeps what was said last, and hands it to KRAL_GetLastError when
// it fails. So:
//   - say it once, at the place that knows most; whoever only passes a failure on adds nothing;
//   - a failure that is overcome (a retry, another way) may have been said: a call that succeeds leaves no record;
//   - clean-up behind a failure that may fail itself (closing a handle of the handset) runs under a KeepFailure;
//   - of many steps that may fail, one that is got over, or matters less, is taken back to a FailureMark;
//   - a thread of the library's own has no call under way: it carries what it found to the thread that has.
#ifndef KRAL_BASE_FAILURE_H
#define KRAL_BASE_FAILURE_H

#include <cstdint>
#include <span>
#include <string_view>
#include <system_error>

#include "kral/error.h"

namespace kral {

// A record in the making. The text is one sentence without a full stop that names what was wrong.
class Failure {
 public:
  [[gnu::format(gnu_printf, 3, 4)]] Failure(uint32_t code, const char* format, ...);

  Failure& Status(uint32_t kind, uint32_t status);  // what the handset said
  Failure& System(uint32_t error);                  // errno or GetLastError()
  Failure& System(const std::error_code& error);
  Failure& Command(std::span<const uint8_t> request);
  Failure& Offset(uint64_t offset);
  Failure& Line(uint32_t line);

  const KRAL_ERROR& record() const { return record_; }

 private:
  KRAL_ERROR record_{};
};

// Notes it for the exported call under way on this thread, if there is one. Always false, for `return Fail(...)`.
bool Fail(const Failure& failure) noexcept;

// The code of what the call under way has noted last. KRAL_ERROR_NONE where it has noted nothing, or none is under way.
uint32_t NotedFailure() noexcept;

// A file of this machine: "cannot be read", "cannot be written", ...
Failure FileFailure(std::string_view file, const char* what, uint32_t system_error = 0);

// While it lives, the failure that was noted before it stays.
class KeepFailure {
 public:
  KeepFailure() noexcept;
  ~KeepFailure();
  KeepFailure(const KeepFailure&) = delete;
  KeepFailure& operator=(const KeepFailure&) = delete;

 private:
  bool keeps_;
};

// What was noted up to here by the call under way, for what follows to be taken back to.
class FailureMark {
 public:
  FailureMark() noexcept;
  void GoBack() const noexcept;  // on the same thread, before the call ends

 private:
  KRAL_ERROR record_;
  bool noted_;
};

// One exported call on the thread that makes it. Calls nest: a callback may call into the library.
class CallFailure {
 public:
  CallFailure() noexcept;
  ~CallFailure();
  CallFailure(const CallFailure&) = delete;
  CallFailure& operator=(const CallFailure&) = delete;

  bool noted() const { return noted_; }
  // What was noted last; for the thread that made the call.
  const KRAL_ERROR& record() const { return record_; }

 private:
  friend bool Fail(const Failure& failure) noexcept;
  friend class KeepFailure;
  friend class FailureMark;

  CallFailure* const outer_;
  bool noted_ = false;
  uint32_t keepers_ = 0;
  KRAL_ERROR record_;  // once noted
};

// The phrase of a KRAL_ERROR_ code; empty for an unknown one.
std::string_view ErrorPhrase(uint32_t code);

}  // namespace kral

#endif
