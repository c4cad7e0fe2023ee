// Files as memory, on Linux.
#include "platform/file_mapping.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <limits>

namespace kral {

uint8_t* CMapFileToMemory::Open(const std::string& path, bool writable) {
  Close();
  too_large_ = false;
  // Without O_NONBLOCK the name of a pipe would hang here.
  const int file = ::open(path.c_str(), (writable ? O_RDWR : O_RDONLY) | O_CLOEXEC | O_NONBLOCK);
  last_error_ = file < 0 ? static_cast<uint32_t>(errno) : 0;
  if (file < 0) return nullptr;
  file_ = file;

  struct stat status {};
  last_error_ = ::fstat(file, &status) != 0 ? static_cast<uint32_t>(errno) : 0;
  const auto size = static_cast<uint64_t>(status.st_size);
  too_large_ = last_error_ == 0 && size > std::numeric_limits<size_t>::max();
  if (too_large_) last_error_ = EFBIG;
  if (last_error_ != 0) {
    Close();
    return nullptr;
  }

  void* view =
      ::mmap(nullptr, static_cast<size_t>(size), writable ? PROT_READ | PROT_WRITE : PROT_READ, MAP_SHARED, file, 0);
  last_error_ = view == MAP_FAILED ? static_cast<uint32_t>(errno) : 0;
  too_large_ = last_error_ == ENOMEM;
  if (view == MAP_FAILED) {
    Close();
    return nullptr;
  }
  view_ = static_cast<uint8_t*>(view);
  size_ = size;
  return view_;
}

// Not out of the view: between any look at the size and the copy the file may shrink, and the signal that follows
// cannot be told from any other. Both have the same pages.
bool CMapFileToMemory::Copy(uint64_t offset, void* buffer, size_t count) const {
  auto* bytes = static_cast<uint8_t*>(buffer);
  while (count > 0) {
    const ssize_t received = ::pread(static_cast<int>(file_), bytes, count, static_cast<off_t>(offset));
    if (received < 0 && errno == EINTR) continue;
    if (received <= 0) return false;
    bytes += received;
    offset += static_cast<uint64_t>(received);
    count -= static_cast<size_t>(received);
  }
  return true;
}

void CMapFileToMemory::Close() {
  if (view_ != nullptr) ::munmap(view_, static_cast<size_t>(size_));
  if (file_ != kInvalid) ::close(static_cast<int>(file_));
  view_ = nullptr;
  size_ = 0;
  file_ = kInvalid;
}

}  // namespace kral
