// A tty as the serial device of a COM number: raw, exclusive, non-blocking.
#include "platform/serial_device.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <system_error>
#include <thread>

#include "platform/com_port_opener.h"
#include "platform/posix/file_descriptor.h"
#include "platform/posix/line_settings.h"
#include "platform/posix/poll_wait.h"
#include "platform/posix/port_sources.h"

namespace kral {
namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr size_t kDriverBuffer = 4096;
constexpr milliseconds kWriteConstant{50};
constexpr uint32_t kFirstBaudRate = 115200;

DeviceResult Failure(DeviceError error, int code) {
  return {error, static_cast<uint32_t>(code), std::generic_category().message(code)};
}

DeviceResult Failure(int code) {
  switch (code) {
    case ENOENT:
    case ENXIO:
    case ENODEV:
      return Failure(DeviceError::kNoSuchPort, code);
    case EBUSY:
    case EWOULDBLOCK:
      return Failure(DeviceError::kBusy, code);
    case EACCES:
    case EPERM:
      return Failure(DeviceError::kNotPermitted, code);
    case ENOMEM:
      return Failure(DeviceError::kNoMemory, code);
    default:
      return Failure(DeviceError::kOther, code);
  }
}

bool IsVanished(int code) {
  return code == EIO || code == ENXIO || code == ENODEV;
}

class Tty final : public SerialDevice {
 public:
  Tty(FileDescriptor fd, WakeEvent wake) : fd_(std::move(fd)), wake_(std::move(wake)) {}
  ~Tty() override;

  size_t Write(std::span<const uint8_t> bytes, uint32_t longest_ms) override;
  size_t OutputRoom() override { return kDriverBuffer - std::min(Queued(), kDriverBuffer); }
  size_t Read(std::span<uint8_t> buffer) override;
  size_t InputWaiting() override;
  bool gone() const override { return gone_; }
  bool WaitReadable(uint32_t time_out) override;
  void Wake() override { wake_.Signal(); }
  DeviceResult SetBaudRate(uint32_t rate) override;
  uint32_t BaudRate() const override { return baud_rate_; }
  DeviceResult SetDtr(bool high) override { return SetLine(TIOCM_DTR, high); }
  DeviceResult SetRts(bool high) override { return SetLine(TIOCM_RTS, high); }
  void PurgeInput() override { ::tcflush(fd_.get(), TCIFLUSH); }
  void PurgeBoth() override { ::tcflush(fd_.get(), TCIOFLUSH); }

 private:
  size_t Queued() const;
  bool WaitQueueBelow(size_t level, steady_clock::time_point deadline) const;
  DeviceResult SetLine(int line, bool high);

