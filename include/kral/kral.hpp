/**
 * @file kral.hpp
 * The interface for C++17: a connection that releases itself, and failures as exceptions. Header-only, over kral.h.
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
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

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

  /** The failure of this thread's last call on a handle; of one without a handle for 0. */
  static Error Last(KRAL_HANDLE handle) {
    KRAL_ERROR record = {};
    if (!KRAL_GetLastError(handle, &record)) {
      record.code = KRAL_ERROR_INTERNAL;
      std::string("the call failed, and left no reason").copy(record.text, sizeof record.text - 1);
    }
    return Error(record);
  }

 private:
  KRAL_ERROR record_;
};

/** For functions without a handle: throws when the result is 0. */
inline void Check(std::uint8_t result) {
  if (!result) throw Error::Last(0);
}

/** A connect, released at its end. Can be moved, not copied. */
class Connection {
 public:
  /** Connects to the handset on a COM port. Throws when none answers. */
  explicit Connection(std::uint32_t port) : Connection(Taken(KRAL_ConnectServer(port))) {
    if (!KRAL_IsPhoneConnected(handle())) throw Error::Last(handle());
  }

  /** A handset in its boot loader: the port is left alone until the boot transfer begins. */
  static Connection ToBootLoader(std::uint32_t port) { return Connection(Taken(KRAL_Kivrat_ConnectServer(port))); }

  // Assigned to, it would let go of what the library may still call before it releases the handle.
  Connection(Connection&&) = default;
  Connection& operator=(Connection&&) = delete;

  KRAL_HANDLE handle() const { return handle_ ? *handle_ : 0; }

  /** Calls a function that takes the handle first and returns 1 for success. Throws when it returns 0. */
  template <class Function, class... Arguments>
  void Call(Function function, Arguments&&... arguments) const {
    if (!function(handle(), std::forward<Arguments>(arguments)...)) throw Error::Last(handle());
  }

  /** Calls one whose result is an answer, 1 for yes and 0 for no. */
  template <class Function, class... Arguments>
  bool Ask(Function function, Arguments&&... arguments) const {
    return function(handle(), std::forward<Arguments>(arguments)...) != 0;
  }

  /** Calls one of nv_tool.h, whose result is an error code. Throws unless that is 0. */
  template <class Function, class... Arguments>
  void CallTool(Function function, Arguments&&... arguments) const {
    if (function(handle(), std::forward<Arguments>(arguments)...)) throw Error::Last(handle());
  }

  /** Tells a function how far downloads have come, in bytes acknowledged and in all, until the connection ends. */
  void OnDownload(std::function<void(std::uint32_t, std::uint32_t)> progress) {
    progress_ = std::make_unique<Progress>(std::move(progress));
    Call(KRAL_ConfigureDownloadCallBack, &Connection::Told, reinterpret_cast<std::uintptr_t>(progress_.get()));
  }

 private:
  using Progress = std::function<void(std::uint32_t, std::uint32_t)>;
  struct Release {
    void operator()(KRAL_HANDLE* handle) const {
      KRAL_DisconnectServer(*handle);
      delete handle;
    }
  };
  struct Taken {
    explicit Taken(KRAL_HANDLE taken) : handle(taken) {}
    KRAL_HANDLE handle;
  };

  explicit Connection(Taken taken) {
    if (!taken.handle) throw Error::Last(0);
    handle_.reset(new KRAL_HANDLE(taken.handle));
  }

  static void KRAL_CALL Told(KRAL_HANDLE, std::uint32_t done, std::uint32_t total, std::uintptr_t value) {
    (*reinterpret_cast<Progress*>(value))(done, total);
  }

  std::unique_ptr<Progress> progress_;
  // Declared last: released first, while what the library may still call is there.
  std::unique_ptr<KRAL_HANDLE, Release> handle_;
};

}  // namespace kral

#endif
