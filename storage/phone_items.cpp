// NV items of the handset, one by one and in batches. Their files are in phone_item_files.cpp.
#include "storage/phone_items.h"

#include <algorithm>
#include <array>
#include <utility>

#include "commands/nv_batch.h"
#include "commands/nv_format.h"
#include "storage/efs_request.h"

namespace kral {
namespace {

constexpr int kTries = 3;

// Where a reply repeats what it is about.
constexpr size_t kIdOfPlain = 1;
constexpr size_t kElementIndex = 3;
constexpr size_t kIdOfExtended = 4;
constexpr size_t kSubscriptionOfExtended = 6;

constexpr size_t kElementSize = nv::kDataSize - 1;  // a write has the index in front

std::vector<uint8_t> WireData(const PkvNvItem& item, bool element) {
  if (!element) return {item.data.begin(), item.data.end()};
  std::vector<uint8_t> data{static_cast<uint8_t>(item.index)};
  data.insert(data.end(), item.data.begin(), item.data.begin() + kElementSize);
  return data;
}

}  // namespace

PhoneItems::PhoneItems(Diag_FTM& phone)
    : phone_(phone),
      callers_batch_(std::exchange(phone.nv_batch(), {})),
      callers_transfer_callback_(phone.efs().transfer_callback.exchange(nullptr)),
      aborts_(phone) {}

PhoneItems::~PhoneItems() {
  phone_.nv_batch() = std::move(callers_batch_);
  phone_.efs().transfer_callback = callers_transfer_callback_;
}

PhoneItems::Answer PhoneItems::Try(const std::function<bool()>& ask) {
  refusal_ = 0;
  for (int i = 0; i < kTries; ++i) {
    phone_.packet().response_area()[0] = 0;  // no refusal of an earlier request, should this one not be sent
    if (ask()) return Answer::kAnswered;
    refusal_ = efs::LastRefusal(phone_);
    if (refusal_ != 0 || aborts_.aborted()) return Answer::kRefused;
  }
  return Unanswered();
}

// One request that gets no answer, or is too long to be sent, does not end the work with a handset that is there.
PhoneItems::Answer PhoneItems::Unanswered() {
  return phone_.IsPhoneConnected() ? Answer::kRefused : Answer::kLost;
}

bool PhoneItems::Echoes16(size_t offset, uint16_t value) const {
  uint16_t echoed = 0;
  return phone_.packet().ResponseAt16(offset, echoed) && echoed == value;
}

PhoneItems::Answer PhoneItems::Read(PkvNvItem& item, bool element) {
  return Try([&] {
    item.data = {};  // a reply that was not this request's may have filled it
    item.status = 0;
    if (item.subscription != 0) {
      return nv::ReadExtended(phone_, item.id, item.subscription, item.data, item.status) &&
             Echoes16(kIdOfExtended, item.id) && Echoes16(kSubscriptionOfExtended, item.subscription);
    }
    if (!element) return nv::Read(phone_, item.id, item.data, item.status) && Echoes16(kIdOfPlain, item.id);
    uint8_t echoed = 0;
    const auto index = static_cast<uint8_t>(item.index);
    return nv::ReadElement(phone_, item.id, index, std::span(item.data).first(kElementSize), item.status) &&
           Echoes16(kIdOfPlain, item.id) && phone_.packet().ResponseAt8(kElementIndex, echoed) && echoed == index;
  });
}

PhoneItems::Answer PhoneItems::Write(const PkvNvItem& item, bool element, uint16_t& status) {
  const std::vector<uint8_t> data = WireData(item, element);
  return Try([&] {
    status = 0;
    if (item.subscription != 0) {
      return nv::WriteExtended(phone_, item.id, item.subscription, data, status) && Echoes16(kIdOfExtended, item.id);
    }
    return nv::Write(phone_, item.id, data, status) && Echoes16(kIdOfPlain, item.id);
  });
}

PhoneItems::Answer PhoneItems::WriteBatch(std::span<const PkvNvItem> items,
                                          const std::function<bool(const PkvNvItem&)>& is_element,
                                          std::vector<uint16_t>& statuses) {
  return Try([&] {
    statuses.clear();
    nv::SetBatchMode(phone_, true);
    for (const PkvNvItem& item : items) nv::Enqueue(phone_, item.id, WireData(item, is_element(item)));
    bool ours = true;
    nv::BatchOutcome outcome;
    nv::FlushBatchQueue(phone_, outcome, [&](uint16_t id, uint8_t status) {
      ours = ours && statuses.size() < items.size() && items[statuses.size()].id == id;
      statuses.push_back(status);
    });
    return ours && !statuses.empty() && (statuses.size() == items.size() || statuses.back() != nv::kDone);
  });
}

bool PhoneItems::MayBeReadOnly(uint16_t id) const {
  const auto& list = callers_batch_.read_only;
  return std::find(list.begin(), list.end(), id) != list.end();
}

}  // namespace kral
