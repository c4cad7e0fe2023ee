// The handset's flash: sectors that are erased as a whole, and in which writing only clears bits.
#ifndef KRAL_HANDSET_LOADERS_FLASH_MEMORY_H
#define KRAL_HANDSET_LOADERS_FLASH_MEMORY_H

#include <cstdint>
#include <map>
#include <mutex>
#include <set>

#include "handset/line/bytes.h"

namespace kral::handset {

// Addresses wrap around at 32 bits. Thread-safe; what it holds survives every restart.
class FlashMemory {
 public:
  static constexpr uint8_t kErased = 0xFF;
  static constexpr uint32_t kSectorSize = 0x20000;

  // From now on a sector is erased when it is first written to, as a flash programmer does for each image.
  void BeginImage();
  void Program(uint32_t address, ByteView bytes);
  // As it stands, without erasing: for tests that want something there.
  void Fill(uint32_t address, ByteView bytes);

  Bytes Load(uint32_t address, size_t size) const;  // never written: erased

 private:
  Bytes& SectorLocked(uint32_t address);

  mutable std::mutex mutex_;
  std::map<uint32_t, Bytes> sectors_;  // by address / kSectorSize
  std::set<uint32_t> erased_;          // since the image began
};

}  // namespace kral::handset

#endif
