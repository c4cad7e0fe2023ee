// A COM port: overlapped, exclusive, with reads that return at once.
#include "platform/serial_device.h"

#include <windows.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>

#include "platform/com_port_opener.h"
#include "platform/port_list.h"
#include "platform/win32/line_settings.h"
#include "platform/win32/pending_read.h"
#include "platform/win32/wide_text.h"
#include "platform/win32/win_handle.h"

namespace kral {
namespace {

constexpr DWORD kDriverBuffer = 4096;
constexpr DWORD kLongestRead = 50;   // milliseconds
constexpr DWORD kWriteGrace = 1050;  // milliseconds beyond 1 per byte
constexpr uint32_t kFirstBaudRate = 115200;
constexpr DWORD kPurgeInput = PURGE_RXCLEAR;
constexpr DWORD kPurgeBoth = PURGE_TXABORT | PURGE_RXABORT | PURGE_TXCLEAR | PURGE_RXCLEAR;
static_assert(kPurgeInput == 8 && kPurgeBoth == 15);

std::string SystemText(DWORD code) {
  std::array<wchar_t, 512> text{};
  const DWORD flags = FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_MAX_WIDTH_MASK;
  DWORD length = ::FormatMessageW(flags, nullptr, code, 0, text.data(), static_cast<DWORD>(text.size()), nullptr);
  while (length > 0 && text[length - 1] == L' ') --length;
  return Utf8Text({text.data(), length});
}

DeviceResult Failure(DeviceError error, DWORD code) {
  return {error, code, SystemText(code)};
}

DeviceResult Failure(DWORD code) {
  switch (code) {
    case ERROR_INVALID_FUNCTION:
    case ERROR_FILE_NOT_FOUND:
    case ERROR_PATH_NOT_FOUND:
    case ERROR_SERIAL_NO_DEVICE:
      return Failure(DeviceError::kNoSuchPort, code);
    case ERROR_ACCESS_DENIED:
      return Failure(DeviceError::kNotPermitted, code);
    case ERROR_NOT_ENOUGH_MEMORY:
    case ERROR_OUTOFMEMORY:
      return Failure(DeviceError::kNoMemory, code);
    default:
      return Failure(DeviceError::kOther, code);
  }
}

// Opening is refused with "access denied" while another program holds the port.
DeviceResult OpenFailure(DWORD code) {
  if (code == ERROR_ACCESS_DENIED || code == ERROR_SHARING_VIOLATION) return Failure(DeviceError::kBusy, code);
  if (code == ERROR_INVALID_NAME) return Failure(DeviceError::kNoSuchPort, code);
  return Failure(code);
}

// What requests on an unplugged adapter end with; drivers differ.
bool IsVanished(DWORD code) {
  switch (code) {
    case ERROR_ACCESS_DENIED:
    case ERROR_INVALID_HANDLE:
    case ERROR_BAD_COMMAND:
    case ERROR_NOT_READY:
    case ERROR_GEN_FAILURE:
    case ERROR_IO_DEVICE:
    case ERROR_DEVICE_NOT_CONNECTED:
    case ERROR_DEVICE_REMOVED:
    case ERROR_BROKEN_PIPE:
      return true;
    default:
      return false;
  }
}

class ComPort final : public SerialDevice {
 public:
  ComPort(WinHandle file, WinHandle read_event, WinHandle write_event, WinHandle wake)
      : file_(std::move(file)),
        read_event_(std::move(read_event)),
        write_event_(std::move(write_event)),
        wake_(std::move(wake)),
        pending_(file_.get()) {}

  size_t Write(std::span<const uint8_t> bytes, uint32_t longest_ms) override;
  size_t OutputRoom() override;
  size_t Read(std::span<uint8_t> buffer) override;
  size_t InputWaiting() override;
  bool gone() const override { return gone_; }
  bool WaitReadable(uint32_t milliseconds) override;
  void Wake() override { ::SetEvent(wake_.get()); }
  DeviceResult SetBaudRate(uint32_t rate) override;
  uint32_t BaudRate() const override { return baud_rate_; }
  DeviceResult SetDtr(bool high) override { return Escape(high ? SETDTR : CLRDTR); }
  DeviceResult SetRts(bool high) override { return Escape(high ? SETRTS : CLRRTS); }
  void PurgeInput() override { Purge(kPurgeInput); }
  void PurgeBoth() override { Purge(kPurgeBoth); }

 private:
  size_t Finish(BOOL started, OVERLAPPED& overlapped, DWORD longest);
  size_t ReadDriver(std::span<uint8_t> buffer);
  size_t DriverWaiting();
  bool Queues(COMSTAT& queues);
  void NoteFailure(DWORD code);
  void Purge(DWORD what);
  DeviceResult Escape(DWORD function);

