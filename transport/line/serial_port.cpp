// The port of one connection: opening and preparing a device, or the caller's functions in its place. How a device
// works is the platform's affair, what the bytes mean the framer's.
#include "transport/line/serial_port.h"

#include <algorithm>
#include <array>
#include <exception>
#include <utility>

namespace kral {
namespace {

constexpr int32_t kFirstNumber = 1;
constexpr int32_t kLastNumber = 255;

// A framed loopback request (0x7B) with the payload 0 to 9.
constexpr std::array<uint8_t, 14> kLoopbackFrame = {0x7B, 0x00, 0x01, 0x02, 0x03, 0x04, 0x05,
                                                    0x06, 0x07, 0x08, 0x09, 0x9D, 0x5F, 0x7E};

int32_t OpenErrorCode(DeviceError error) {
  switch (error) {
    case DeviceError::kBuffers:
      return kPortBuffers;
    case DeviceError::kLineSettings:
      return kPortLineSettings;
    default:
      return kPortNotOpened;
  }
}

int32_t SettingErrorCode(DeviceError error) {
  switch (error) {
    case DeviceError::kNone:
      return kPortOk;
    case DeviceError::kNoMemory:
      return kPortNoMemory;
    case DeviceError::kNoSuchPort:
      return kPortNoSuchDevice;
    case DeviceError::kNotPermitted:
      return kPortNotPermitted;
    default:
      return kPortOtherError;
  }
}

// Some systems keep the name of a port whose device is gone: it opens, and then takes no setting.
bool IsNoDevice(DeviceError error) {
  return error == DeviceError::kNoSuchPort || error == DeviceError::kBuffers || error == DeviceError::kLineSettings;
}

DeviceResult NotOpen() {
  return {DeviceError::kOther, 0, "the port is not open"};
}

}  // namespace

CSerialPort::CSerialPort(Clock& clock, DeviceOpener opener) : clock_(clock), opener_(std::move(opener)) {}

CSerialPort::~CSerialPort() {
  CSerialPort::Close();
}

uint32_t CSerialPort::Open(int32_t number) {
  if (number < kFirstNumber || number > kLastNumber) {
    open_result_ = {DeviceError::kNoSuchPort, 0, "ports are numbered 1 to 255"};
    log_->WriteLine(kLogErr, "CSerialPort::Open(COM%d) refused: ports are numbered 1 to 255", number);
    return 0;
  }
  Close();
  user_defined_ = false;
  last_error_ = kPortOk;
  std::shared_ptr<SerialDevice> device = OpenDevice(number);
  if (!device) {
    last_error_ = OpenErrorCode(open_result_.error);
    {
      const MutexLock lock(mutex_);
      gone_ = gone_ && IsNoDevice(open_result_.error);
    }
    log_->WriteLine(kLogErr, "CSerialPort::Open(COM%d) failed: %s (%u)", number, open_result_.text.c_str(),
                    open_result_.system_code);
    return 0;
  }
  Prepare(*device);
  baud_rate_ = device->BaudRate();
  const MutexLock lock(mutex_);
  fine_timer_.emplace();
  device_ = std::move(device);
  gone_ = false;
  open_ = true;
  return 1;
}

// An opener that fails without a reason, or with an exception, still leaves one.
std::unique_ptr<SerialDevice> CSerialPort::OpenDevice(int32_t number) {
  open_result_ = {};
  try {
    auto device = opener_(number, open_result_);
    if (!device && open_result_.error == DeviceError::kNone) open_result_.error = DeviceError::kOther;
    return device;
  } catch (const std::exception& exception) {
    open_result_ = {DeviceError::kOther, 0, exception.what()};
    return nullptr;
  }
}

// The lines' refusals don't matter here: a pseudo terminal has none.
void CSerialPort::Prepare(SerialDevice& device) const {
  if (tap_ != nullptr) tap_->OnOpened();
  device.SetRts(true);
  device.SetDtr(false);
  if (!keep_buffers_) device.PurgeBoth();
  if (!send_loopback_) return;
  for (int i = 0; i < 2; ++i) {
    Tell(PortDirection::kSent, kLoopbackFrame);
    device.Write(kLoopbackFrame, write_timeout_);
  }
}

uint32_t CSerialPort::SetUserDefinedTransport(uintptr_t context, uintptr_t handle, UserSendFunction send,
                                              UserReceiveFunction receive, UserFlushFunction flush) {
  Close();
  const bool complete = send != nullptr && receive != nullptr && flush != nullptr;
  const MutexLock lock(mutex_);
  user_ = {handle, context, send, receive, flush};
  user_defined_ = true;
  if (complete) fine_timer_.emplace();
  gone_ = false;
  open_ = complete;
  if (complete && tap_ != nullptr) tap_->OnOpened();
  return complete ? 1 : 0;
}

uint32_t CSerialPort::IsOpen() const {
  return open_ ? 1 : 0;
}

uint32_t CSerialPort::Close() {
  std::shared_ptr<SerialDevice> device;
  {
    const MutexLock lock(mutex_);
    device = LetGo();
  }
  if (device) device->Wake();
  return 1;
}

bool CSerialPort::CloseIfGone() {
  std::shared_ptr<SerialDevice> device;
  const MutexLock lock(mutex_);
  if (!device_ || !device_->gone()) return false;
  device = LetGo();
  return true;
}

std::shared_ptr<SerialDevice> CSerialPort::LetGo() {
  open_ = false;
  fine_timer_.reset();
  gone_ = gone_ || (device_ && device_->gone());
  return std::exchange(device_, nullptr);
}

bool CSerialPort::SetBaudRate(uint32_t rate) {
  if (user_defined_) {
    last_error_ = kPortNotOnUserTransport;
    return false;
  }
  const auto device = Device();
  if (Record(device ? device->SetBaudRate(rate) : NotOpen()) != kPortOk) return false;
  baud_rate_ = rate;
  return true;
}

uint32_t CSerialPort::GetBaudRate(uint32_t& rate) const {
  rate = user_defined_ ? 0 : baud_rate_.load();
  return 1;
}

DataLogFileHandler* CSerialPort::SetLog(DataLogFileHandler* log) {
  log_ = log != nullptr ? log : &NullLog();
  return log;
}

int32_t CSerialPort::SetDTR(uint8_t state) {
  if (user_defined_) {
    last_error_ = kPortNotOnUserTransport;
    // Not the code just recorded, but what the platform says: nothing was asked of it, so nothing failed.
    return SettingErrorCode(DeviceError::kNone);
  }
  const auto device = Device();
  return Record(device ? device->SetDtr(state != 0) : NotOpen());
}

int32_t CSerialPort::SetRTS(uint8_t state) {
  if (user_defined_) return 1;  // unlike SetDTR, and nothing is recorded
  const auto device = Device();
  return Record(device ? device->SetRts(state != 0) : NotOpen());
}

int32_t CSerialPort::Record(const DeviceResult& result) {
  const int32_t code = SettingErrorCode(result.error);
  last_error_ = code;
  return code;
}

uint32_t CSerialPort::SetWriteTimeout(uint32_t milliseconds) {
  write_timeout_ = milliseconds;
  return 1;
}

void CSerialPort::SetWriteSizeLimit(uint32_t bytes) {
  write_size_limit_ = bytes;
}
void CSerialPort::SetSendLoopbackAtOpen(bool on) {
  send_loopback_ = on;
}
void CSerialPort::SetKeepBuffersAtOpen(bool on) {
  keep_buffers_ = on;
}

int32_t CSerialPort::last_error() const {
  return last_error_;
}
bool CSerialPort::user_defined() const {
  return user_defined_;
}
const DeviceResult& CSerialPort::open_result() const {
  return open_result_;
}

bool CSerialPort::gone() const {
  const MutexLock lock(mutex_);
  return gone_ || (device_ && device_->gone());
}

bool CSerialPort::CanWait() const {
  return !user_defined_ && Device() != nullptr;
}

bool CSerialPort::WaitReadable(uint32_t milliseconds) {
  const auto device = user_defined_ ? nullptr : Device();
  return device && device->WaitReadable(milliseconds);
}

bool CSerialPort::HasInput() const {
  const auto device = user_defined_ ? nullptr : Device();
  return device && device->HasInput();
}

void CSerialPort::Wake() {
  if (const auto device = Device()) device->Wake();
}

std::shared_ptr<SerialDevice> CSerialPort::Device() const {
  const MutexLock lock(mutex_);
  return device_;
}

UserTransport CSerialPort::User() const {
  const MutexLock lock(mutex_);
  return user_;
}

}  // namespace kral
