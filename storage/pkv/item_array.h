// The item array of one subscription: a stream of fixed records, each an item or a free slot.
#ifndef KRAL_STORAGE_PKV_ITEM_ARRAY_H
#define KRAL_STORAGE_PKV_ITEM_ARRAY_H

#include <map>
#include <optional>
#include <set>
#include <vector>

#include "platform/compound_file.h"
#include "storage/pkv/pkv_format.h"

namespace kral::pkv {

// Refers to the storage's stream, which must outlive it.
class CNVItemStream {
 public:
  // Without a stream of the subscription there are no items; only read-write access creates it.
  void Open(CompoundStorage& storage, uint16_t subscription, Access access);
  void Close() { *this = CNVItemStream(); }
  bool is_open() const { return open_; }

  // By id: of several records with one id the last counts.
  bool Find(uint16_t id, PkvNvItem& item);
  // Appends them in the order of their records. Records of one id with different index words are items of their own, as
  // others write arrays; of several with the same index word the last counts.
  void AppendItems(std::vector<PkvNvItem>& items) const;

  // In place when the id is there, else into the lowest free slot, else at the end. Gives the bytes written: 136, or
  // 0 when the stream was opened for reading.
  size_t Write(const PkvNvItem& item);
  // Leaves free slots where the id, or the id with this index word, was; false when it was nowhere and when the stream
  // was opened for reading.
  bool Delete(uint16_t id, std::optional<uint16_t> index = std::nullopt);

 private:
  bool writable() const { return stream_ != nullptr && access_ == Access::kReadWrite; }
  void Index();
  size_t ClaimPosition(uint16_t id);
  PkvNvItem ItemAt(size_t position) const;

  CompoundStream* stream_ = nullptr;
  Access access_ = Access::kRead;
  uint16_t subscription_ = 0;
  bool open_ = false;
  // Of what is written or looked for by id; reading everything needs none of it.
  bool indexed_ = false;
  std::map<uint16_t, std::map<size_t, uint16_t>> records_;  // by id: where they are, and their index words
  std::set<size_t> free_slots_;                             // the lowest is used first
};

}  // namespace kral::pkv

#endif
