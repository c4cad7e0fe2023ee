// The command and response engine of one connection: framer, port, receive thread, and the send-and-wait operation.
#ifndef KRAL_TRANSPORT_KRAL_THREAD_INTERFACE_H
#define KRAL_TRANSPORT_KRAL_THREAD_INTERFACE_H

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "platform/clock.h"
#include "transport/hdlc_framer.h"
#include "transport/serial_port.h"

namespace kral {

class CKralEvents;
class CKralEventListener;
class DataLogFileHandler;

inline constexpr uint32_t kNullPort = 65534;

enum class ReceiveMode : uint8_t {
  kAsWritten = 0,   // the sleep rule of the receive loop
  kWakeOnData = 1,  // waits in the port and sleeps nowhere
};

enum class PacketMode : uint32_t { kFramed = 0, kUnframed1 = 1, kUnframed2 = 2, kLengthPrefixed = 3 };

class CKralThreadInterface {
 public:
  explicit CKralThreadInterface(Clock& clock = SystemClock(), DeviceOpener opener = OpenComPort);
  ~CKralThreadInterface();
  CKralThreadInterface(const CKralThreadInterface&) = delete;
  CKralThreadInterface& operator=(const CKralThreadInterface&) = delete;

  void Attach(CKralEvents* dispatcher, CKralEventListener* sorter);
  void SetLogger(DataLogFileHandler* log);

  // Opens the port (or binds the caller's functions) and starts or resumes the receive thread. `owner` is what the
  // thread keeps alive: the object that holds this transport, its dispatcher, sorter and log.
  bool Open(uint32_t port_number, const UserTransport& user, std::shared_ptr<void> owner);
  bool Close();
  bool StopThread();
  bool PauseThread();
  void ResumeThread();
  bool connected() const;
  bool null_port() const;

  void SetOpenFlags(bool send_loopback, bool keep_buffers);
  void SetThreadReadTimeOut(uint32_t milliseconds);
  void SetReceiveMode(ReceiveMode mode);
  void SetSleepDivisor(uint32_t divisor);

  // response_size: in, the room; out, what was received less the two FCS bytes, at most the room.
  bool SendSync(std::span<const uint8_t> request, uint8_t* response, uint16_t& response_size, uint8_t expected_code,
                uint32_t time_out_ms, uint32_t delay_ms);
  bool SendRaw(std::span<const uint8_t> request, uint8_t* response, uint16_t& response_size, uint32_t time_out_ms);
  bool SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag);

  bool SetPacketMode(uint32_t mode);
  bool FlushRxBuffer();
  // The liveness check asks with code 4 whether the connection counts as alive without an answer: it does not, 0.
  uint32_t QueryState(uint32_t code) const;

  CProtAHDLC& framer();
  CSerialPort& port();

 private:
  struct State;
  std::shared_ptr<State> state_;
};

}  // namespace kral

#endif
