// The NV items of one subscription in a storage: in its item array when that is open, one per stream otherwise.
#ifndef KRAL_STORAGE_PKV_NV_STORAGE_H
#define KRAL_STORAGE_PKV_NV_STORAGE_H

#include <map>
#include <string>
#include <vector>

#include "storage/pkv/item_array.h"

namespace kral::pkv {

// Refers to the storage, which must outlive it.
class CNVStorage {
 public:
  CNVStorage(CompoundStorage& storage, uint16_t subscription, Access access);

  void OpenItemArray() { array_.Open(storage_, subscription_, access_); }
  void CloseItemArray() { array_.Close(); }
  const CNVItemStream& item_array() const { return array_; }

  // 134 either way, though a record of the array has 136 bytes; 0 when the storage was opened for reading.
  size_t Write(const PkvNvItem& item);

  // Appends the numbered items. False when a stream is too short for a record; `problem` then names it.
  bool ReadNumbered(std::vector<PkvNvItem>& items, std::string& problem) const;

  // The subscriptions of which a storage holds an item array or numbered items, in rising order.
  static std::vector<uint16_t> Subscriptions(const CompoundStorage& storage);

 private:
  CompoundStorage* NumberedStorage(uint16_t id);

  CompoundStorage& storage_;
  const uint16_t subscription_;
  const Access access_;
  CNVItemStream array_;
  CompoundStorage* numbered_ = nullptr;            // null: not there yet
  std::map<uint16_t, CompoundStorage*> storages_;  // of numbered items, remembered per id
};

}  // namespace kral::pkv

#endif
