// The bytes of a port, both ways: pieces and deadlines of a device, and the caller's functions, whose counts are
// checked before anybody believes them.
#include <algorithm>

#include "base/at_exit.h"
#include "base/guarded_call.h"
#include "platform/forced_unwind.h"
#include "transport/line/serial_port.h"

namespace kral {
namespace {

// What a caller's function may say it moved: no more than it was given or had room for.
uint32_t Believable(uint32_t told, uint32_t possible, const char* function, DataLogFileHandler& log) {
  if (told > possible) {
    log.WriteLine(kLogErr, "CSerialPort::%s: the caller's function tells of %u bytes where %u were possible", function,
                  told, possible);
  }
  return std::min(told, possible);
}

struct CallersException {};

// One of the caller's transport functions; its exception ends what it was called for, as a device's does.
template <class Function, class... Arguments>
uint32_t CallTransport(Function function, Arguments... arguments) {
  uint32_t result = 0;
  if (!CallGuarded([&] { result = function(arguments...); })) throw CallersException();
  return result;
}

}  // namespace

uint32_t CSerialPort::Send(const uint8_t* bytes, uint32_t count) {
  log_->WriteLine(kLogFnDev, "CSerialPort::Send(nbyte=%d)", count);
  uint32_t sent = 0;
  try {
    const uint32_t result = SendTapped(bytes, count, sent);
    log_->WriteLine(kLogRetDev, "CSerialPort::Send(bytes_sent=%d) ... OK", result);
    return result;
  } catch (...) {
    PassForcedUnwind();
    log_->WriteLine(kLogErr, "CSerialPort::Send(bytes_sent=%d)--exception occurred", sent);
    return 0;
  }
}

uint32_t CSerialPort::SendTapped(const uint8_t* bytes, uint32_t count, uint32_t& sent) {
  Tell(PortDirection::kSent, {bytes, count});
  const AtExit told([&] {
    if (tap_ != nullptr && sent < count) tap_->OnShortWrite(sent, count);
  });
  return user_defined_ ? SendToUser(bytes, count, sent) : SendToDevice(bytes, count, sent);
}

void CSerialPort::Tell(PortDirection direction, std::span<const uint8_t> bytes) const {
  if (tap_ != nullptr) tap_->OnBytes(direction, content_, bytes);
}

uint32_t CSerialPort::SendToDevice(const uint8_t* bytes, uint32_t count, uint32_t& sent) {
  const auto device = Device();
  may_have_sent_ = false;
  const uint32_t limit = write_size_limit_;
  if (!device || limit == 0) return 0;
  const uint32_t start = clock_.TickMs();
  const uint32_t time_out = write_timeout_;
  do {
    const uint32_t piece = std::min(count - sent, limit);
    const uint32_t left = time_out - std::min(clock_.TickMs() - start, time_out);
    // A millisecond even so: a driver may be done with a piece as good as at once.
    const size_t written = device->Write({bytes + sent, piece}, std::max(left, 1U));
    const auto taken = static_cast<uint32_t>(std::min<size_t>(written, piece));
    sent += taken;
    may_have_sent_ = sent > 0;
    if (clock_.TickMs() - start > time_out) {
      // A late write counts as failed even if everything was written: the reply could no longer be told from the
      // next request's.
      log_->WriteLine(kLogInfDev, "CSerialPort::Send: %u of %u bytes after more than %u ms", sent, count, time_out);
      return 0;
    }
    if (device->gone()) device->Wake();  // who waits for its bytes may not have noticed
    if (sent == count || device->gone()) break;
    if (taken == 0) clock_.SleepMs(1);  // a driver that refuses at once must not keep the thread busy
  } while (device->OutputRoom() > 0);
  return sent;
}

uint32_t CSerialPort::SendToUser(const uint8_t* bytes, uint32_t count, uint32_t& sent) {
  may_have_sent_ = true;
  const UserTransport user = User();
  if (user.send == nullptr) return 1;  // "one byte" without moving any
  uint32_t written = count;
  if (CallTransport(user.send, user.context, user.handle, count, bytes, &written) != 0) return 0;
  sent = Believable(written, count, "Send", *log_);
  return sent;
}

uint32_t CSerialPort::Receive(uint8_t* buffer, uint32_t count) {
  uint32_t received = 0;
  try {
    const uint32_t result =
        user_defined_ ? ReceiveFromUser(buffer, count, received) : ReceiveFromDevice(buffer, count, received);
    Tell(PortDirection::kReceived, {buffer, received});
    if (received > 0) log_->WriteLine(kLogRetDev, "CSerialPort::Receive(wRec=%d) ... OK", received);
    return result;
  } catch (...) {
    PassForcedUnwind();
    log_->WriteLine(kLogErr, "CSerialPort::Receive(wRec=%d, nByte=%d)--exception occurred", received, count);
    log_->WriteLine(kLogErr, "CSerialPort::Receive() returns=%d", 0);
    return 0;
  }
}

uint32_t CSerialPort::ReceiveFromDevice(uint8_t* buffer, uint32_t count, uint32_t& received) {
  const auto device = Device();
  if (!device) return 0;
  while (received < count) {
    const uint32_t room = count - received;
    const size_t taken = std::min<size_t>(device->Read({buffer + received, room}), room);
    if (taken == 0) break;
    received += static_cast<uint32_t>(taken);
    if (received == count || device->InputWaiting() == 0) break;
  }
  return received;
}

uint32_t CSerialPort::ReceiveFromUser(uint8_t* buffer, uint32_t count, uint32_t& received) {
  const UserTransport user = User();
  if (user.receive == nullptr) return 1;  // "one byte" without moving any
  uint32_t delivered = count;
  if (CallTransport(user.receive, user.context, user.handle, &delivered, buffer) != 0) return 0;
  received = Believable(delivered, count, "Receive", *log_);
  return received;
}

uint32_t CSerialPort::FlushPCBuffer() {
  log_->WriteLine(kLogFnDev, "CSerialPort::FlushPCBuffer()");
  if (!user_defined_) {
    const auto device = Device();
    if (device) device->PurgeInput();
    return device ? 1 : 0;
  }
  const UserTransport user = User();
  if (user.flush == nullptr) return 1;
  try {
    CallTransport(user.flush, user.context, user.handle);
  } catch (...) {
    PassForcedUnwind();
    log_->WriteLine(kLogErr, "CSerialPort::FlushPCBuffer()--exception occurred");
  }
  return 0;  // 0 after the caller's flush, 1 without one: the asymmetry is part of the interface
}

}  // namespace kral
