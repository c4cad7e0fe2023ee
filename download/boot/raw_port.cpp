// Raw bytes to and from the port. What they mean is the protocol's affair, who may open the port the phone object's.
#include "download/boot/raw_port.h"

#include <algorithm>

#include "base/hex_dump.h"
#include "frame/request_failure.h"

namespace kral::kivrat {
namespace {

// What a driver's queue holds: each such piece has the time that any write has, so that a slow line can take a packet
// of many of them.
constexpr size_t kDevicePiece = 4096;
constexpr uint32_t kLookAroundMs = 50;
constexpr uint32_t kQuietMs = 50;
constexpr size_t kLongestDump = 64;  // the bytes of images are left out of the log

}  // namespace

// May call the caller's flush function, in which its host can end the thread.
RawPort::~RawPort() noexcept(false) {
  if (!keep_) GiveBack();
}

bool RawPort::Open() {
  port_ = phone_.BorrowPort();
  return port_ != nullptr;
}

void RawPort::GiveBack() {
  // Rests of an exchange would only confuse whoever has the port next.
  Purge();
  phone_.GiveBackPort();
  port_ = nullptr;
}

bool RawPort::Write(std::span<const uint8_t> packet) {
  if (port_ == nullptr) return false;
  LogTraffic("SEND", packet);
  // Transports of a caller may keep writes apart, as packets are.
  const size_t most = port_->user_defined() ? packet.size() : kDevicePiece;
  while (!packet.empty()) {
    const size_t piece = std::min(packet.size(), most);
    const uint32_t sent = port_->Send(packet.data(), static_cast<uint32_t>(piece));
    if (sent == 0) return false;
    packet = packet.subspan(std::min<size_t>(sent, piece));
  }
  return true;
}

size_t RawPort::Read(std::span<uint8_t> buffer, size_t enough) {
  if (port_ == nullptr) return 0;
  Clock& clock = phone_.clock();
  const uint32_t start = clock.TickMs();
  uint32_t last = start;  // when something came
  size_t count = 0;
  bool promised = false;
  while (count < buffer.size()) {
    const auto room = static_cast<uint32_t>(buffer.size() - count);
    const uint32_t received = std::min(port_->Receive(buffer.data() + count, room), room);
    count += received;
    const uint32_t now = clock.TickMs();
    const uint32_t passed = now - start;
    if (received != 0) last = now;
    if (count == buffer.size() || passed >= read_time_out_ms_ || stopped()) break;
    if (count >= enough && now - last >= kQuietMs) break;
    if (port_->gone()) {
      phone_.log().WriteLine(kLogErr, "RawPort: the device has gone");
      break;
    }
    // Nothing was there in spite of a promise, or nobody can promise anything.
    if (received == 0 && (promised || !port_->CanWait())) clock.SleepMs(1);
    promised = port_->CanWait() && port_->WaitReadable(std::min(read_time_out_ms_ - passed, kLookAroundMs));
  }
  LogTraffic("REC", buffer.first(count));
  return count;
}

void RawPort::Purge() {
  if (port_ != nullptr) port_->FlushPCBuffer();
}

Failure RawPort::NotOpened() const {
  if (phone_.server_mode()) return Failure(KRAL_ERROR_ARGUMENT, "a boot transfer needs direct mode");
  return PortFailure(phone_);
}

Failure RawPort::NotRead(const char* what, size_t count, size_t size) const {
  if (stopped()) return Failure(KRAL_ERROR_ABORTED, "the boot transfer was aborted while %s was awaited", what);
  if (gone())
    return Failure(KRAL_ERROR_LOST, "the device on COM%d went away while %s was awaited", phone_.port(), what);
  if (count == 0) return Failure(KRAL_ERROR_NO_ANSWER, "%s did not come within %u ms", what, read_time_out_ms_);
  return Failure(KRAL_ERROR_LINK, "of %s came %zu of %zu bytes", what, count, size);
}

Failure RawPort::NotWritten(const char* what) const {
  if (gone())
    return Failure(KRAL_ERROR_LOST, "the device on COM%d went away while %s was written", phone_.port(), what);
  return Failure(KRAL_ERROR_LINK, "%s could not be written to COM%d", what, phone_.port());
}

void RawPort::Pause(uint32_t milliseconds) {
  while (milliseconds > 0 && !stopped()) {
    const uint32_t piece = std::min(milliseconds, kLookAroundMs);
    phone_.clock().SleepMs(piece);
    milliseconds -= piece;
  }
}

void RawPort::LogTraffic(const char* direction, std::span<const uint8_t> bytes) {
  DataLogFileHandler& log = phone_.log();
  if (!log.Wants(kLogIo)) return;
  log.WriteLine(kLogIo, "RAW %s (%d bytes): %s%s", direction, static_cast<int>(bytes.size()),
                HexDump(bytes.first(std::min(bytes.size(), kLongestDump))).c_str(),
                bytes.size() > kLongestDump ? "..." : "");
}

}  // namespace kral::kivrat
