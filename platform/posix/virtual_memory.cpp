// Reserved and committed memory, on Linux.
#include "platform/virtual_memory.h"

#include <sys/mman.h>
#include <unistd.h>

namespace kral {

size_t SystemPageSize() {
  return static_cast<size_t>(::sysconf(_SC_PAGESIZE));
}

bool VirtualRange::Reserve(size_t bytes) {
  Release();
  const size_t page = SystemPageSize();
  const size_t size = (bytes + page - 1) / page * page;
  void* data = ::mmap(nullptr, size, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (data == MAP_FAILED) return false;
  data_ = static_cast<uint8_t*>(data);
  size_ = size;
  return true;
}

bool VirtualRange::Commit(size_t offset, size_t length) {
  const size_t page = SystemPageSize();
  const size_t first = offset / page * page;
  const size_t last = (offset + length + page - 1) / page * page;
  if (last > size_ || last < first) return false;
  return ::mprotect(data_ + first, last - first, PROT_READ | PROT_WRITE) == 0;
}

void VirtualRange::Release() {
  if (data_ != nullptr) ::munmap(data_, size_);
  data_ = nullptr;
  size_ = 0;
}

}  // namespace kral
