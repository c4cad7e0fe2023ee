// The driver's receive event, kept armed across waits: re-arming it each time would cost a cancelled request per
// time-out, and some drivers answer cancelled waits late.
#include "platform/win32/comm_wait.h"

#include <algorithm>
#include <array>

namespace kral {
namespace {

constexpr DWORD kPollingStep = 1;
constexpr DWORD kEndOfWait = 1000;

}  // namespace

CommWait::CommWait(HANDLE port)
    : port_(port),
      wake_(::CreateEventA(nullptr, FALSE, FALSE, nullptr)),
      received_(::CreateEventA(nullptr, TRUE, FALSE, nullptr)) {
  supported_ = received_.valid() && ::SetCommMask(port_, EV_RXCHAR) != 0;
}

// The driver writes into overlapped_ and events_ when the wait ends, so it must have ended before they go. A change
// of the mask ends it on every driver; not all of them honour a cancel.
CommWait::~CommWait() {
  if (!armed_) return;
  ::SetCommMask(port_, 0);
  if (::WaitForSingleObject(received_.get(), kEndOfWait) == WAIT_OBJECT_0) return;
  ::CancelIoEx(port_, &overlapped_);
  DWORD ignored = 0;
  ::GetOverlappedResult(port_, &overlapped_, &ignored, TRUE);
}

bool CommWait::Arm() {
  if (armed_) return true;
  if (!supported_) return false;
  overlapped_ = {};
  overlapped_.hEvent = received_.get();
  ::ResetEvent(received_.get());
  if (::WaitCommEvent(port_, &events_, &overlapped_)) {
    ::SetEvent(received_.get());
    armed_ = true;
  } else if (::GetLastError() == ERROR_IO_PENDING) {
    armed_ = true;
  } else {
    supported_ = false;
  }
  return armed_;
}

CommWait::Outcome CommWait::Wait(DWORD milliseconds) {
  if (!Arm()) return WaitByPolling(milliseconds);
  const std::array<HANDLE, 2> events = {received_.get(), wake_.get()};
  switch (::WaitForMultipleObjects(static_cast<DWORD>(events.size()), events.data(), FALSE, milliseconds)) {
    case WAIT_OBJECT_0:
      armed_ = false;
      return Outcome::kReceived;
    case WAIT_OBJECT_0 + 1:
      return Outcome::kWoken;
    default:
      return Outcome::kTimeOut;
  }
}

CommWait::Outcome CommWait::WaitForWake(DWORD milliseconds) {
  return ::WaitForSingleObject(wake_.get(), milliseconds) == WAIT_OBJECT_0 ? Outcome::kWoken : Outcome::kTimeOut;
}

// For a driver without receive events: says "received" at once and so leaves it to the caller to look, step by step.
CommWait::Outcome CommWait::WaitByPolling(DWORD milliseconds) {
  if (WaitForWake(std::min(milliseconds, kPollingStep)) == Outcome::kWoken) return Outcome::kWoken;
  return milliseconds <= kPollingStep ? Outcome::kTimeOut : Outcome::kReceived;
}

}  // namespace kral
