// Address space that costs memory only where it is used.
#ifndef KRAL_PLATFORM_VIRTUAL_MEMORY_H
#define KRAL_PLATFORM_VIRTUAL_MEMORY_H

#include <cstddef>
#include <cstdint>

namespace kral {

size_t SystemPageSize();

// One reserved range of addresses. Nothing in it may be touched before it was committed.
class VirtualRange {
 public:
  VirtualRange() = default;
  ~VirtualRange() { Release(); }
  VirtualRange(const VirtualRange&) = delete;
  VirtualRange& operator=(const VirtualRange&) = delete;

  // Takes whole pages of address space covering `bytes`, releasing an earlier range. False when there is no room.
  bool Reserve(size_t bytes);
  // Makes the whole pages that cover the stretch readable and writable; new pages are zero. False when the system has
  // no memory left.
  bool Commit(size_t offset, size_t length);
  void Release();

  uint8_t* data() const { return data_; }

 private:
  uint8_t* data_ = nullptr;
  size_t size_ = 0;
};

}  // namespace kral

#endif
