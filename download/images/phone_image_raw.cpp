// The two kinds of image over a copy of the caller's bytes; they differ in Read only.
#include "download/images/phone_image_raw.h"

#include <cstring>
#include <limits>

namespace kral::images {

bool PhoneImageRaw::SetData(const void* data, uint32_t length) {
  if (data == nullptr || length == std::numeric_limits<uint32_t>::max()) return false;
  uint8_t* block = AddBlock(size_t{length} + 1);
  std::memcpy(block, data, length);
  buffer_ = block;
  length_ = length + 1;
  return true;
}

uint8_t* PhoneImageRaw::GetPointer(uint32_t offset) {
  if (offset >= length_) throw PhoneImageException::ReadFailure(offset, 1);
  return buffer_ + offset;
}

void PhoneImageRawBinary::Read(uint32_t address, void* buffer, uint32_t count, uint32_t) const {
  if (count > length_) throw PhoneImageException::Unnamed(address, count);
  if (count != 0) std::memcpy(buffer, buffer_, count);
}

void PhoneImageRawBuffer::Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const {
  if (region != 0 || uint64_t{address} + count > length_) throw PhoneImageException::ReadFailure(address, count);
  if (count != 0) std::memcpy(buffer, buffer_ + address, count);
}

}  // namespace kral::images
