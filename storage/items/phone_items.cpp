// NV items of the handset, one by one and in batches. Their files are in phone_item_files.cpp.
#include "storage/items/phone_items.h"

#include <algorithm>
#include <deque>

#include "commands/checked_reply.h"
#include "commands/nv/nv_batch.h"
#include "commands/nv/nv_format.h"
#include "frame/request_failure.h"

namespace kral::items {
namespace {

constexpr size_t kElementSize = nv::kDataSize - 1;  // a write has the index in front

std::vector<uint8_t> WireData(const pkv::PkvNvItem& item, bool element) {
  if (!element) return {item.data.begin(), item.data.end()};
  std::vector<uint8_t> data{static_cast<uint8_t>(item.index)};
  data.insert(data.end(), item.data.begin(), item.data.begin() + kElementSize);
  return data;
}

}  // namespace

PhoneItems::Answer PhoneItems::Try(const std::function<Reply()>& ask) {
  for (int i = 0; i < kTries; ++i) {
    if (went_away()) {
      Fail(PortFailure(phone_));
      return Answer::kLost;
    }
    const Reply reply = ask();
    refusal_ = RefusesAnother(reply, phone_.packet().request()) ? uint8_t{0} : reply.refusal();
    has_answered_ = has_answered_ || reply.came();
    if (reply) return Answer::kAnswered;
    if (reply.kind() == ReplyKind::kGone) return Answer::kLost;
    if (refusal_ != 0) return Answer::kRefused;
    if (aborts_.aborted()) return Answer::kLost;
  }
  return Unanswered();
}

// One request that gets no answer, or is too long to be sent, does not end the work with a handset that is there.
PhoneItems::Answer PhoneItems::Unanswered() {
  if (went_away()) return Answer::kLost;
  const KeepFailure keep;  // the request that failed, rather than the check
  return phone_.IsPhoneConnected() ? Answer::kRefused : Answer::kLost;
}

PhoneItems::Answer PhoneItems::Read(pkv::PkvNvItem& item, bool element) {
  return Try([&] {
    item.data = {};
    item.status = 0;
    if (item.subscription != 0) {
      return nv::ReadExtended(phone_, item.id, item.subscription, item.data, item.status);
    }
    if (!element) return nv::Read(phone_, item.id, item.data, item.status);
    return nv::ReadElement(phone_, item.id, static_cast<uint8_t>(item.index), std::span(item.data).first(kElementSize),
                           item.status);
  });
}

PhoneItems::Answer PhoneItems::Write(const pkv::PkvNvItem& item, bool element, uint16_t& status) {
  const std::vector<uint8_t> data = WireData(item, element);
  return Try([&] {
    status = 0;
    if (item.subscription != 0) return nv::WriteExtended(phone_, item.id, item.subscription, data, status);
    return nv::Write(phone_, item.id, data, status);
  });
}

PhoneItems::Answer PhoneItems::WriteBatch(std::span<const pkv::PkvNvItem> items,
                                          const std::function<bool(const pkv::PkvNvItem&)>& is_element,
                                          std::vector<uint16_t>& statuses) {
  return Try([&] {
    statuses.clear();
    std::deque<nv::QueueItem> list;
    for (const pkv::PkvNvItem& item : items) list.push_back({item.id, WireData(item, is_element(item))});
    bool ours = true;
    nv::BatchOutcome outcome;
    const Reply reply = nv::WriteBatch(phone_, list, {}, outcome, [&](uint16_t id, uint8_t status) {
      ours = ours && statuses.size() < items.size() && items[statuses.size()].id == id;
      statuses.push_back(status);
    });
    return Checked(reply, [&] { return ours || Fail(BadReply(phone_, "has the results of other items")); });
  });
}

bool PhoneItems::MayBeReadOnly(uint16_t id) const {
  const auto& list = phone_.state<nv::Batch>().read_only;
  return std::ranges::find(list, id) != list.end();
}

}  // namespace kral::items
