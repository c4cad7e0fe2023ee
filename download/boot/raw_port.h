// The port of a handset as the boot transfer needs it: no frames, no receive thread, writes of whole packets and reads
// that wait. Over a COM port or a caller's transport, whichever the handset is connected by.
#ifndef KRAL_DOWNLOAD_BOOT_RAW_PORT_H
#define KRAL_DOWNLOAD_BOOT_RAW_PORT_H

#include <cstdint>
#include <functional>
#include <span>

#include "base/failure.h"
#include "frame/diag_ftm.h"

namespace kral::kivrat {

// For the length of one operation, under the phone object's request lock. The port itself is the phone object's and
// is open for as long as it is borrowed, that is also between two operations; it is given back by the destructor
// unless it was told to keep it.
class RawPort {
 public:
  explicit RawPort(Diag_FTM& phone) : phone_(phone) {}
  ~RawPort() noexcept(false);
  RawPort(const RawPort&) = delete;
  RawPort& operator=(const RawPort&) = delete;

  bool Open();  // true as well when it is open already
  void GiveBack();
  void Keep() { keep_ = true; }

  void SetReadTimeOut(uint32_t milliseconds) { read_time_out_ms_ = milliseconds; }
  bool gone() const { return port_ != nullptr && port_->gone(); }

  // Waits are given up as soon as this is true.
  void SetStop(std::function<bool()> stop) { stop_ = std::move(stop); }
  bool stopped() const { return stop_ && stop_(); }

  // True when all of it was written.
  bool Write(std::span<const uint8_t> packet);
  // Waits for the full count, the time-out or the end of the device; gives the bytes read.
  size_t Read(std::span<uint8_t> buffer) { return Read(buffer, buffer.size()); }
  // The same, but for a line that falls quiet once it has said enough.
  size_t Read(std::span<uint8_t> buffer, size_t enough);
  void Purge();  // forgets what was received

  // Why Open was refused, a Read of `what` gave fewer bytes, a Write of it was not done.
  Failure NotOpened() const;
  Failure NotRead(const char* what, size_t count, size_t size) const;
  Failure NotWritten(const char* what) const;

  void Pause(uint32_t milliseconds);

 private:
  void LogTraffic(const char* direction, std::span<const uint8_t> bytes);

  Diag_FTM& phone_;
  CSerialPort* port_ = nullptr;
  bool keep_ = false;
  uint32_t read_time_out_ms_ = 0;
  std::function<bool()> stop_;
};

}  // namespace kral::kivrat

#endif
