// The batch mode of NV writes: items are queued, and a flush sends them in few packets.
#ifndef KRAL_COMMANDS_NV_NV_BATCH_H
#define KRAL_COMMANDS_NV_NV_BATCH_H

#include <cstdint>
#include <deque>
#include <functional>
#include <span>
#include <vector>

#include "frame/diag_ftm.h"

namespace kral::nv {

struct QueueItem {
  uint16_t item;
  std::vector<uint8_t> data;  // at most 128 bytes
};

// NV writes collected for few packets.
struct Batch {
  bool on = false;
  std::deque<QueueItem> queue;
  std::vector<uint16_t> read_only;  // items whose refusal as read-only is no error
};

// Clears the queue; the read-only list stays.
void SetBatchMode(Diag_FTM& phone, bool on);
// Puts a copy behind the queue, cut at 128 bytes.
void Enqueue(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data);
void SetReadOnlyList(Diag_FTM& phone, std::span<const uint16_t> items);

struct BatchOutcome {
  uint16_t last_item = 0xFFFF;  // of the last result that was read: the failing one, if any
  uint16_t total_status = 0;    // of the last packet, as the handset told
  uint8_t last_item_status = 0;
  uint32_t items_written = 0;
};

// Each item result as it is read; status 0 also for an item of the read-only list that was refused as such.
using BatchObserver = std::function<void(uint16_t item, uint8_t status)>;

// Sends a list of items, which it empties packet by packet. The reply is the expected one when all packets were
// answered in full, up to the first failing item: the outcome has its status. An item of `read_only` does not fail by
// being refused as such.
Reply WriteBatch(Diag_FTM& phone, std::deque<QueueItem>& list, std::span<const uint16_t> read_only,
                 BatchOutcome& outcome, const BatchObserver& observer = {});

// Sends what is queued and leaves batch mode, whatever happens. True when every item was answered and none failed;
// the first failing item ends the flush behind its packet, and what is still queued is dropped.
bool FlushBatchQueue(Diag_FTM& phone, BatchOutcome& outcome, const BatchObserver& observer = {});

}  // namespace kral::nv

#endif
