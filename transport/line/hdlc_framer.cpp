// The framer's I/O: frames to the port, raw reads for the receive thread, and the AT exchange that brings a port into
// diagnostic mode. The frame format is hdlc_frame's.
#include "transport/line/hdlc_framer.h"

#include <algorithm>
#include <array>
#include <string_view>

#include "base/at_exit.h"
#include "transport/line/hdlc_frame.h"
#include "transport/line/serial_port.h"

namespace kral {
namespace {

constexpr char kTooLong[] = "Error. String size exceeds maximum buffer size.";

constexpr std::string_view kDiagnosticModeCommand = "AT$XJDMG\r";
constexpr int kAttemptsPerRate = 2;
constexpr uint32_t kAnswerMs = 200;
constexpr uint32_t kSettleMs = 50;

// True once a 'K', as in "OK", has arrived.
bool ReadsOk(CSerialPort& port, Clock& clock) {
  std::array<uint8_t, 20> area{};
  uint32_t length = 0;
  const uint32_t start = clock.TickMs();
  while (length < area.size() && clock.TickMs() - start < kAnswerMs) {
    const uint32_t room = static_cast<uint32_t>(area.size()) - length;
    uint8_t* const piece = area.data() + length;
    const uint32_t count = std::min(port.Receive(piece, room), room);
    if (std::find(piece, piece + count, uint8_t{'K'}) != piece + count) return true;
    if (count == 0) clock.SleepMs(1);
    length += count;
  }
  return false;
}

bool AsksForDiagnosticMode(CSerialPort& port, Clock& clock) {
  std::array<uint8_t, kDiagnosticModeCommand.size()> command{};
  std::ranges::copy(kDiagnosticModeCommand, command.begin());
  for (int attempt = 0; attempt < kAttemptsPerRate; ++attempt) {
    port.Send(command.data(), static_cast<uint32_t>(command.size()));
    if (ReadsOk(port, clock)) return true;
  }
  return false;
}

}  // namespace

uint32_t CProtAHDLC::SetPort(CSerialPort* port) {
  if (port == nullptr) return 0;
  port_ = port;
  return 1;
}

void CProtAHDLC::SetLogger(DataLogFileHandler* log) {
  log_ = log != nullptr ? log : &NullLog();
  if (port_ != nullptr) port_->SetLog(log);
}

uint32_t CProtAHDLC::FlushPhoneBuffer() {
  log_->WriteLine(kLogFnAhdlc, "CProtAHDLC::FlushPhoneBuffer()");
  if (port_ == nullptr) return 0;
  port_->Send(&kFrameFlag, 1);
  return 1;
}

uint8_t CProtAHDLC::SetStartFlag(uint8_t on) {
  const uint8_t previous = start_flag_;
  start_flag_ = on;
  return previous;
}

uint32_t CProtAHDLC::SetRawDataFlag(uint32_t value) {
  raw_data_flag_ = value;
  return value;
}

uint32_t CProtAHDLC::Send(const uint8_t* payload, uint32_t size, uint32_t time_out_ms, uint8_t force_leading_flag) {
  if (port_ == nullptr) return 0;
  log_->WriteLine(kLogFnAhdlc, "CProtAHDLC::Send(iSize=%d, iTimeout=%d)", static_cast<int>(size),
                  static_cast<int>(time_out_ms));

  FrameBuffer frame;  // left uninitialised: clearing 32 KiB would cost more than framing a request
  const uint8_t* bytes = payload;
  uint32_t length = size <= kMaximumPayload ? size : 0;
  if (length == size && raw_data_flag_ == 0) {
    const bool leading_flag = start_flag_ != 0 || force_leading_flag != 0;
    length = static_cast<uint32_t>(BuildFrame({payload, size}, leading_flag, frame));
    bytes = frame.data();
  }
  if (length == 0 && size != 0) {
    log_->WriteLine(kLogInfAhdlc, "%s", kTooLong);
    return 0;
  }

  const bool sent = port_->Send(bytes, length) == length;
  log_->WriteLine(kLogRetAhdlc, "CProtAHDLC::Send(_iALen=%d) ... %s", static_cast<int>(length), sent ? "OK" : "FAIL");
  return sent ? 1 : 0;
}

uint32_t CProtAHDLC::ReceiveRaw(uint8_t* buffer, uint32_t& count, uint32_t time_out_ms) {
  if (port_ == nullptr) return 0;
  std::fill_n(buffer, count, uint8_t{0xFF});
  const uint32_t start = clock_.TickMs();
  count = std::min(port_->Receive(buffer, count), count);
  if (count == 0) {
    log_->WriteLine(kLogInfAhdlc, "Device received 0 bytes");
    return 0;
  }
  const uint32_t elapsed = clock_.TickMs() - start;
  if (time_out_ms != 0 && elapsed > time_out_ms) {
    log_->WriteLine(kLogInfAhdlc, "Timeout = %d ms", static_cast<int>(time_out_ms));
  }
  return 1;
}

uint32_t CProtAHDLC::Data2DM(uint8_t baud_rate_mask) {
  log_->WriteLine(kLogFnAhdlc, "CProtAHDLC::Data2DM(baudrate_mask=%d)", int{baud_rate_mask});
  if (port_ == nullptr) return 0;

  const PortContent content = port_->SetContent(PortContent::kBytes);
  const AtExit restored([&] { port_->SetContent(content); });
  const bool restore_rate = raw_data_flag_ == 0;
  uint32_t former_rate = 0;
  if (restore_rate) port_->GetBaudRate(former_rate);

  bool switched = false;
  for (const uint8_t bit : {kTry19200, kTry115200}) {
    if ((baud_rate_mask & bit) == 0) continue;
    port_->SetBaudRate(bit == kTry19200 ? 19200 : 115200);
    port_->FlushPCBuffer();
    FlushPhoneBuffer();
    switched = AsksForDiagnosticMode(*port_, clock_);
    if (switched) break;
  }

  if (restore_rate) port_->SetBaudRate(former_rate);
  port_->FlushPCBuffer();
  FlushPhoneBuffer();
  port_->FlushPCBuffer();
  if (!switched) return 0;
  clock_.SleepMs(kSettleMs);
  return 1;
}

}  // namespace kral
