// What every exported function is made of: the log line, the handle (resolved once), the per-handset lock, the record
// of a failure, the no-exception rule.
//
//   return ExportCall(handle, __func__).Run(diag::ReadSerialNumber, serial);
//   return ExportCall(handle, __func__).Logged("( iChannel = %d )", channel).Run(ftm::SetChannel, channel);
//
// The line is written when the operation is run, before the lock is waited for. Every form gives 0, or what stands for
// it, for an unknown handle and after an exception; outputs are then untouched.
#ifndef KRAL_FRAME_EXPORT_CALL_H
#define KRAL_FRAME_EXPORT_CALL_H

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>

#include "base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/types.h"
#include "platform/forced_unwind.h"

namespace kral {

// The reason of every function that misses one.
inline constexpr const char* kNoFileName = "there is no file name";

class ExportCall {
 public:
  // A function without a handle: its failures are found under handle 0, and nothing is logged.
  explicit ExportCall(const char* function) noexcept;
  ExportCall(KRAL_HANDLE handle, const char* function) noexcept;
  ~ExportCall();
  ExportCall(const ExportCall&) = delete;
  ExportCall& operator=(const ExportCall&) = delete;

  // The line shows another name than the function's own.
  ExportCall& Named(const char* name) noexcept;
  // The line goes on behind the name; written only while logging is started.
  [[gnu::format(gnu_printf, 2, 3)]] ExportCall& Logged(const char* format, ...);
  // No line: what follows writes its own, or none.
  ExportCall& Unlogged() noexcept;

  // Runs operation(phone, arguments...) under the request lock of the handset: 1 when it gives true.
  template <class Operation, class... Arguments>
  uint8_t Run(Operation&& operation, Arguments&&... arguments) {
    return Result(uint8_t{0}, uint8_t{0}, uint8_t{1}, [&](Diag_FTM& phone) -> uint8_t {
      const Diag_FTM::Call call(phone);
      return std::invoke(operation, phone, std::forward<Arguments>(arguments)...) ? 1 : 0;
    });
  }

  // The same without the request lock: abort, text-log, queue and time-out calls must not wait for a running request.
  template <class Operation, class... Arguments>
  uint8_t RunAtOnce(Operation&& operation, Arguments&&... arguments) {
    return Result(uint8_t{0}, uint8_t{0}, uint8_t{1}, [&](Diag_FTM& phone) -> uint8_t {
      return std::invoke(operation, phone, std::forward<Arguments>(arguments)...) ? 1 : 0;
    });
  }

  // operation(phone) gives a result of its own, without the request lock. Anything but `passed` is recorded as a
  // failure.
  template <class Value, class Operation>
  Value Result(Value unknown_handle, Value threw, Value passed, Operation&& operation) {
    if (!Begin()) return unknown_handle;
    return Judged(threw, passed, [&] { return operation(*phone_); });
  }

  // The same without a phone object: for a function without a handle, or one that has a use for a handle without one.
  template <class Value, class Operation>
  Value Alone(Value failed, Value passed, Operation&& operation) {
    WriteName();
    if (!IsPermitted()) return failed;
    return Judged(failed, passed, std::forward<Operation>(operation));
  }

  // For the connect functions: operation() gives a handle, and 0 is a failure.
  template <class Operation>
  KRAL_HANDLE Connecting(Operation&& operation) {
    KRAL_HANDLE handle = 0;
    Alone(false, true, [&] {
      handle = operation();
      return handle != 0;
    });
    return handle;
  }

  // A result of 0 is an answer: recorded only with a failure that was noted.
  ExportCall& Answering() noexcept;

  // Unless it holds, nothing is done but the line: the failure is an argument's, "there is no response buffer".
  ExportCall& Require(bool holds, const char* otherwise) noexcept;

 private:
  template <class Value, class Operation>
  Value Judged(Value failed, Value passed, Operation&& operation) {
    try {
      const Value value = operation();
      if (value != passed) Failed();
      return value;
    } catch (...) {
      PassForcedUnwind();  // a caller's thread may end inside a callback
      Threw();
      return failed;
    }
  }

  void WriteName();
  void WriteEntry(const char* rest);  // name and rest of the line
  bool Begin();                       // the line; false, with the failure recorded, when nothing is to be done
  bool IsPermitted() noexcept;        // by what was required
  void Failed() noexcept;             // records what was noted
  void Threw() noexcept;

  const KRAL_HANDLE handle_;
  const char* const function_;
  const char* name_;
  bool has_line_ = true;
  bool answering_ = false;
  const char* otherwise_ = nullptr;  // what was required and does not hold
  std::shared_ptr<Diag_FTM> phone_;
  CallFailure failure_;
};

Failure UnknownHandle(KRAL_HANDLE handle);

}  // namespace kral

#endif
