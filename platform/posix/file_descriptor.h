// An owned file descriptor, and an event that ends a poll from another thread.
#ifndef KRAL_PLATFORM_POSIX_FILE_DESCRIPTOR_H
#define KRAL_PLATFORM_POSIX_FILE_DESCRIPTOR_H

#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdint>
#include <utility>

namespace kral {

class FileDescriptor {
 public:
  FileDescriptor() = default;
  explicit FileDescriptor(int fd) : fd_(fd) {}
  FileDescriptor(FileDescriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    FileDescriptor old(std::exchange(fd_, std::exchange(other.fd_, -1)));
    return *this;
  }
  ~FileDescriptor() {
    if (fd_ >= 0) ::close(fd_);
  }

  int get() const { return fd_; }
  bool valid() const { return fd_ >= 0; }
  int Release() { return std::exchange(fd_, -1); }  // to another owner

 private:
  int fd_ = -1;
};

// Remembers a signal until it is taken.
class WakeEvent {
 public:
  WakeEvent() : fd_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

  bool valid() const { return fd_.valid(); }
  int fd() const { return fd_.get(); }

  void Signal() {
    const uint64_t one = 1;
    [[maybe_unused]] const auto written = ::write(fd_.get(), &one, sizeof one);
  }
  bool Take() {
    uint64_t count = 0;
    return ::read(fd_.get(), &count, sizeof count) == static_cast<ssize_t>(sizeof count);
  }

 private:
  FileDescriptor fd_;
};

}  // namespace kral

#endif
