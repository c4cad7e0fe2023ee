// A large range of bytes that takes memory only near the bytes written; all others read as erased flash, 0xFF.
#ifndef KRAL_DOWNLOAD_IMAGES_DEMAND_PAGED_MEMORY_H
#define KRAL_DOWNLOAD_IMAGES_DEMAND_PAGED_MEMORY_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "platform/virtual_memory.h"

namespace kral::images {

// What erased flash reads as.
inline constexpr uint8_t kErased = 0xFF;

// The callers check offset + count against reserved().
class CDemandPagedMemory {
 public:
  // Memory is committed in aligned stretches of this many bytes.
  static constexpr uint32_t kStretch = 0x80000;

  // Takes the address space. Asked a second time, it does nothing for a size that fits and throws for a larger one.
  void Reserve(uint64_t bytes);

  // From now on everything reads as 0xFF, also through GetPointer.
  void Clear();

  void Read(uint32_t offset, void* buffer, uint32_t count) const;
  void Write(uint32_t offset, const void* data, uint32_t count);

  // Commits the stretch of the byte, so that it can be written through the pointer.
  uint8_t* GetPointer(uint32_t offset);

  uint32_t reserved() const { return reserved_; }
  uint32_t committed() const { return committed_; }

 private:
  bool IsCommitted(uint32_t offset) const { return stretches_[offset / kStretch] != 0; }
  uint32_t StretchLength(uint32_t start) const;
  void CommitStretch(uint32_t start);

  VirtualRange range_;
  std::vector<uint8_t> stretches_;  // one per stretch: 1 when committed
  uint32_t reserved_ = 0;
  uint32_t committed_ = 0;
  bool fill_ = false;  // new pages are set to 0xFF
};

}  // namespace kral::images

#endif