  WinHandle file_;
  WinHandle read_event_;
  WinHandle write_event_;
  WinHandle wake_;
  PendingRead pending_;
  std::atomic<bool> gone_{false};
  uint32_t baud_rate_ = kFirstBaudRate;
};

void ComPort::NoteFailure(DWORD code) {
  if (IsVanished(code)) gone_ = true;
}

// Waits for a request just made. The count transferred, 0 after a failure. The port's time-outs end every request; a
// driver that lost its device may forget to, so there is a longest wait.
size_t ComPort::Finish(BOOL started, OVERLAPPED& overlapped, DWORD longest) {
  if (!started && ::GetLastError() != ERROR_IO_PENDING) {
    NoteFailure(::GetLastError());
    return 0;
  }
  if (::WaitForSingleObject(overlapped.hEvent, longest) != WAIT_OBJECT_0) ::CancelIoEx(file_.get(), &overlapped);
  DWORD transferred = 0;
  if (::GetOverlappedResult(file_.get(), &overlapped, &transferred, TRUE)) return transferred;
  NoteFailure(::GetLastError());
  return 0;
}

size_t ComPort::Write(std::span<const uint8_t> bytes, uint32_t longest_ms) {
  if (gone_) return 0;
  OVERLAPPED overlapped{};
  overlapped.hEvent = write_event_.get();
  const auto count = static_cast<DWORD>(bytes.size());
  const BOOL started = ::WriteFile(file_.get(), bytes.data(), count, nullptr, &overlapped);
  return Finish(started, overlapped, std::min<DWORD>(count + kWriteGrace, longest_ms));
}

size_t ComPort::Read(std::span<uint8_t> buffer) {
  const size_t count = pending_.Take(buffer);
  // A read under way takes the next bytes; a second one beside it would take later ones, out of order.
  if (count == buffer.size() || pending_.under_way()) return count;
  return count + ReadDriver(buffer.subspan(count));
}

// Asks only for what is there: some drivers let an overlapped read of an empty queue wait in spite of the time-outs.
// Should it be purged meanwhile, the read is cancelled.
size_t ComPort::ReadDriver(std::span<uint8_t> buffer) {
  const size_t count = std::min(DriverWaiting(), buffer.size());
  if (count == 0) return 0;
  OVERLAPPED overlapped{};
  overlapped.hEvent = read_event_.get();
  const BOOL started = ::ReadFile(file_.get(), buffer.data(), static_cast<DWORD>(count), nullptr, &overlapped);
  return Finish(started, overlapped, kLongestRead);
}

bool ComPort::Queues(COMSTAT& queues) {
  DWORD line_errors = 0;
  queues = {};
  if (::ClearCommError(file_.get(), &line_errors, &queues)) return true;
  NoteFailure(::GetLastError());
  return false;
}

size_t ComPort::OutputRoom() {
  COMSTAT queues;
  if (!Queues(queues)) return kDriverBuffer;
  return kDriverBuffer - std::min(queues.cbOutQue, kDriverBuffer);
}

size_t ComPort::DriverWaiting() {
  COMSTAT queues;
  return Queues(queues) ? queues.cbInQue : 0;
}

size_t ComPort::InputWaiting() {
  const size_t taken = pending_.Waiting();
  return pending_.under_way() ? taken : taken + DriverWaiting();
}

void ComPort::Purge(DWORD what) {
  ::PurgeComm(file_.get(), what);
  pending_.Drop();
}

bool ComPort::WaitReadable(uint32_t milliseconds) {
  using std::chrono::steady_clock;
  if (gone_) {  // known, so the caller's loop must not spin; who finds it out below is told at once
    ::WaitForSingleObject(wake_.get(), milliseconds);
    return false;
  }
  const auto deadline = steady_clock::now() + std::chrono::milliseconds(milliseconds);
  auto left = static_cast<DWORD>(milliseconds);
  if (InputWaiting() > 0) return true;
  while (!gone_) {
    DWORD error = ERROR_SUCCESS;
    switch (pending_.Wait(wake_.get(), left, error)) {
      case PendingRead::Outcome::kReceived:
        if (pending_.Waiting() > 0) return true;
        break;
      case PendingRead::Outcome::kFailed:
        NoteFailure(error);
        ::Sleep(1);  // a driver that refuses at once must not keep the thread busy
        break;
      default:
        return false;
    }
    const auto rest = std::chrono::ceil<std::chrono::milliseconds>(deadline - steady_clock::now()).count();
    left = static_cast<DWORD>(std::clamp<int64_t>(rest, 0, milliseconds));
    if (left == 0) return false;
  }
  return false;
}

DeviceResult ComPort::SetBaudRate(uint32_t rate) {
  if (const DWORD code = ChangeBaudRate(file_.get(), rate)) return Failure(code);
  baud_rate_ = rate;
  return {};
}

DeviceResult ComPort::Escape(DWORD function) {
  if (!::EscapeCommFunction(file_.get(), function)) return Failure(::GetLastError());
  return {};
}

}  // namespace

std::unique_ptr<SerialDevice> OpenComPort(int number, DeviceResult& result) {
  const auto fail = [&result](DeviceResult reason) {
    result = std::move(reason);
    return nullptr;
  };
  WinHandle file(::CreateFileA(ComPortDevice(number).c_str(), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING,
                               FILE_FLAG_OVERLAPPED, nullptr));
  if (!file.valid()) return fail(OpenFailure(::GetLastError()));
  WinHandle read_event(::CreateEventA(nullptr, TRUE, FALSE, nullptr));
  WinHandle write_event(::CreateEventA(nullptr, TRUE, FALSE, nullptr));
  WinHandle wake(::CreateEventA(nullptr, FALSE, FALSE, nullptr));
  if (!read_event.valid() || !write_event.valid() || !wake.valid() ||
      !::SetupComm(file.get(), kDriverBuffer, kDriverBuffer)) {
    return fail(Failure(DeviceError::kBuffers, ::GetLastError()));
  }
  if (const DWORD code = ApplyTimeOuts(file.get())) return fail(Failure(DeviceError::kLineSettings, code));
  if (const DWORD code = ApplyLineSettings(file.get(), kFirstBaudRate)) {
    return fail(Failure(DeviceError::kLineSettings, code));
  }
  result = {};
  return std::make_unique<ComPort>(std::move(file), std::move(read_event), std::move(write_event), std::move(wake));
}

std::unique_ptr<SerialDevice> ComPortOpener::operator()(int number, DeviceResult& result) const {
  return OpenComPort(number, result);
}

}  // namespace kral
