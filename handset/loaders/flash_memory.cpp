// Sectors, erased when an image first reaches them.
#include "handset/loaders/flash_memory.h"

#include <algorithm>

namespace kral::handset {

void FlashMemory::BeginImage() {
  const std::lock_guard lock(mutex_);
  erased_.clear();
}

void FlashMemory::Program(uint32_t address, ByteView bytes) {
  const std::lock_guard lock(mutex_);
  while (!bytes.empty()) {
    const uint32_t offset = address % kSectorSize;
    const size_t count = std::min<size_t>(bytes.size(), kSectorSize - offset);
    Bytes& sector = SectorLocked(address);
    if (erased_.insert(address / kSectorSize).second) std::ranges::fill(sector, kErased);
    // Bits can be cleared only: a second, different write of the same place shows.
    for (size_t i = 0; i < count; ++i) sector[offset + i] &= bytes[i];
    bytes = bytes.subspan(count);
    address += static_cast<uint32_t>(count);
  }
}

void FlashMemory::Fill(uint32_t address, ByteView bytes) {
  const std::lock_guard lock(mutex_);
  for (const uint8_t byte : bytes) {
    SectorLocked(address)[address % kSectorSize] = byte;
    ++address;
  }
}

Bytes FlashMemory::Load(uint32_t address, size_t size) const {
  Bytes bytes(size, kErased);
  const std::lock_guard lock(mutex_);
  for (uint8_t& byte : bytes) {
    if (const auto sector = sectors_.find(address / kSectorSize); sector != sectors_.end()) {
      byte = sector->second[address % kSectorSize];
    }
    ++address;
  }
  return bytes;
}

Bytes& FlashMemory::SectorLocked(uint32_t address) {
  Bytes& sector = sectors_[address / kSectorSize];
  if (sector.empty()) sector.assign(kSectorSize, kErased);
  return sector;
}

}  // namespace kral::handset
