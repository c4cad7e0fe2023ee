// The byte pipe under the framing: a COM port, or three functions of the caller.
#ifndef KRAL_TRANSPORT_LINE_SERIAL_PORT_H
#define KRAL_TRANSPORT_LINE_SERIAL_PORT_H

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>

#include "base/mutex.h"
#include "base/text_log.h"
#include "platform/clock.h"
#include "platform/serial_device.h"
#include "transport/line/port_tap.h"

namespace kral {

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

// Library error codes of the last open or setting operation.
inline constexpr int32_t kPortOk = 0;
inline constexpr int32_t kPortNotOnUserTransport = -99;
inline constexpr int32_t kPortLineSettings = -191;
inline constexpr int32_t kPortBuffers = -193;
inline constexpr int32_t kPortNotOpened = -194;
inline constexpr int32_t kPortNoMemory = -195;
inline constexpr int32_t kPortNotPermitted = -197;
inline constexpr int32_t kPortNoSuchDevice = -198;
inline constexpr int32_t kPortOtherError = -200;

// Send belongs to the thread that issues requests; Receive, WaitReadable and HasInput to the one whose turn it is to
// read; CloseIfGone to the receive thread. Wake may be called from anywhere. Open, Close and the settings are made
// while nobody receives; should a reader be late to leave, the device lives until it has.
class CSerialPort {
 public:
  explicit CSerialPort(Clock& clock = SystemClock(), DeviceOpener opener = OpenComPort);
  virtual ~CSerialPort();
  CSerialPort(const CSerialPort&) = delete;
  CSerialPort& operator=(const CSerialPort&) = delete;

  // 115200 baud, 8 data bits, no parity, one stop bit. 1 / 0; 0 without touching the system outside 1..255.
  virtual uint32_t Open(int32_t number);
  // Binds the port to the caller's functions instead of a device; 1 when all three are given.
  virtual uint32_t SetUserDefinedTransport(uintptr_t context, uintptr_t handle, UserSendFunction send,
                                           UserReceiveFunction receive, UserFlushFunction flush);
  virtual uint32_t IsOpen() const;
  virtual uint32_t Close();
  virtual bool SetBaudRate(uint32_t rate);
  virtual uint32_t GetBaudRate(uint32_t& rate) const;
  virtual uint32_t FlushPCBuffer();
  virtual DataLogFileHandler* SetLog(DataLogFileHandler* log);  // before the first Open; null: none
  virtual uint32_t Send(const uint8_t* bytes, uint32_t count);  // bytes written
  virtual uint32_t Receive(uint8_t* buffer, uint32_t count);    // bytes read, at once
  virtual int32_t SetDTR(uint8_t state);                        // library error code
  virtual int32_t SetRTS(uint8_t state);                        // library error code; 1 on a caller's transport
  virtual uint32_t SetWriteTimeout(uint32_t milliseconds);

  void SetWriteSizeLimit(uint32_t bytes);
  void SetSendLoopbackAtOpen(bool on);
  void SetKeepBuffersAtOpen(bool on);

  int32_t last_error() const;
  bool user_defined() const;
  // The device vanished under the open port, and has not been there since.
  bool gone() const;
  // Whether the device, or the caller, may have taken bytes of the last Send. For the thread that sends.
  bool may_have_sent() const { return may_have_sent_; }
  // True when this call has closed the port, because its device is gone. At once, and not with the next request: a
  // device that comes back is the same one again only where nobody holds the old one any more.
  bool CloseIfGone();

  // Before the first Open; it outlives the port. Null: none.
  void SetTap(PortTap* tap) { tap_ = tap; }
  // For the tap.
  PortContent SetContent(PortContent content) { return content_.exchange(content); }  // the former one
  void GiveUpPartial() const {
    if (tap_ != nullptr) tap_->OnGivenUp();
  }

  // Wake-on-data receiving: true when bytes may be read; false after the time-out, a Wake, or when there is no
  // device that can be waited on (a caller's transport).
  bool CanWait() const;
  bool WaitReadable(uint32_t milliseconds);
  bool HasInput() const;  // of a device: bytes that can be read now
  void Wake();

  // Why the last Open failed, for the log and the tool; for the thread that opens.
  const DeviceResult& open_result() const;

 private:
  std::shared_ptr<SerialDevice> Device() const;
  UserTransport User() const;
  std::unique_ptr<SerialDevice> OpenDevice(int32_t number);
  void Prepare(SerialDevice& device) const;
  uint32_t SendTapped(const uint8_t* bytes, uint32_t count, uint32_t& sent);
  void Tell(PortDirection direction, std::span<const uint8_t> bytes) const;
  uint32_t SendToDevice(const uint8_t* bytes, uint32_t count, uint32_t& sent);
  uint32_t SendToUser(const uint8_t* bytes, uint32_t count, uint32_t& sent);
  uint32_t ReceiveFromDevice(uint8_t* buffer, uint32_t count, uint32_t& received);
  uint32_t ReceiveFromUser(uint8_t* buffer, uint32_t count, uint32_t& received);
  std::shared_ptr<SerialDevice> LetGo() KRAL_REQUIRES(mutex_);
  int32_t Record(const DeviceResult& result);

  Clock& clock_;
  DeviceOpener opener_;
  DataLogFileHandler* log_ = &NullLog();
  PortTap* tap_ = nullptr;
  std::atomic<PortContent> content_{PortContent::kFrames};
  std::atomic<bool> open_{false};
  std::atomic<bool> user_defined_{false};
  std::atomic<bool> may_have_sent_{false};
  std::atomic<int32_t> last_error_{kPortOk};
  std::atomic<uint32_t> baud_rate_{0};
  std::atomic<uint32_t> write_timeout_{300};
  std::atomic<uint32_t> write_size_limit_{4099};
  std::atomic<bool> send_loopback_{false};
  std::atomic<bool> keep_buffers_{false};
  DeviceResult open_result_;

  mutable Mutex mutex_;                                          // for the moment of a copy
  std::optional<FineTimer> fine_timer_ KRAL_GUARDED_BY(mutex_);  // while the port is open
  bool gone_ KRAL_GUARDED_BY(mutex_) = false;                    // of a device that is no longer held
  std::shared_ptr<SerialDevice> device_ KRAL_GUARDED_BY(mutex_);
  UserTransport user_ KRAL_GUARDED_BY(mutex_);
};

}  // namespace kral

#endif
