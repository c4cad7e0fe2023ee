// Items in the fixed records of an item array, and the free slots between them.
#include "storage/pkv/item_array.h"

#include <algorithm>
#include <functional>
#include <utility>

#include "base/little_endian.h"

namespace kral::pkv {
namespace {

// Of keys with the same upper half the one with the greatest lower half, and all in the order of those.
void KeepLastOfEach(std::vector<uint64_t>& keys) {
  std::ranges::sort(keys, std::greater<>());
  const auto is_same = [](uint64_t a, uint64_t b) { return a >> 32 == b >> 32; };
  keys.erase(std::unique(keys.begin(), keys.end(), is_same), keys.end());
  std::ranges::sort(keys, {}, [](uint64_t key) { return static_cast<uint32_t>(key); });
}

}  // namespace

void CNVItemStream::Open(CompoundStorage& storage, uint16_t subscription, Access access) {
  Close();
  open_ = true;
  access_ = access;
  subscription_ = subscription;
  const std::string name = NameOfSubscription(kItemArray, subscription);
  stream_ = access == Access::kReadWrite ? &storage.OpenOrAddStream(name) : storage.FindStream(name);
}

void CNVItemStream::Index() {
  if (std::exchange(indexed_, true) || stream_ == nullptr) return;
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

bool CNVItemStream::Find(uint16_t id, PkvNvItem& item) {
  Index();
  const auto found = records_.find(id);
  if (found == records_.end()) return false;
  item = ItemAt(found->second.rbegin()->first);
  return true;
}

// Numbers are sorted, and only where ids come out of order: an array may hold tens of thousands of records.
void CNVItemStream::AppendItems(std::vector<PkvNvItem>& items) const {
  if (stream_ == nullptr) return;
  const std::span<const uint8_t> bytes(stream_->bytes);
  const auto count = static_cast<uint32_t>(bytes.size() / kArrayRecordSize);
  std::vector<uint64_t> keys;  // id, index word, number of the record
  keys.reserve(count);
  for (uint32_t number = 0; number < count; ++number) {
    const auto record = bytes.subspan(number * kArrayRecordSize, kArrayData);
    if ((*LoadLe<uint16_t>(record, kArrayFlags) & kRecordInUse) == 0) continue;
    const uint32_t item = uint32_t{*LoadLe<uint16_t>(record, kArrayId)} << 16 | *LoadLe<uint16_t>(record, kArrayIndex);
    keys.push_back(uint64_t{item} << 32 | number);
  }
  const auto is_not_below = [](uint64_t a, uint64_t b) { return a >> 32 >= b >> 32; };
  if (std::ranges::adjacent_find(keys, is_not_below) != keys.end()) KeepLastOfEach(keys);
  items.reserve(items.size() + keys.size());
  for (const uint64_t key : keys) items.push_back(ItemAt(static_cast<uint32_t>(key) * kArrayRecordSize));
}

size_t CNVItemStream::ClaimPosition(uint16_t id) {
  Index();
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
  Index();
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
