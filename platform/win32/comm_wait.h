// Waits for received bytes on a COM port, or for a signal from another thread.
#ifndef KRAL_PLATFORM_WIN32_COMM_WAIT_H
#define KRAL_PLATFORM_WIN32_COMM_WAIT_H

#include <windows.h>

#include "platform/win32/win_handle.h"

namespace kral {

class CommWait {
 public:
  explicit CommWait(HANDLE port);
  ~CommWait();  // while the port is still open
  CommWait(const CommWait&) = delete;
  CommWait& operator=(const CommWait&) = delete;

  enum class Outcome { kReceived, kWoken, kTimeOut };

  // kReceived tells that bytes came in since the last wait: some may have been read already, so look at the queue.
  Outcome Wait(DWORD milliseconds);
  Outcome WaitForWake(DWORD milliseconds);
  void Wake() { ::SetEvent(wake_.get()); }

 private:
  bool Arm();
  Outcome WaitByPolling(DWORD milliseconds);

  HANDLE port_;
  WinHandle wake_;
  WinHandle received_;
  OVERLAPPED overlapped_{};
  DWORD events_ = 0;
  bool supported_ = false;
  bool armed_ = false;
};

}  // namespace kral

#endif
