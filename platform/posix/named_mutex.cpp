// The system-visible marker of a port in use, on Linux.
#include "platform/named_mutex.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <utility>

#include "platform/posix/file_descriptor.h"

namespace kral {
namespace {

// A name in the abstract socket space: seen by every process (/proc/net/unix), gone with its last holder even after a
// crash, and no file. Nobody listens on it.
class SocketMarker final : public NamedMutex {
 public:
  SocketMarker(FileDescriptor socket, uint32_t value) : socket_(std::move(socket)), value_(value) {}
  uint32_t value() const override { return value_; }

 private:
  FileDescriptor socket_;
  uint32_t value_;
};

// Counts up, so that a released handle does not come back to life with the next connect.
uint32_t NextValue() {
  static std::atomic<uint32_t> last{0};
  uint32_t value = ++last;
  if (value == 0) value = ++last;
  return value;
}

}  // namespace

std::unique_ptr<NamedMutex> CreateNamedMutex(const std::string& name) {
  FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!socket.valid()) return nullptr;
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  // The first byte stays 0: that makes the name abstract.
  const size_t length = std::min(name.size(), sizeof address.sun_path - 1);
  std::copy_n(name.begin(), length, address.sun_path + 1);
  const auto size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + length);
  // A name that another process has taken already is no failure: creating a mutex that exists opens it.
  [[maybe_unused]] const int bound = ::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), size);
  return std::make_unique<SocketMarker>(std::move(socket), NextValue());
}

}  // namespace kral
