// Waiting for bytes by reading one: unlike receive events, every driver can do that, and nothing has to be cancelled
// and started again when a wait ends early. One byte, because some drivers end such a read only when it is full.
#include "platform/win32/pending_read.h"

#include <array>

#include "platform/win32/line_settings.h"

namespace kral {

PendingRead::PendingRead(HANDLE port) : port_(port), ended_(::CreateEventA(nullptr, TRUE, FALSE, nullptr)) {}

PendingRead::~PendingRead() {
  if (!under_way_) return;
  ::CancelIoEx(port_, &overlapped_);
  // The driver writes into this object until the read has ended.
  DWORD ignored = 0;
  ::GetOverlappedResult(port_, &overlapped_, &ignored, TRUE);
}

PendingRead::Outcome PendingRead::Wait(HANDLE wake, DWORD milliseconds, DWORD& error) {
  {
    const std::lock_guard lock(mutex_);
    error = Start();
    if (error != ERROR_SUCCESS) return Outcome::kFailed;
    if (received_) return Outcome::kReceived;
  }
  const std::array<HANDLE, 2> events = {ended_.get(), wake};
  switch (::WaitForMultipleObjects(static_cast<DWORD>(events.size()), events.data(), FALSE, milliseconds)) {
    case WAIT_OBJECT_0: {
      const std::lock_guard lock(mutex_);
      error = Collect();
      return error == ERROR_SUCCESS ? Outcome::kReceived : Outcome::kFailed;
    }
    case WAIT_OBJECT_0 + 1:
      return Outcome::kWoken;
    default:
      return Outcome::kTimeOut;
  }
}

DWORD PendingRead::Start() {
  if (under_way_ || received_) return ERROR_SUCCESS;
  if (!ended_.valid()) return ERROR_INVALID_HANDLE;
  if (!prepared_) {
    if (const DWORD error = ApplyWaitingTimeOuts(port_)) return error;
    prepared_ = true;
  }
  overlapped_ = {};
  overlapped_.hEvent = ended_.get();
  ::ResetEvent(ended_.get());
  const BOOL ended = ::ReadFile(port_, &byte_, 1, nullptr, &overlapped_);
  if (!ended && ::GetLastError() != ERROR_IO_PENDING) return ::GetLastError();
  under_way_ = true;
  return ended ? Collect() : ERROR_SUCCESS;
}

// Takes over the result of an ended read. One that the driver has timed out brings nothing.
DWORD PendingRead::Collect() {
  if (!under_way_) return ERROR_SUCCESS;
  DWORD count = 0;
  if (!::GetOverlappedResult(port_, &overlapped_, &count, FALSE)) {
    const DWORD error = ::GetLastError();
    if (error == ERROR_IO_INCOMPLETE) return ERROR_SUCCESS;
    under_way_ = false;
    return error;
  }
  under_way_ = false;
  received_ = count == 1;
  return ERROR_SUCCESS;
}

size_t PendingRead::Take(std::span<uint8_t> buffer) {
  const std::lock_guard lock(mutex_);
  Collect();
  if (!received_ || buffer.empty()) return 0;
  buffer[0] = byte_;
  received_ = false;
  return 1;
}

size_t PendingRead::Waiting() {
  const std::lock_guard lock(mutex_);
  Collect();
  return received_ ? 1 : 0;
}

bool PendingRead::under_way() {
  const std::lock_guard lock(mutex_);
  Collect();
  return under_way_;
}

void PendingRead::Drop() {
  const std::lock_guard lock(mutex_);
  Collect();
  received_ = false;
}

}  // namespace kral
