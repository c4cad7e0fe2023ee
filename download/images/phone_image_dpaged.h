// The sparse image that a decoder fills: two regions over demand-paged memory.
#ifndef KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_DPAGED_H
#define KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_DPAGED_H

#include <array>
#include <cstdint>

#include "download/images/demand_paged_memory.h"
#include "download/images/phone_image.h"

namespace kral::images {

// The bytes of region 1 are stored directly behind those of region 0. Every operation throws "Read Failure" for a
// region above 1.
class PhoneImageDPaged final : public PhoneImage {
 public:
  // Reserves the address space for the whole maximum at once; throws "Paged Allocation" when there is none.
  PhoneImageDPaged(uint32_t maximum_kib, PhoneImageDecoder* decoder);

  void Clear() override;
  uint32_t GetBaseAddress(uint32_t region) const override;
  uint32_t GetTotalSize() const override;
  uint32_t GetSize(uint32_t region) const override;
  uint32_t GetLastAddress(uint32_t region) const override;
  uint32_t GetStartAddress() const override;
  uint8_t* GetPointer(uint32_t offset) override;
  void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const override;
  void SetBaseAddress(uint32_t value, uint32_t region) override;
  void SetSize(uint32_t value, uint32_t region) override;
  void SetStartAddress(uint32_t value) override;
  void Write(uint32_t address, const void* data, uint32_t count, uint32_t region) override;

  uint32_t committed() const { return memory_.committed(); }

 private:
  struct Region {
    uint32_t base = 0;
    uint32_t size = 0;
  };

  Region& At(uint32_t region);
  const Region& At(uint32_t region) const;
  uint32_t OffsetOf(uint32_t address, uint32_t region) const;
  bool Fits(uint32_t offset, uint32_t count) const;

  CDemandPagedMemory memory_;
  std::array<Region, 2> regions_{};
  uint32_t start_ = 0;
};

}  // namespace kral::images

#endif
