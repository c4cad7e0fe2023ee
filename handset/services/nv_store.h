// The handset's non-volatile items: numbered, 128 bytes each, per subscription; arrays hold several elements.
#ifndef KRAL_HANDSET_SERVICES_NV_STORE_H
#define KRAL_HANDSET_SERVICES_NV_STORE_H

#include <array>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <tuple>

#include "handset/line/request_table.h"

namespace kral::handset {

inline constexpr uint16_t kSerialNumberItem = 0;
inline constexpr uint16_t kFtmBootItem = 453;

enum class NvStatus : uint16_t {
  kDone = 0,
  kFailed = 4,
  kInactive = 5,  // never written
  kBadItem = 6,
  kReadOnly = 7,
};

// Item read (38) and write (39), and subsystem 48: batch write (0), read (1) and write (2) of a subscription. The plain
// requests and the batch act on subscription 0. Items survive a restart.
class NvStore final : public Service {
 public:
  static constexpr size_t kItemSize = 128;
  static constexpr size_t kElementSize = kItemSize - 1;  // a write of an element begins with its index
  using Data = std::array<uint8_t, kItemSize>;

  explicit NvStore(uint32_t serial_number);

  void Register(RequestTable& table) override;

  // As the host does it.
  NvStatus Read(uint16_t item, Data& data, uint16_t subscription = 0) const;
  NvStatus Write(uint16_t item, ByteView data, uint16_t subscription = 0);

  // As the factory does it: no status stands in the way.
  void Set(uint16_t item, ByteView data, uint16_t subscription = 0);           // cut, or filled up with zeros
  std::optional<Bytes> Value(uint16_t item, uint16_t subscription = 0) const;  // nothing when inactive
  void Erase(uint16_t item, uint16_t subscription = 0);                        // inactive again
  void SetReadOnly(uint16_t item, bool read_only = true);
  // Reads and writes of the item answer this, whatever it holds; kDone takes it away.
  void SetStatus(uint16_t item, NvStatus status);

  // Makes an item an array: reads and writes name one of its elements.
  void MakeArray(uint16_t item, uint8_t count);
  void SetElement(uint16_t item, uint8_t index, ByteView data);
  std::optional<Bytes> Element(uint16_t item, uint8_t index) const;

 private:
  using Key = std::tuple<uint16_t, uint16_t, uint8_t>;  // item, subscription, element

  void ReadPlain(ByteView request, Wire& wire) const;
  void ReadElement(ByteView request, Wire& wire) const;
  void WriteBatch(ByteView request, Wire& wire);
  NvStatus ReadLocked(const Key& key, Data& data) const;
  std::optional<Bytes> ValueOf(const Key& key) const;

  mutable std::mutex mutex_;
  std::map<Key, Data> values_;
  std::map<uint16_t, NvStatus> statuses_;
  std::map<uint16_t, uint8_t> arrays_;  // number of elements
  std::set<uint16_t> read_only_;
};

}  // namespace kral::handset

#endif
