/**
 * @file kral.hpp
 * The interface for C++17: connections and jobs that release themselves, and failures as exceptions. Header-only, over
 * kral.h.
 *
 *     kral::Connection phone(7);                            // COM7; throws when no handset answers
 *     std::uint32_t serial = 0;
 *     phone.Call(KRAL_DIAG_READ_ESN_F, &serial);            // any function that takes the handle first
 *
 * Functions whose 0 is an answer (their text says so) and those of nv_tool.h, whose 0 is success, have calls of their
 * own: Ask and CallTool.
 */
#ifndef KRAL_KRAL_HPP
#define KRAL_KRAL_HPP

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "kral/kral.h"

namespace kral {

/** A call failed; the record says why. */
class Error : public std::runtime_error {
 public:
  explicit Error(const KRAL_ERROR& record) : std::runtime_error(record.text), record_(record) {}

  const KRAL_ERROR& record() const { return record_; }
  /** One of the KRAL_ERROR_ codes. */
  std::uint32_t code() const { return record_.code; }
  /** What the handset itself said, if it did. */
  std::optional<std::uint32_t> status() const {
    if (record_.status_kind == KRAL_ERROR_STATUS_NONE) return std::nullopt;
    return record_.status;
  }

  /** The failure of this thread's last failed call on a handle; of one without a handle for 0. */
  static Error Last(KRAL_HANDLE handle) {
    KRAL_ERROR record = {};
    return KRAL_GetLastError(handle, &record) ? Error(record) : Error("the call failed, and left no reason");
  }

 private:
  friend class Attempt;
  explicit Error(const std::string& text) : std::runtime_error(text), record_() {
    record_.code = KRAL_ERROR_INTERNAL;
    text.copy(record_.text, sizeof record_.text - 1);
  }

  KRAL_ERROR record_;
};

/** A call that is to be made on a handle: tells its failure, and never that of an earlier one or of another thread's.
 */
class Attempt {
 public:
  explicit Attempt(KRAL_HANDLE handle) : handle_(handle), before_(Number()) {}

  /** Whether a call has failed since. */
  bool HasFailed() const { return Number() != before_; }

  Error Failure() const { return HasFailed() ? Error::Last(handle_) : Error("the call failed, and left no reason"); }

  /** The failure of a function whose result is an error code of nv_tool.h. */
  Error FailureOfTool(std::uint32_t result) const {
    if (HasFailed()) return Error::Last(handle_);
    KRAL_ERROR record = {};
    record.code = KRAL_ERROR_INTERNAL;
    record.status_kind = KRAL_ERROR_STATUS_RESULT;
    record.status = result;
    KRAL_NV_GetErrorText(0, result, record.text, sizeof record.text);
    return Error(record);
  }

 private:
  std::uint32_t Number() const {
    KRAL_ERROR record = {};
    const bool own = KRAL_GetLastError(handle_, &record) && (record.present & KRAL_ERROR_OF_OTHER_THREAD) == 0;
    return own ? record.number : 0;
  }

  KRAL_HANDLE handle_;
  std::uint32_t before_;
};

/** An argument of a function's own type: numbers are converted where they are written, as in a call of the function. */
template <class Type>
struct ArgumentOf {
  using type = Type;
};
template <class Type>
using Argument = typename ArgumentOf<Type>::type;

/** Calls a function without a handle that returns 1 for success. Throws when it returns 0. */
template <class... Types>
void Call(std::uint8_t(KRAL_CALL* function)(Types...), Argument<Types>... arguments) {
  const Attempt attempt(0);
  if (!function(arguments...)) throw attempt.Failure();
}

/** What connections and jobs have in common: functions take their handle first. 0 when it has been moved from. */
class Handle {
 public:
  Handle(const Handle&) = delete;
  Handle& operator=(const Handle&) = delete;

  KRAL_HANDLE handle() const { return handle_; }

  /** Calls a function that takes the handle first and returns 1 for success. Throws when it returns 0. */
  template <class... Types>
  void Call(std::uint8_t(KRAL_CALL* function)(KRAL_HANDLE, Types...), Argument<Types>... arguments) const {
    const Attempt attempt(handle_);
    if (!function(handle_, arguments...)) throw attempt.Failure();
  }

