// Hands out the view of a mapped file, or the copy that was made of it, within its bounds.
#include "download/images/phone_image_binary.h"

#include <algorithm>
#include <limits>
#include <new>
#include <utility>

namespace kral::images {
namespace {

// A station has memory for that; what is larger is read by each handset, out of the system's cache.
constexpr uint32_t kMostKept = 256 * 1024 * 1024;

void CheckRegion(uint32_t region) {
  if (region != 0) throw PhoneImageException::ReadFailure(region, 0);
}

}  // namespace

bool PhoneImageBinary::Open(const std::string& path) {
  base_ = size_ = start_ = total_ = 0;
  kept_.reset();
  const bool mapped = file_.Open(path, false) != nullptr;
  too_large_ = file_.too_large() || file_.Size() > std::numeric_limits<uint32_t>::max();
  if (too_large_) file_.Close();
  if (!mapped || too_large_) return false;
  size_ = total_ = static_cast<uint32_t>(file_.Size());
  return true;
}

void PhoneImageBinary::KeepInMemory() {
  if (kept_ || total_ > kMostKept) return;
  std::unique_ptr<uint8_t[]> copy(new (std::nothrow) uint8_t[total_]);
  if (!copy) return;
  if (!file_.Copy(0, copy.get(), total_)) throw PhoneImageException::ReadFailure(0, total_);
  kept_ = std::move(copy);
  file_.Close();
}

void PhoneImageBinary::Clear() {
  throw PhoneImageException::WriteFailure(0, GetTotalSize());
}

uint32_t PhoneImageBinary::GetBaseAddress(uint32_t region) const {
  CheckRegion(region);
  return 0;  // the base that was set is kept but not reported
}

uint32_t PhoneImageBinary::GetTotalSize() const {
  return total_;
}

uint32_t PhoneImageBinary::GetSize(uint32_t region) const {
  CheckRegion(region);
  return size_;
}

uint32_t PhoneImageBinary::GetLastAddress(uint32_t region) const {
  CheckRegion(region);
  return GetTotalSize() - 1;  // of the file, whatever size was set
}

uint32_t PhoneImageBinary::GetStartAddress() const {
  return start_;
}

uint8_t* PhoneImageBinary::GetPointer(uint32_t offset) {
  if (offset >= GetTotalSize()) throw PhoneImageException::ReadFailure(offset, 1);
  return const_cast<uint8_t*>(bytes()) + offset;
}

void PhoneImageBinary::Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const {
  CheckRegion(region);
  if (uint64_t{address} + count > total_) throw PhoneImageException::ReadFailure(address, count);
  if (kept_) {
    std::copy_n(kept_.get() + address, count, static_cast<uint8_t*>(buffer));
  } else if (!file_.Copy(address, buffer, count)) {
    throw PhoneImageException::ReadFailure(address, count);
  }
}

void PhoneImageBinary::SetBaseAddress(uint32_t value, uint32_t region) {
  CheckRegion(region);
  base_ = value;
}

void PhoneImageBinary::SetSize(uint32_t value, uint32_t region) {
  CheckRegion(region);
  size_ = value;
}

void PhoneImageBinary::SetStartAddress(uint32_t value) {
  start_ = value;
}

void PhoneImageBinary::Write(uint32_t address, const void*, uint32_t count, uint32_t) {
  throw PhoneImageException::WriteFailure(address, count);
}

}  // namespace kral::images
