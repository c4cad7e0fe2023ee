// Items in the fixed records of an item array, and the free slots between them.
#include "storage/nv_item_stream.h"

#include <algorithm>

namespace kral {

using pkv::kArrayRecordSize;

void CNVItemStream::Open(CompoundStorage& storage, uint16_t subscription, pkv::Access access) {
  Close();
  open_ = true;
  access_ = access;
  subscription_ = subscription;
  const std::string name = pkv::NameOfSubscription(pkv::kItemArray, subscription);
  stream_ = access == pkv::Access::kReadWrite ? &storage.OpenOrAddStream(name) : storage.FindStream(name);
  if (stream_ == nullptr) return;
  const std::span<const uint8_t> bytes(stream_->bytes);
  PkvNvItem item;
  uint16_t flags = 0;
  for (size_t position = 0; pkv::ParseArrayRecord(bytes.subspan(position), item, flags); position += kArrayRecordSize) {
    if ((flags & pkv::kRecordInUse) != 0) {
      positions_[item.id] = position;
    } else {
      free_slots_.insert(position);
    }
  }
}

PkvNvItem CNVItemStream::ItemAt(size_t position) const {
  PkvNvItem item;
  uint16_t flags = 0;
  pkv::ParseArrayRecord(std::span<const uint8_t>(stream_->bytes).subspan(position), item, flags);
  item.subscription = subscription_;
  return item;
}

bool CNVItemStream::Find(uint16_t id, PkvNvItem& item) const {
  const auto found = positions_.find(id);
  if (found == positions_.end()) return false;
  item = ItemAt(found->second);
  return true;
}

std::vector<PkvNvItem> CNVItemStream::Items() const {
  std::vector<size_t> positions;
  for (const auto& [id, position] : positions_) positions.push_back(position);
  std::sort(positions.begin(), positions.end());
  std::vector<PkvNvItem> items;
  items.reserve(positions.size());
  for (const size_t position : positions) items.push_back(ItemAt(position));
  return items;
}

size_t CNVItemStream::ClaimPosition(uint16_t id) {
  if (const auto known = positions_.find(id); known != positions_.end()) return known->second;
  size_t position = 0;
  if (!free_slots_.empty()) {
    position = *free_slots_.begin();
    free_slots_.erase(free_slots_.begin());
  } else {
    // Behind the last whole record: what a short one left there would put all later records out of step.
    position = stream_->bytes.size() / kArrayRecordSize * kArrayRecordSize;
    stream_->bytes.resize(position + kArrayRecordSize);
  }
  positions_[id] = position;
  return position;
}

size_t CNVItemStream::Write(const PkvNvItem& item) {
  if (!writable()) return 0;
  const auto record = pkv::ArrayRecord(item);
  const auto position = static_cast<ptrdiff_t>(ClaimPosition(item.id));  // first: it may move the bytes
  std::copy(record.begin(), record.end(), stream_->bytes.begin() + position);
  return record.size();
}

bool CNVItemStream::Delete(uint16_t id) {
  const auto found = positions_.find(id);
  if (!writable() || found == positions_.end()) return false;
  const auto record = stream_->bytes.begin() + static_cast<ptrdiff_t>(found->second);
  std::fill(record + pkv::kArrayFlags, record + kArrayRecordSize, uint8_t{0});
  free_slots_.insert(found->second);
  positions_.erase(found);
  return true;
}

}  // namespace kral
