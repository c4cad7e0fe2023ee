// Regions and bounds of the sparse image; the bytes are CDemandPagedMemory's.
#include "download/images/phone_image_dpaged.h"

#include <utility>

namespace kral::images {

PhoneImageDPaged::PhoneImageDPaged(uint32_t maximum_kib, PhoneImageDecoder* decoder) : PhoneImage(decoder) {
  memory_.Reserve(uint64_t{maximum_kib} * 1024);
  memory_.Clear();
}

void PhoneImageDPaged::Clear() {
  memory_.Clear();
}

uint32_t PhoneImageDPaged::GetBaseAddress(uint32_t region) const {
  return At(region).base;
}

uint32_t PhoneImageDPaged::GetTotalSize() const {
  return memory_.reserved();
}

uint32_t PhoneImageDPaged::GetSize(uint32_t region) const {
  return At(region).size;
}

uint32_t PhoneImageDPaged::GetLastAddress(uint32_t region) const {
  return At(region).base + At(region).size - 1;
}

uint32_t PhoneImageDPaged::GetStartAddress() const {
  return start_;
}

uint8_t* PhoneImageDPaged::GetPointer(uint32_t offset) {
  if (offset >= memory_.reserved()) throw PhoneImageException::PagedAllocation(offset, 1);
  return memory_.GetPointer(offset);
}

void PhoneImageDPaged::Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const {
  const uint32_t offset = OffsetOf(address, region);
  if (!Fits(offset, count)) throw PhoneImageException::ReadFailure(offset, count);
  memory_.Read(offset, buffer, count);
}

void PhoneImageDPaged::SetBaseAddress(uint32_t value, uint32_t region) {
  At(region).base = value;
}

void PhoneImageDPaged::SetSize(uint32_t value, uint32_t region) {
  At(region).size = value;
}

void PhoneImageDPaged::SetStartAddress(uint32_t value) {
  start_ = value;
}

void PhoneImageDPaged::Write(uint32_t address, const void* data, uint32_t count, uint32_t region) {
  const uint32_t offset = OffsetOf(address, region);
  if (!Fits(offset, count)) throw PhoneImageException::WriteFailure(offset, count);
  Region& target = At(region);
  if (target.size == 0) {
    target.size = count;  // whatever the distance from the base: kept
  } else if (address + count > GetLastAddress(region)) {
    target.size = address - target.base + count;
  }
  memory_.Write(offset, data, count);
}

const PhoneImageDPaged::Region& PhoneImageDPaged::At(uint32_t region) const {
  if (region >= regions_.size()) throw PhoneImageException::ReadFailure(region, 0);
  return regions_[region];
}

PhoneImageDPaged::Region& PhoneImageDPaged::At(uint32_t region) {
  return const_cast<Region&>(std::as_const(*this).At(region));
}

uint32_t PhoneImageDPaged::OffsetOf(uint32_t address, uint32_t region) const {
  const uint32_t offset = address - At(region).base;
  return region == 1 ? offset + regions_[0].size : offset;
}

// The offset is an address and wraps; the end of the copy must not.
bool PhoneImageDPaged::Fits(uint32_t offset, uint32_t count) const {
  return uint64_t{offset} + count <= memory_.reserved();
}

}  // namespace kral::images
