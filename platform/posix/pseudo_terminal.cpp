// The pty pair behind a software handset. Who answers on it is the caller's affair.
#include "platform/pseudo_terminal.h"

#include <fcntl.h>
#include <stdlib.h>
#include <termios.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "platform/posix/file_descriptor.h"
#include "platform/posix/poll_wait.h"

namespace kral {
namespace {

class PosixPseudoTerminal final : public PseudoTerminal {
 public:
  PosixPseudoTerminal(FileDescriptor master, FileDescriptor slave, WakeEvent wake, std::string path)
      : master_(std::move(master)), slave_(std::move(slave)), wake_(std::move(wake)), path_(std::move(path)) {}

  const std::string& device_path() const override { return path_; }

  size_t Write(std::span<const uint8_t> bytes) override {
    size_t done = 0;
    while (done < bytes.size()) {
      const ssize_t written = ::write(master_.get(), bytes.data() + done, bytes.size() - done);
      if (written > 0) {
        done += static_cast<size_t>(written);
      } else if (written == 0 || errno != EINTR) {
        break;
      }
    }
    return done;
  }

  size_t Read(std::span<uint8_t> buffer) override {
    const ssize_t received = ::read(master_.get(), buffer.data(), buffer.size());
    return received > 0 ? static_cast<size_t>(received) : 0;
  }

  bool WaitReadable(uint32_t milliseconds) override {
    std::array<pollfd, 2> watched = {{{master_.get(), POLLIN, 0}, {wake_.fd(), POLLIN, 0}}};
    if (!PollFor(watched, milliseconds)) return false;
    if (watched[1].revents != 0) wake_.Take();
    return (watched[0].revents & POLLIN) != 0;
  }

  void Wake() override { wake_.Signal(); }

 private:
  FileDescriptor master_;
  // Kept open: without any opener the line settings would fall back, and reads and polls here would fail at once.
  FileDescriptor slave_;
  WakeEvent wake_;
  std::string path_;
};

bool MakeRaw(int fd) {
  termios settings{};
  if (::tcgetattr(fd, &settings) != 0) return false;
  ::cfmakeraw(&settings);
  return ::tcsetattr(fd, TCSANOW, &settings) == 0;
}

}  // namespace

std::unique_ptr<PseudoTerminal> OpenPseudoTerminal(std::string& error) {
  const auto fail = [&error](const char* step) {
    error = std::string("no pseudo terminal: ") + step + ": " + std::generic_category().message(errno);
    return nullptr;
  };
  FileDescriptor master(::posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC));
  if (!master.valid()) return fail("posix_openpt");
  std::array<char, 128> path{};
  if (::grantpt(master.get()) != 0 || ::unlockpt(master.get()) != 0) return fail("unlockpt");
  if (::ptsname_r(master.get(), path.data(), path.size()) != 0) return fail("ptsname");
  FileDescriptor slave(::open(path.data(), O_RDWR | O_NOCTTY | O_CLOEXEC));
  if (!slave.valid()) return fail(path.data());
  if (!MakeRaw(slave.get())) return fail("raw mode");
  WakeEvent wake;
  if (!wake.valid()) return fail("eventfd");
  return std::make_unique<PosixPseudoTerminal>(std::move(master), std::move(slave), std::move(wake), path.data());
}

}  // namespace kral