  /** Calls one whose result is an answer, 1 for yes and 0 for no. */
  template <class... Types>
  bool Ask(std::uint8_t(KRAL_CALL* function)(KRAL_HANDLE, Types...), Argument<Types>... arguments) const {
    return function(handle_, arguments...) != 0;
  }

  /** Calls one of nv_tool.h, whose result is an error code. Throws unless that is 0. */
  template <class... Types>
  void CallTool(std::uint32_t(KRAL_CALL* function)(KRAL_HANDLE, Types...), Argument<Types>... arguments) const {
    const Attempt attempt(handle_);
    if (const std::uint32_t result = function(handle_, arguments...)) throw attempt.FailureOfTool(result);
  }

 protected:
  explicit Handle(KRAL_HANDLE handle) : handle_(handle) {}
  Handle(Handle&& other) noexcept : handle_(std::exchange(other.handle_, 0)) {}
  ~Handle() = default;

 private:
  KRAL_HANDLE handle_;
};

/** Who is told how far downloads have come. Connections to one port share their handle, and it has one callback. */
class DownloadListeners {
 public:
  using Function = std::function<void(std::uint32_t, std::uint32_t)>;
  using Listener = std::shared_ptr<const Function>;

  /** Puts one in the place of another; either may be null. One that is being told lives until it returns. */
  static void Replace(KRAL_HANDLE handle, const Listener& old, const Listener& next) {
    State& state = Shared();
    const std::lock_guard<std::recursive_mutex> lock(state.mutex);
    const auto range = state.listeners.equal_range(handle);
    for (auto it = range.first; it != range.second; ++it) {
      if (it->second != old) continue;
      state.listeners.erase(it);
      break;
    }
    if (next) state.listeners.emplace(handle, next);
    KRAL_ConfigureDownloadCallBack(handle, state.listeners.count(handle) != 0 ? &DownloadListeners::Tell : nullptr, 0);
  }

 private:
  struct State {
    std::recursive_mutex mutex;  // lines of the text log may lead back here
    std::multimap<KRAL_HANDLE, Listener> listeners;
  };

  // Never destroyed: connections may be, later than it would.
  static State& Shared() {
    static State* const state = new State;
    return *state;
  }

  static void KRAL_CALL Tell(KRAL_HANDLE handle, std::uint32_t done, std::uint32_t total, std::uintptr_t) {
    std::vector<Listener> told;
    {
      State& state = Shared();
      const std::lock_guard<std::recursive_mutex> lock(state.mutex);
      const auto range = state.listeners.equal_range(handle);
      for (auto it = range.first; it != range.second; ++it) told.push_back(it->second);
    }
    for (const Listener& listener : told) {
      try {
        (*listener)(done, total);
      } catch (...) {
        // The library is C, and the others are to be told as well.
      }
    }
  }
};

/** A connect, released at its end. Can be moved, not copied or assigned to. */
class Connection : public Handle {
 public:
  /** Connects to the handset on a COM port. Throws when none answers. */
  explicit Connection(std::uint32_t port) : Connection(KRAL_ConnectServer, port) {
    const Attempt attempt(handle());
    if (!KRAL_IsPhoneConnected(handle())) throw attempt.Failure();
  }

  /** A handset in its boot loader: the port is left alone until the boot transfer begins. */
  static Connection ToBootLoader(std::uint32_t port) { return Connection(KRAL_Kivrat_ConnectServer, port); }

  Connection(Connection&&) = default;
  ~Connection() {
    if (!handle()) return;
    if (progress_) DownloadListeners::Replace(handle(), progress_, nullptr);
    KRAL_DisconnectServer(handle());
  }

  /**
   * Tells a function how far downloads have come, in bytes acknowledged and in all, until the connection ends or is
   * given another. It is called on the thread that downloads. What it throws is lost, and the download goes on:
   * KRAL_AbortDownload ends it.
   */
  void OnDownload(std::function<void(std::uint32_t, std::uint32_t)> progress) {
    const DownloadListeners::Listener next =
        progress ? std::make_shared<const DownloadListeners::Function>(std::move(progress)) : nullptr;
    DownloadListeners::Replace(handle(), progress_, next);
    progress_ = next;
  }

