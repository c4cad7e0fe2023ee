// One open byte device: a COM port, a tty, or a fake. Opened exclusively; closed by the destructor.
//
// Read and Write may run at the same time on two threads; everything else is called while no read runs, except
// Wake, which may be called from any thread.
#ifndef KRAL_PLATFORM_SERIAL_DEVICE_H
#define KRAL_PLATFORM_SERIAL_DEVICE_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

namespace kral {

// What an operating system's refusal means to the library; the raw code is kept beside it for the log.
enum class DeviceError { kNone, kNoSuchPort, kBusy, kNotPermitted, kNoMemory, kBuffers, kLineSettings, kOther };

struct DeviceResult {
  DeviceError error = DeviceError::kNone;
  uint32_t system_code = 0;  // GetLastError or errno
  std::string text;          // what the system says about it
};

class SerialDevice {
 public:
  virtual ~SerialDevice() = default;

  // Writes one piece and waits for its completion, or for what is shorter: the time that its bytes may need (1 ms per
  // byte + 50 ms) or `longest_ms`. Returns the bytes taken by the driver.
  virtual size_t Write(std::span<const uint8_t> bytes, uint32_t longest_ms) = 0;

  // Room in the driver's output queue, of 4,096 bytes; 4,096 when the system cannot tell.
  virtual size_t OutputRoom() = 0;

  // Returns at once with what the driver holds, 0 bytes included. `gone` turns true when the device has vanished.
  virtual size_t Read(std::span<uint8_t> buffer) = 0;
  virtual size_t InputWaiting() = 0;
  virtual bool HasInput() { return InputWaiting() > 0; }
  virtual bool gone() const = 0;

  // Waits until bytes can be read (true), or until Wake or the time-out (false). A Wake that comes before the wait
  // is not lost: it ends the next one.
  virtual bool WaitReadable(uint32_t milliseconds) = 0;
  virtual void Wake() = 0;

  virtual DeviceResult SetBaudRate(uint32_t rate) = 0;  // changes only the rate
  virtual uint32_t BaudRate() const = 0;
  virtual DeviceResult SetDtr(bool high) = 0;
  virtual DeviceResult SetRts(bool high) = 0;
  virtual void PurgeInput() = 0;
  virtual void PurgeBoth() = 0;  // aborts and clears both directions
};

// Opens COM `number` exclusively at 115200 baud, 8 data bits, no parity, one stop bit, no flow control, binary, with
// 4,096-byte driver buffers and reads that return at once. Null on failure, with the reason in `result`.
// The device is ComPortDevice(number).
std::unique_ptr<SerialDevice> OpenComPort(int number, DeviceResult& result);

}  // namespace kral

#endif
