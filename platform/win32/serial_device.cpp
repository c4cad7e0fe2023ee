// A COM port: overlapped, exclusive, with reads that return at once.
#include "platform/serial_device.h"

#include <windows.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>

#include "platform/port_list.h"
#include "platform/win32/comm_wait.h"
#include "platform/win32/line_settings.h"
#include "platform/win32/win_handle.h"

namespace kral {
namespace {

constexpr DWORD kDriverBuffer = 4096;
constexpr uint32_t kFirstBaudRate = 115200;
constexpr DWORD kPurgeInput = PURGE_RXCLEAR;
constexpr DWORD kPurgeBoth = PURGE_TXABORT | PURGE_RXABORT | PURGE_TXCLEAR | PURGE_RXCLEAR;
static_assert(kPurgeInput == 8 && kPurgeBoth == 15);

std::string SystemText(DWORD code) {
  std::array<char, 512> text{};
  const DWORD flags = FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS | FORMAT_MESSAGE_MAX_WIDTH_MASK;
  DWORD length = ::FormatMessageA(flags, nullptr, code, 0, text.data(), static_cast<DWORD>(text.size()), nullptr);
  while (length > 0 && text[length - 1] == ' ') --length;
  return {text.data(), length};
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
  ComPort(WinHandle file, WinHandle read_event, WinHandle write_event)
      : file_(std::move(file)),
        read_event_(std::move(read_event)),
        write_event_(std::move(write_event)),
        wait_(file_.get()) {}

  size_t Write(std::span<const uint8_t> bytes) override;
  size_t OutputRoom() override;
  size_t Read(std::span<uint8_t> buffer) override;
  size_t InputWaiting() override;
  bool gone() const override { return gone_; }
  bool WaitReadable(uint32_t milliseconds) override;
  void Wake() override { wait_.Wake(); }
  DeviceResult SetBaudRate(uint32_t rate) override;
  uint32_t BaudRate() const override { return baud_rate_; }
  DeviceResult SetDtr(bool high) override { return Escape(high ? SETDTR : CLRDTR); }
  DeviceResult SetRts(bool high) override { return Escape(high ? SETRTS : CLRRTS); }
  void PurgeInput() override { ::PurgeComm(file_.get(), kPurgeInput); }
  void PurgeBoth() override { ::PurgeComm(file_.get(), kPurgeBoth); }

 private:
  size_t Finish(BOOL started, OVERLAPPED& overlapped);
  bool Queues(COMSTAT& queues);
  DeviceResult Escape(DWORD function);

  WinHandle file_;
  WinHandle read_event_;
  WinHandle write_event_;
  CommWait wait_;
  std::atomic<bool> gone_{false};
  uint32_t baud_rate_ = kFirstBaudRate;
};

// Waits for a started request; the port's time-outs bound it. The count transferred, 0 after a failure.
size_t ComPort::Finish(BOOL started, OVERLAPPED& overlapped) {
  DWORD transferred = 0;
  if (started || ::GetLastError() == ERROR_IO_PENDING) {
    if (::GetOverlappedResult(file_.get(), &overlapped, &transferred, TRUE)) return transferred;
    const DWORD code = ::GetLastError();
    ::CancelIoEx(file_.get(), &overlapped);
    if (IsVanished(code)) gone_ = true;
  } else if (IsVanished(::GetLastError())) {
    gone_ = true;
  }
  return 0;
}

size_t ComPort::Write(std::span<const uint8_t> bytes) {
  OVERLAPPED overlapped{};
  overlapped.hEvent = write_event_.get();
  const BOOL started = ::WriteFile(file_.get(), bytes.data(), static_cast<DWORD>(bytes.size()), nullptr, &overlapped);
  return Finish(started, overlapped);
}

size_t ComPort::Read(std::span<uint8_t> buffer) {
  OVERLAPPED overlapped{};
  overlapped.hEvent = read_event_.get();
  const BOOL started = ::ReadFile(file_.get(), buffer.data(), static_cast<DWORD>(buffer.size()), nullptr, &overlapped);
  return Finish(started, overlapped);
}

bool ComPort::Queues(COMSTAT& queues) {
  DWORD line_errors = 0;
  queues = {};
  if (::ClearCommError(file_.get(), &line_errors, &queues)) return true;
  if (IsVanished(::GetLastError())) gone_ = true;
  return false;
}

size_t ComPort::OutputRoom() {
  COMSTAT queues;
  if (!Queues(queues)) return kDriverBuffer;
  return kDriverBuffer - std::min(queues.cbOutQue, kDriverBuffer);
}

size_t ComPort::InputWaiting() {
  COMSTAT queues;
  return Queues(queues) ? queues.cbInQue : 0;
}

bool ComPort::WaitReadable(uint32_t milliseconds) {
  using std::chrono::steady_clock;
  const auto deadline = steady_clock::now() + std::chrono::milliseconds(milliseconds);
  auto left = static_cast<DWORD>(milliseconds);
  while (InputWaiting() == 0) {
    // A vanished port can only wait to be woken: its driver would report events without end.
    if ((gone_ ? wait_.WaitForWake(left) : wait_.Wait(left)) != CommWait::Outcome::kReceived) return false;
    const auto rest = std::chrono::ceil<std::chrono::milliseconds>(deadline - steady_clock::now()).count();
    left = static_cast<DWORD>(std::clamp<int64_t>(rest, 0, milliseconds));
  }
  return true;
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
  if (!read_event.valid() || !write_event.valid() || !::SetupComm(file.get(), kDriverBuffer, kDriverBuffer)) {
    return fail(Failure(DeviceError::kBuffers, ::GetLastError()));
  }
  if (const DWORD code = ApplyTimeOuts(file.get())) return fail(Failure(DeviceError::kLineSettings, code));
  if (const DWORD code = ApplyLineSettings(file.get(), kFirstBaudRate)) {
    return fail(Failure(DeviceError::kLineSettings, code));
  }
  result = {};
  return std::make_unique<ComPort>(std::move(file), std::move(read_event), std::move(write_event));
}

}  // namespace kral
