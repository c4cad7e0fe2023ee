// Reserved and committed memory, on Windows.
#include "platform/virtual_memory.h"

#include <windows.h>

namespace kral {

size_t SystemPageSize() {
  SYSTEM_INFO info{};
  ::GetSystemInfo(&info);
  return info.dwPageSize;
}

bool VirtualRange::Reserve(size_t bytes) {
  Release();
  const size_t page = SystemPageSize();
  const size_t size = (bytes + page - 1) / page * page;
  void* data = ::VirtualAlloc(nullptr, size, MEM_RESERVE, PAGE_READWRITE);
  if (data == nullptr) return false;
  data_ = static_cast<uint8_t*>(data);
  size_ = size;
  return true;
}

bool VirtualRange::Commit(size_t offset, size_t length) {
  const size_t page = SystemPageSize();
  const size_t first = offset / page * page;
  const size_t last = (offset + length + page - 1) / page * page;
  if (last > size_ || last < first) return false;
  return ::VirtualAlloc(data_ + first, last - first, MEM_COMMIT, PAGE_READWRITE) != nullptr;
}

void VirtualRange::Release() {
  if (data_ != nullptr) ::VirtualFree(data_, 0, MEM_RELEASE);
  data_ = nullptr;
  size_ = 0;
}

}  // namespace kral
