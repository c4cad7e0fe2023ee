// The byte pipe under the framing: a COM port, or three functions of the caller.
#ifndef KRAL_TRANSPORT_SERIAL_PORT_H
#define KRAL_TRANSPORT_SERIAL_PORT_H

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>

#include "platform/clock.h"
#include "platform/serial_device.h"

namespace kral {

class DataLogFileHandler;

// Functions of a caller-supplied transport, called with (context, handle value, ...); non-zero means failure.
using UserSendFunction = uint32_t (*)(uintptr_t context, uintptr_t handle, uint32_t count, const uint8_t* data,
                                      uint32_t* written);
using UserReceiveFunction = uint32_t (*)(uintptr_t context, uintptr_t handle, uint32_t* count, uint8_t* buffer);
using UserFlushFunction = uint32_t (*)(uintptr_t context, uintptr_t handle);

struct UserTransport {
  uintptr_t handle = 0;
  uintptr_t context = 0;
  UserSendFunction send = nullptr;
  UserReceiveFunction receive = nullptr;
  UserFlushFunction flush = nullptr;
};

// Opens the device behind a COM number; tests give a fake.
using DeviceOpener = std::function<std::unique_ptr<SerialDevice>(int number, DeviceResult& result)>;

class CSerialPort {
 public:
  explicit CSerialPort(Clock& clock = SystemClock(), DeviceOpener opener = OpenComPort);
  virtual ~CSerialPort();
  CSerialPort(const CSerialPort&) = delete;
  CSerialPort& operator=(const CSerialPort&) = delete;

  virtual uint32_t Open(int32_t number);  // 1 / 0; 0 without touching the system outside 1..255
  virtual uint32_t SetUserDefinedTransport(uintptr_t context, uintptr_t handle, UserSendFunction send,
                                           UserReceiveFunction receive, UserFlushFunction flush);
  virtual uint32_t IsOpen() const;
  virtual uint32_t Close();
  virtual bool SetBaudRate(uint32_t rate);
  virtual uint32_t GetBaudRate(uint32_t& rate) const;
  virtual uint32_t FlushPCBuffer();
  virtual DataLogFileHandler* SetLog(DataLogFileHandler* log);
  virtual uint32_t Send(const uint8_t* bytes, uint32_t count);  // bytes written
  virtual uint32_t Receive(uint8_t* buffer, uint32_t count);    // bytes read, at once
  virtual int32_t SetDTR(uint8_t state);
  virtual int32_t SetRTS(uint8_t state);
  virtual uint32_t SetWriteTimeout(uint32_t milliseconds);

  void SetWriteSizeLimit(uint32_t bytes);
  void SetSendLoopbackAtOpen(bool on);
  void SetKeepBuffersAtOpen(bool on);

  int32_t last_error() const;
  bool user_defined() const;
  bool gone() const;  // the device has vanished under the open port

  // Wake-on-data receiving: true when bytes may be read; false after the time-out, a Wake, or when there is no
  // device that can be waited on (a caller's transport).
  bool CanWait() const;
  bool WaitReadable(uint32_t milliseconds);
  void Wake();

  // Why the last Open failed, for the log and the tool.
  const DeviceResult& open_result() const;
};

}  // namespace kral

#endif
