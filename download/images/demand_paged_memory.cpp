// Commits stretches of a reserved range as writes reach them, and reads the rest as 0xFF.
#include "download/images/demand_paged_memory.h"

#include <algorithm>
#include <cstring>
#include <limits>

#include "download/images/phone_image.h"

namespace kral::images {
namespace {

// Calls piece(offset, position, length) for each part of a copy that lies within one stretch.
template <class Piece>
void ForEachPiece(uint32_t offset, uint32_t count, Piece&& piece) {
  for (uint32_t done = 0; done < count;) {
    const uint32_t here = offset + done;
    const uint32_t length = std::min(CDemandPagedMemory::kStretch - here % CDemandPagedMemory::kStretch, count - done);
    piece(here, done, length);
    done += length;
  }
}

}  // namespace

void CDemandPagedMemory::Reserve(uint64_t bytes) {
  const auto requested = static_cast<uint32_t>(std::min<uint64_t>(bytes, std::numeric_limits<uint32_t>::max()));
  if (reserved_ != 0 && bytes <= reserved_) return;
  if (reserved_ != 0 || bytes != requested) throw PhoneImageException::PagedAllocation(0, requested);
  if (bytes == 0) return;
  std::vector<uint8_t> stretches(requested / kStretch + 1);
  if (!range_.Reserve(requested)) throw PhoneImageException::PagedAllocation(0, requested);
  stretches_ = std::move(stretches);
  reserved_ = requested;
}

void CDemandPagedMemory::Clear() {
  fill_ = true;
  for (uint32_t index = 0; index < stretches_.size(); ++index) {
    const uint32_t start = index * kStretch;
    if (stretches_[index] != 0) std::memset(range_.data() + start, kErased, StretchLength(start));
  }
}

void CDemandPagedMemory::Read(uint32_t offset, void* buffer, uint32_t count) const {
  auto* bytes = static_cast<uint8_t*>(buffer);
  ForEachPiece(offset, count, [this, bytes](uint32_t here, uint32_t done, uint32_t length) {
    if (IsCommitted(here)) {
      std::memcpy(bytes + done, range_.data() + here, length);
    } else {
      std::memset(bytes + done, kErased, length);
    }
  });
}

void CDemandPagedMemory::Write(uint32_t offset, const void* data, uint32_t count) {
  const auto* bytes = static_cast<const uint8_t*>(data);
  ForEachPiece(offset, count, [this, bytes](uint32_t here, uint32_t done, uint32_t length) {
    if (!IsCommitted(here)) CommitStretch(here - here % kStretch);
    std::memcpy(range_.data() + here, bytes + done, length);
  });
}

uint8_t* CDemandPagedMemory::GetPointer(uint32_t offset) {
  if (!IsCommitted(offset)) {
    CommitStretch(offset - offset % kStretch);
    range_.data()[offset] = kErased;  // the byte asked for is erased even before the first Clear
  }
  return range_.data() + offset;
}

uint32_t CDemandPagedMemory::StretchLength(uint32_t start) const {
  return std::min(kStretch, reserved_ - start);
}

void CDemandPagedMemory::CommitStretch(uint32_t start) {
  const uint32_t length = StretchLength(start);
  if (!range_.Commit(start, length)) throw PhoneImageException::PagedAllocation(start, length);
  if (fill_) std::memset(range_.data() + start, kErased, length);
  stretches_[start / kStretch] = 1;
  committed_ += length;
}

}  // namespace kral::images
