// Items in the fixed records of an item array, and the free slots between them.
#include "storage/pkv/item_array.h"

#include <algorithm>

namespace kral::pkv {

void CNVItemStream::Open(CompoundStorage& storage, uint16_t subscription, Access access) {
  Close();
  open_ = true;
  access_ = access;
  subscription_ = subscription;
  const std::string name = NameOfSubscription(kItemArray, subscription);
  stream_ = access == Access::kReadWrite ? &storage.OpenOrAddStream(name) : storage.FindStream(name);
  if (stream_ == nullptr) return;
  const std::span<const uint8_t> bytes(stream_->bytes);
  PkvNvItem item;
  uint16_t flags = 0;
  for (size_t position = 0; ParseArrayRecord(bytes.subspan(position), item, flags); position += kArrayRecordSize) {
    if ((flags & kRecordInUse) != 0) {
      records_[item.id][position] = item.index;
    } else {
      free_slots_.insert(position);
    }
  }
}

PkvNvItem CNVItemStream::ItemAt(size_t position) const {
  PkvNvItem item;
  uint16_t flags = 0;
  ParseArrayRecord(std::span<const uint8_t>(stream_->bytes).subspan(position), item, flags);
  item.subscription = subscription_;
  return item;
}

bool CNVItemStream::Find(uint16_t id, PkvNvItem& item) const {
  const auto found = records_.find(id);
  if (found == records_.end()) return false;
  item = ItemAt(found->second.rbegin()->first);
  return true;
}

std::vector<PkvNvItem> CNVItemStream::Items() const {
  std::vector<size_t> positions;
  for (const auto& [id, records] : records_) {
    std::map<uint16_t, size_t> last;
    for (const auto& [position, index] : records) last[index] = position;
    for (const auto& [index, position] : last) positions.push_back(position);
  }
  std::ranges::sort(positions);
  std::vector<PkvNvItem> items;
  items.reserve(positions.size());
  for (const size_t position : positions) items.push_back(ItemAt(position));
  return items;
}

size_t CNVItemStream::ClaimPosition(uint16_t id) {
  if (const auto known = records_.find(id); known != records_.end()) return known->second.rbegin()->first;
  size_t position = 0;
  if (!free_slots_.empty()) {
    position = *free_slots_.begin();
    free_slots_.erase(free_slots_.begin());
  } else {
    // Behind the last whole record: what a short one left there would put all later records out of step.
    position = stream_->bytes.size() / kArrayRecordSize * kArrayRecordSize;
    stream_->bytes.resize(position + kArrayRecordSize);
  }
  return position;
}

size_t CNVItemStream::Write(const PkvNvItem& item) {
  if (!writable()) return 0;
  const auto record = ArrayRecord(item);
  const size_t position = ClaimPosition(item.id);  // first: it may move the bytes
  std::ranges::copy(record, stream_->bytes.begin() + static_cast<ptrdiff_t>(position));
  records_[item.id][position] = item.index;
  return record.size();
}

bool CNVItemStream::Delete(uint16_t id, std::optional<uint16_t> index) {
  const auto found = records_.find(id);
  if (!writable() || found == records_.end()) return false;
  const size_t count = std::erase_if(found->second, [&](const auto& record) {
    if (index && record.second != *index) return false;
    const auto begin = stream_->bytes.begin() + static_cast<ptrdiff_t>(record.first);
    std::fill(begin + kArrayFlags, begin + kArrayRecordSize, uint8_t{0});
    free_slots_.insert(record.first);
    return true;
  });
  if (found->second.empty()) records_.erase(found);
  return count > 0;
}

}  // namespace kral::pkv
