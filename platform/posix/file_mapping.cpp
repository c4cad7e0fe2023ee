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
  // Without O_NONBLOCK the name of a pipe would hang here.
  const int file = ::open(path.c_str(), (writable ? O_RDWR : O_RDONLY) | O_CLOEXEC | O_NONBLOCK);
  last_error_ = file < 0 ? static_cast<uint32_t>(errno) : 0;
  if (file < 0) return nullptr;
  file_ = file;

  struct stat status {};
  last_error_ = ::fstat(file, &status) != 0 ? static_cast<uint32_t>(errno) : 0;
  const auto size = static_cast<uint64_t>(status.st_size);
  if (last_error_ == 0 && size > std::numeric_limits<size_t>::max()) last_error_ = EFBIG;
  if (last_error_ != 0) {
    Close();
    return nullptr;
  }

  void* view =
      ::mmap(nullptr, static_cast<size_t>(size), writable ? PROT_READ | PROT_WRITE : PROT_READ, MAP_SHARED, file, 0);
  last_error_ = view == MAP_FAILED ? static_cast<uint32_t>(errno) : 0;
  if (view == MAP_FAILED) {
    Close();
    return nullptr;
  }
  view_ = static_cast<uint8_t*>(view);
  size_ = size;
  return view_;
}

void CMapFileToMemory::Close() {
  if (view_ != nullptr) ::munmap(view_, static_cast<size_t>(size_));
  if (file_ != kInvalid) ::close(static_cast<int>(file_));
  view_ = nullptr;
  size_ = 0;
  file_ = kInvalid;
}

}  // namespace kral