 private:
  Connection(KRAL_HANDLE(KRAL_CALL* connect)(std::uint32_t), std::uint32_t port) : Handle(Connect(connect, port)) {}

  static KRAL_HANDLE Connect(KRAL_HANDLE(KRAL_CALL* connect)(std::uint32_t), std::uint32_t port) {
    const Attempt attempt(0);
    if (const KRAL_HANDLE handle = connect(port)) return handle;
    throw attempt.Failure();
  }

  DownloadListeners::Listener progress_;
};

/**
 * The same work for many handsets at once, over ventrims.h: options, steps and handsets, Start, and a verdict for each.
 * At its end it aborts what still runs. Steps are added with Call: job.Call(KRAL_VENTRIMS_AddRestore, "golden.pkv").
 */
class Job : public Handle {
 public:
  /** flags: KRAL_VENTRIMS_ENTER_LOADER, KRAL_VENTRIMS_RESET. */
  explicit Job(std::uint32_t flags = 0) : Handle(Create()) {
    try {
      KRAL_VENTRIMS_OPTIONS options = Get<KRAL_VENTRIMS_OPTIONS>(KRAL_VENTRIMS_GetOptions);
      options.flags = flags;
      Call(KRAL_VENTRIMS_SetOptions, &options);
    } catch (...) {
      KRAL_VENTRIMS_Free(handle());
      throw;
    }
  }
  Job(Job&&) = default;
  ~Job() {
    if (handle()) KRAL_VENTRIMS_Free(handle());
  }

  KRAL_VENTRIMS_OPTIONS options() const { return Get<KRAL_VENTRIMS_OPTIONS>(KRAL_VENTRIMS_GetOptions); }

  /** Adds the handset on a COM port, and gives its number in the job. */
  std::uint32_t Add(std::uint32_t port) { return Added(KRAL_VENTRIMS_AddPort, port); }
  /** Adds one that is connected, and stays so until the job has ended. */
  std::uint32_t Add(const Connection& phone) { return Added(KRAL_VENTRIMS_AddHandle, phone.handle()); }

  /** Looks at all files and ports, and begins. Throws, with nothing sent, when one of them is not as it should be. */
  void Start() const { Call(KRAL_VENTRIMS_Start); }

  /** Whether the job has ended within the time. */
  bool Wait(std::uint32_t milliseconds) const {
    const Attempt attempt(handle());
    if (KRAL_VENTRIMS_Wait(handle(), milliseconds)) return true;
    if (attempt.HasFailed()) throw attempt.Failure();
    return false;
  }

  /** Ends the work on all handsets, from any thread. */
  void Abort() const { Call(KRAL_VENTRIMS_Abort, KRAL_VENTRIMS_ALL); }

  KRAL_VENTRIMS_STATE state() const { return Get<KRAL_VENTRIMS_STATE>(KRAL_VENTRIMS_GetState); }
  KRAL_VENTRIMS_PROGRESS progress(std::uint32_t handset) const {
    return Get<KRAL_VENTRIMS_PROGRESS>(KRAL_VENTRIMS_GetProgress, handset);
  }
  /** The verdict on a handset. Throws while there is none. */
  KRAL_VENTRIMS_RESULT result(std::uint32_t handset) const {
    return Get<KRAL_VENTRIMS_RESULT>(KRAL_VENTRIMS_GetResult, handset);
  }

 private:
  static KRAL_HANDLE Create() {
    const Attempt attempt(0);
    if (const KRAL_HANDLE job = KRAL_VENTRIMS_Create()) return job;
    throw attempt.Failure();
  }

  template <class Record, class Function, class... Arguments>
  Record Get(Function function, Arguments... arguments) const {
    Record record = {};
    record.size = sizeof record;
    Call(function, arguments..., &record);
    return record;
  }

  template <class Function>
  std::uint32_t Added(Function function, std::uint32_t whom) {
    std::uint32_t number = 0;
    Call(function, whom, &number);
    return number;
  }
};

}  // namespace kral

#endif
