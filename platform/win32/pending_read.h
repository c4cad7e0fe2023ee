// A read of a COM port that waits in the driver for the first byte to come, and what it has brought.
#ifndef KRAL_PLATFORM_WIN32_PENDING_READ_H
#define KRAL_PLATFORM_WIN32_PENDING_READ_H

#include <windows.h>

#include <cstddef>
#include <cstdint>
#include <mutex>
#include <span>

#include "platform/win32/win_handle.h"

namespace kral {

// One thread waits and takes; Drop may come from another.
class PendingRead {
 public:
  explicit PendingRead(HANDLE port);
  ~PendingRead();  // while the port is still open
  PendingRead(const PendingRead&) = delete;
  PendingRead& operator=(const PendingRead&) = delete;

  enum class Outcome { kReceived, kWoken, kTimeOut, kFailed };

  // Starts a read unless one is under way, and waits for its end or for `wake`. A read that has not ended stays under
  // way: what comes later is found by the next Wait or Take. `error` tells why with kFailed only.
  Outcome Wait(HANDLE wake, DWORD milliseconds, DWORD& error);

  size_t Take(std::span<uint8_t> buffer);  // 0 or 1
  size_t Waiting();                        // 0 or 1
  bool under_way();
  void Drop();

 private:
  DWORD Start();
  DWORD Collect();

  HANDLE port_;
  WinHandle ended_;
  std::mutex mutex_;
  OVERLAPPED overlapped_{};
  uint8_t byte_ = 0;
  bool prepared_ = false;  // from the first wait on, the port's time-outs are those for waiting
  bool under_way_ = false;
  bool received_ = false;
};

}  // namespace kral

#endif
