// The sending side of async-HDLC framing, raw reads, and the switch of an AT-command port into diagnostic mode.
#ifndef KRAL_TRANSPORT_LINE_HDLC_FRAMER_H
#define KRAL_TRANSPORT_LINE_HDLC_FRAMER_H

#include <cstdint>

#include "base/text_log.h"
#include "platform/clock.h"

namespace kral {

class CSerialPort;

class CProtAHDLC {
 public:
  // The rates that Data2DM tries.
  static constexpr uint8_t kTry19200 = 0x01;
  static constexpr uint8_t kTry115200 = 0x04;

  explicit CProtAHDLC(Clock& clock = SystemClock()) : clock_(clock) {}
  virtual ~CProtAHDLC() = default;

  virtual uint32_t Data2DM(uint8_t baud_rate_mask);  // of kTry...
  virtual uint32_t FlushPhoneBuffer();               // writes one flag byte
  virtual uint8_t SetStartFlag(uint8_t on);          // gives the previous setting
  virtual uint32_t SetRawDataFlag(uint32_t value);
  virtual uint32_t Send(const uint8_t* payload, uint32_t size, uint32_t time_out_ms, uint8_t force_leading_flag);
  virtual uint32_t ReceiveRaw(uint8_t* buffer, uint32_t& count, uint32_t time_out_ms);

  uint32_t SetPort(CSerialPort* port);
  void SetLogger(DataLogFileHandler* log);  // also handed on to the port; null: none
  CSerialPort* port() const { return port_; }

 private:
  Clock& clock_;
  CSerialPort* port_ = nullptr;
  DataLogFileHandler* log_ = &NullLog();
  uint32_t raw_data_flag_ = 0;
  uint8_t start_flag_ = 0;
};

}  // namespace kral

#endif
