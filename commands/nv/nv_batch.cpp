// Packs queued NV writes into packets and judges the item results that come back.
#include "commands/nv/nv_batch.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "base/at_exit.h"
#include "base/little_endian.h"
#include "commands/checked_reply.h"
#include "commands/nv/nv_format.h"
#include "frame/request_failure.h"

namespace kral::nv {
namespace {

// Moves as many items as a packet takes from the queue into its payload.
u16 FillPayload(Diag_FTM& phone, std::deque<QueueItem>& queue, std::vector<u8>& payload) {
  u16 count = 0;
  while (!queue.empty()) {
    const auto& [item, data] = queue.front();
    if (payload.size() + data.size() + batch::kItemHeader >= batch::kPayloadLimit) break;
    phone.log().WriteLine(kLogRet, "     iItemID = %d (0x%X), iLength  = %d(0x%X)", item, static_cast<unsigned>(item),
                          static_cast<int>(data.size()), static_cast<unsigned>(data.size()));
    const u8 header[batch::kItemHeader] = {static_cast<u8>(data.size()), static_cast<u8>(item),
                                           static_cast<u8>(item >> 8), 0};
    payload.insert(payload.end(), std::begin(header), std::end(header));
    payload.insert(payload.end(), data.begin(), data.end());
    queue.pop_front();
    ++count;
  }
  return count;
}

u8 Judged(Diag_FTM& phone, std::span<const u16> read_only, u16 item, u8 status) {
  if (status != kReadOnly || std::ranges::find(read_only, item) == read_only.end()) return status;
  phone.log().WriteLine(kLogRet, "     Found item in the read-only list so no failure: iNvId = %d ", item);
  return kDone;
}

// Reads the item results up to the first failing one. A reply that holds fewer than it tells cannot be used, nor can
// one that tells of more or fewer items than were sent.
bool TakeResults(Diag_FTM& phone, u16 sent, std::span<const u16> read_only, BatchOutcome& outcome,
                 const BatchObserver& observer) {
  const auto reply = phone.packet().response();
  const auto count = LoadLe<u16>(reply, batch::kResultCount);
  const auto total_status = LoadLe<u16>(reply, batch::kTotalStatus);
  if (!count || !total_status) {
    phone.log().WriteLine(kLogErr, "NV batch reply of %d bytes is too short", static_cast<int>(reply.size()));
    return Fail(BadReply(phone, "is too short"));
  }
  outcome.total_status = *total_status;
  auto rest = reply.subspan(batch::kResults);
  for (u16 i = 0; i < *count; ++i) {
    if (rest.size() < batch::kItemHeader || rest.size() - batch::kItemHeader < rest[0]) {
      phone.log().WriteLine(kLogErr, "NV batch reply ends within item result %d of %d", i + 1, *count);
      return Fail(BadReply(phone, "ends within an item result"));
    }
    outcome.last_item = *LoadLe<u16>(rest, batch::kResultItem);
    outcome.last_item_status = Judged(phone, read_only, outcome.last_item, rest[batch::kResultStatus]);
    if (observer) observer(outcome.last_item, outcome.last_item_status);
    if (outcome.last_item_status != kDone) {
      phone.log().WriteLine(kLogErr, "     Error Detected: iLastErrorNvId = %d, iLastItemStatus = %d )",
                            outcome.last_item, outcome.last_item_status);
      Fail(Refusal(outcome.last_item, outcome.last_item_status));
      return true;
    }
    ++outcome.items_written;
    rest = rest.subspan(batch::kItemHeader + rest[0]);
  }
  if (*count == sent) return true;
  phone.log().WriteLine(kLogErr, "NV batch reply has %d item results for %d items", *count, sent);
  return Fail(BadReply(phone, "has results for another number of items"));
}

// Item by item as far as both go: a reply with other items is one to an earlier batch. One of other items in number
// answers this batch, badly.
bool AnswersBatch(std::span<const u8> reply, std::span<const u8> request) {
  const size_t echoed = kWriteBatch.header.echoed;
  if (reply.size() < echoed) return true;
  if (!std::equal(reply.begin(), reply.begin() + static_cast<std::ptrdiff_t>(echoed), request.begin())) return false;
  auto sent = request.subspan(batch::kPayload);
  auto results = reply.subspan(std::min(reply.size(), batch::kResults));
  while (results.size() >= batch::kItemHeader && sent.size() >= batch::kItemHeader) {
    if (LoadLe<u16>(results, batch::kResultItem) != LoadLe<u16>(sent, batch::kResultItem)) return false;
    results = results.subspan(std::min<size_t>(results.size(), batch::kItemHeader + results[0]));
    sent = sent.subspan(std::min<size_t>(sent.size(), batch::kItemHeader + sent[0]));
  }
  return true;
}

Reply SendPacket(Diag_FTM& phone, std::deque<QueueItem>& list, std::span<const u16> read_only, BatchOutcome& outcome,
                 const BatchObserver& observer) {
  std::vector<u8> payload;
  payload.reserve(batch::kPayloadLimit);
  const u16 count = FillPayload(phone, list, payload);
  Compose(phone, kWriteBatch, count, static_cast<u16>(payload.size()), u16{0}, Bytes(payload));
  const Reply reply =
      phone.Send(phone.packet(), phone.TimeOut(kTimeOutDefaultCommand), 0,
                 [&](std::span<const u8> bytes) { return AnswersBatch(bytes, phone.packet().request()); });
  if (!reply) {
    phone.log().WriteLine(kLogErr,
                          "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Error occurred during send sync operation.");
  }
  return Checked(reply, [&] { return TakeResults(phone, count, read_only, outcome, observer); });
}

}  // namespace

void SetBatchMode(Diag_FTM& phone, bool on) {
  Batch& batch = phone.state<Batch>();
  batch.queue.clear();
  batch.on = on;
}

void Enqueue(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data) {
  const auto kept = data.first(std::min(data.size(), kDataSize));
  auto& queue = phone.state<Batch>().queue;
  queue.push_back({item, {kept.begin(), kept.end()}});
  phone.log().WriteLine(kLogRet, "DIAG_NV_Add_WRITE_QueueItem(iItemID = %d, iLength = %d)", item,
                        static_cast<int>(kept.size()));
  phone.log().WriteLine(kLogRet, "DIAG_NV_Add_WRITE_QueueItem() -- Queue Size = %d", static_cast<int>(queue.size()));
}

void SetReadOnlyList(Diag_FTM& phone, std::span<const uint16_t> items) {
  phone.state<Batch>().read_only.assign(items.begin(), items.end());
  for (const uint16_t item : items) {
    phone.log().WriteLine(kLogRet, "KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List( ) -- Adding NV ID #%d", item);
  }
}

Reply WriteBatch(Diag_FTM& phone, std::deque<QueueItem>& list, std::span<const uint16_t> read_only,
                 BatchOutcome& outcome, const BatchObserver& observer) {
  outcome = {};
  Reply reply(ReplyKind::kExpected);  // of nothing to send, too
  while (reply && outcome.last_item_status == kDone && !list.empty()) {
    reply = SendPacket(phone, list, read_only, outcome, observer);
  }
  return reply;
}

bool FlushBatchQueue(Diag_FTM& phone, BatchOutcome& outcome, const BatchObserver& observer) {
  const AtExit end([&phone] { SetBatchMode(phone, false); });
  Batch& callers = phone.state<Batch>();
  phone.log().WriteLine(kLogRet, "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Queue size = %d",
                        static_cast<int>(callers.queue.size()));
  const Reply reply = WriteBatch(phone, callers.queue, callers.read_only, outcome, observer);
  phone.log().WriteLine(kLogRet, "KRAL_DIAG_NV_WRITE_FlushBatchQueue( ) -- Number Items Written = %d",
                        static_cast<int>(outcome.items_written));
  return reply && outcome.last_item_status == kDone;
}

}  // namespace kral::nv
