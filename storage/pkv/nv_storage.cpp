// Numbered items, and which of the two places an item goes to.
#include "storage/pkv/nv_storage.h"

#include <set>

#include "base/little_endian.h"

namespace kral::pkv {

CNVStorage::CNVStorage(CompoundStorage& storage, uint16_t subscription, Access access)
    : storage_(storage),
      subscription_(subscription),
      access_(access),
      numbered_(storage.FindStorage(NameOfSubscription(kNumberedItems, subscription))) {
  if (numbered_ == nullptr) return;
  for (CompoundStorage& child : numbered_->storages) {
    const auto id = NumberOfName(child.name);
    if (id && *id <= UINT16_MAX) storages_.emplace(static_cast<uint16_t>(*id), &child);
  }
}

CompoundStorage* CNVStorage::NumberedStorage(uint16_t id) {
  const auto known = storages_.find(id);
  if (known != storages_.end()) return known->second;
  if (access_ == Access::kRead) return nullptr;
  if (numbered_ == nullptr) {
    numbered_ = &storage_.OpenOrAddStorage(NameOfSubscription(kNumberedItems, subscription_));
  }
  CompoundStorage& added = numbered_->storages.emplace_back();
  added.name = NumberedName(id);
  storages_.emplace(id, &added);
  return &added;
}

size_t CNVStorage::Write(const PkvNvItem& item) {
  if (array_.is_open()) return array_.Write(item) > 0 ? kNumberedRecordSize : 0;
  CompoundStorage* const storage = NumberedStorage(item.id);
  if (storage == nullptr || access_ == Access::kRead) return 0;
  const auto record = NumberedRecord(item);
  storage->OpenOrAddStream(NumberedName(item.index)).bytes.assign(record.begin(), record.end());
  return record.size();
}

bool CNVStorage::ReadNumbered(std::vector<PkvNvItem>& items, std::string& problem) const {
  for (const auto& [id, storage] : storages_) {
    for (const CompoundStream& stream : storage->streams) {
      PkvNvItem item;
      if (!ParseNumberedRecord(stream.bytes, item)) {
        problem = storage->name + "/" + stream.name + " has only " + std::to_string(stream.bytes.size()) + " of " +
                  std::to_string(kNumberedRecordSize) + " bytes";
        return false;
      }
      if (item.id != id || LoadLe<uint16_t>(stream.bytes, kNumberedLength) != kNumberedRecordSize) {
        problem = storage->name + "/" + stream.name + " is damaged";
        return false;
      }
      item.subscription = subscription_;
      items.push_back(item);
    }
  }
  return true;
}

std::vector<uint16_t> CNVStorage::Subscriptions(const CompoundStorage& storage) {
  std::set<uint16_t> found;
  for (const CompoundStream& stream : storage.streams) {
    if (const auto number = SubscriptionOfName(stream.name, kItemArray)) found.insert(*number);
  }
  for (const CompoundStorage& child : storage.storages) {
    if (const auto number = SubscriptionOfName(child.name, kNumberedItems)) found.insert(*number);
  }
  return {found.begin(), found.end()};
}

}  // namespace kral::pkv