  const pid_t owner_ = ::getpid();  // children of a fork have a copy of all this
  FileDescriptor fd_;
  WakeEvent wake_;
  std::atomic<bool> gone_{false};
  std::atomic<bool> stalled_{false};  // the last write ran out of time
  uint32_t baud_rate_ = kFirstBaudRate;
};

// A close with bytes still queued may block for half a minute in the kernel: give them the time of a write, no more,
// and none where they have just had it.
Tty::~Tty() {
  if (::getpid() != owner_) return;  // the line goes on being the parent's
  const size_t queued = Queued();
  const auto time = stalled_ ? milliseconds(0) : milliseconds(queued) + kWriteConstant;
  if (queued > 0 && !WaitQueueBelow(1, steady_clock::now() + time)) ::tcflush(fd_.get(), TCOFLUSH);
  ::ioctl(fd_.get(), TIOCNXCL);
  // The lock ends with the last copy of the descriptor, and children of a fork have one each.
  ::flock(fd_.get(), LOCK_UN);
}

size_t Tty::Queued() const {
  int queued = 0;
  if (gone_ || ::ioctl(fd_.get(), TIOCOUTQ, &queued) != 0 || queued < 0) return 0;
  return static_cast<size_t>(queued);
}

bool Tty::WaitQueueBelow(size_t level, steady_clock::time_point deadline) const {
  while (Queued() >= level) {
    if (steady_clock::now() >= deadline) return false;
    std::this_thread::sleep_for(milliseconds(1));
  }
  return true;
}

// Done when the driver holds the bytes; where it holds a whole buffer of them, when it has room again, as the end of
// a write means room on the other platform.
size_t Tty::Write(std::span<const uint8_t> bytes, uint32_t longest_ms) {
  const auto deadline =
      steady_clock::now() + std::min(milliseconds(bytes.size()) + kWriteConstant, milliseconds(longest_ms));
  size_t done = 0;
  stalled_ = false;
  while (done < bytes.size() && !gone_) {
    const ssize_t written = ::write(fd_.get(), bytes.data() + done, bytes.size() - done);
    if (written > 0) {
      done += static_cast<size_t>(written);
      continue;
    }
    if (written < 0 && errno == EINTR) continue;
    if (written < 0 && errno != EAGAIN) {
      gone_ = gone_ || IsVanished(errno);
      break;
    }
    const auto left = std::chrono::ceil<milliseconds>(deadline - steady_clock::now()).count();
    std::array<pollfd, 1> watched = {{{fd_.get(), POLLOUT, 0}}};
    if (left > 0 && PollFor(watched, static_cast<uint32_t>(left))) continue;
    stalled_ = true;
    break;
  }
  if (!WaitQueueBelow(kDriverBuffer, deadline)) stalled_ = true;
  return done;
}

size_t Tty::Read(std::span<uint8_t> buffer) {
  if (buffer.empty()) return 0;
  for (;;) {
    const ssize_t received = ::read(fd_.get(), buffer.data(), buffer.size());
    if (received > 0) return static_cast<size_t>(received);
    if (received < 0 && errno == EINTR) continue;
    // With at least one byte asked for, an end of file is a line that was hung up.
    if (received == 0 || IsVanished(errno)) gone_ = true;
    return 0;
  }
}

size_t Tty::InputWaiting() {
  int waiting = 0;
  if (::ioctl(fd_.get(), FIONREAD, &waiting) != 0 || waiting < 0) return 0;
  return static_cast<size_t>(waiting);
}

bool Tty::WaitReadable(uint32_t time_out) {
  // A vanished device is always "ready": leave it out, or the caller's loop would spin.
  std::array<pollfd, 2> watched = {{{gone_ ? -1 : fd_.get(), POLLIN, 0}, {wake_.fd(), POLLIN, 0}}};
  if (!PollFor(watched, time_out)) return false;
  if (watched[1].revents != 0) wake_.Take();
  const bool readable = (watched[0].revents & POLLIN) != 0;
  if (!readable && (watched[0].revents & (POLLHUP | POLLERR | POLLNVAL)) != 0) gone_ = true;
  return readable;
}

DeviceResult Tty::SetBaudRate(uint32_t rate) {
  const int error = ChangeBaudRate(fd_.get(), rate);
  if (error != 0) return Failure(error);
  baud_rate_ = rate;
  return {};
}

DeviceResult Tty::SetLine(int line, bool high) {
  if (::ioctl(fd_.get(), high ? TIOCMBIS : TIOCMBIC, &line) != 0) return Failure(errno);
  return {};
}

bool IsPseudoTerminal(int fd) {
  struct stat status {};
  if (::fstat(fd, &status) != 0) return false;
  const unsigned int kind = major(status.st_rdev);
  return kind >= 136 && kind <= 143;
}

// Keeps everybody else out: other users of this library by the lock (root included), other programs by the exclusive
// mark. A pseudo terminal would keep that mark after a crash of its holder, so it has the lock only.
int HoldExclusively(int fd) {
  if (::flock(fd, LOCK_EX | LOCK_NB) != 0) return errno;
  if (!IsPseudoTerminal(fd) && ::ioctl(fd, TIOCEXCL) != 0) return errno;
  return 0;
}

std::unique_ptr<SerialDevice> OpenTty(const std::string& path, DeviceResult& result) {
  const auto fail = [&result](DeviceResult reason) {
    result = std::move(reason);
    return nullptr;
  };
  if (path.empty()) return fail(Failure(ENOENT));
  FileDescriptor fd(::open(path.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC));
  if (!fd.valid()) return fail(Failure(errno));
  // A file that is no tty, or the kernel's entry for a chip that is not there (EIO).
  if (::isatty(fd.get()) == 0) return fail(Failure(DeviceError::kNoSuchPort, errno));
  if (const int error = HoldExclusively(fd.get())) return fail(Failure(error));
  WakeEvent wake;
  if (!wake.valid()) return fail(Failure(DeviceError::kBuffers, errno));
  if (const int error = ApplyLineSettings(fd.get(), kFirstBaudRate)) {
    return fail(Failure(DeviceError::kLineSettings, error));
  }
  result = {};
  return std::make_unique<Tty>(std::move(fd), std::move(wake));
}

}  // namespace

std::unique_ptr<SerialDevice> OpenComPort(int number, DeviceResult& result) {
  return ComPortOpener()(number, result);
}

std::unique_ptr<SerialDevice> ComPortOpener::operator()(int number, DeviceResult& result) const {
  uint32_t place = *last_place_;
  const std::string path = ComPortDevice(CurrentPortSources(), number, place);
  auto device = OpenTty(path, result);
  if (device) *last_place_ = place;
  return device;
}

}  // namespace kral
