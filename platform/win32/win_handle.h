// An owned Windows handle.
#ifndef KRAL_PLATFORM_WIN32_WIN_HANDLE_H
#define KRAL_PLATFORM_WIN32_WIN_HANDLE_H

#include <windows.h>

#include <utility>

namespace kral {

class WinHandle {
 public:
  WinHandle() = default;
  // Takes both of the system's ways to say "none".
  explicit WinHandle(HANDLE handle) : handle_(handle == INVALID_HANDLE_VALUE ? nullptr : handle) {}
  WinHandle(WinHandle&& other) noexcept : handle_(std::exchange(other.handle_, nullptr)) {}
  WinHandle& operator=(WinHandle&& other) noexcept {
    // Closes what it held at once: a file must be closed before it can be moved.
    WinHandle old(std::exchange(handle_, std::exchange(other.handle_, nullptr)));
    return *this;
  }
  ~WinHandle() {
    if (handle_ != nullptr) ::CloseHandle(handle_);
  }

  HANDLE get() const { return handle_; }
  bool valid() const { return handle_ != nullptr; }
  HANDLE Release() { return std::exchange(handle_, nullptr); }  // to another owner

 private:
  HANDLE handle_ = nullptr;
};

}  // namespace kral

#endif
