// What the handset sends of its own accord when it is told to: masks of logs, events and messages.
//
// Log configuration (115): ranges (1), set mask (3), get mask (4). Event mask: get (129), set (130). Message levels of
// a run of categories (125, 4).
#ifndef KRAL_HANDSET_SERVICES_LOG_SERVICE_H
#define KRAL_HANDSET_SERVICES_LOG_SERVICE_H

#include <array>
#include <atomic>
#include <map>
#include <mutex>
#include <vector>

#include "handset/line/bytes.h"
#include "handset/line/request_table.h"

namespace kral::handset {

class LogService final : public Service {
 public:
  static constexpr size_t kEquipmentIds = 16;

  LogService();

  void Register(RequestTable& table) override;
  void OnReset() override;  // nothing is on

  // The items of an equipment id, and of the event mask; all of them are then off.
  void SetItems(uint8_t equipment_id, uint32_t items);
  void SetEvents(uint16_t events);

  // What is on, in rising order. A log code is its equipment id times 4,096 and its item.
  std::vector<uint16_t> logs() const;
  std::vector<uint16_t> events() const;
  std::vector<uint16_t> categories() const;
  uint64_t changes() const { return changes_; }  // moves with every change of them

 private:
  using Mask = std::vector<bool>;

  void OnLogConfig(ByteView request, Wire& wire);
  void SetLogMask(ByteView request, Wire& wire);
  void OnGetEventMask(Wire& wire);
  void OnSetEventMask(ByteView request, Wire& wire);
  void OnMessageLevels(ByteView request, Wire& wire);

  mutable std::mutex mutex_;
  std::array<Mask, kEquipmentIds> logs_;
  Mask events_;
  std::map<uint16_t, uint32_t> levels_;  // by category
  std::atomic<uint64_t> changes_ = 0;
};

}  // namespace kral::handset

#endif
