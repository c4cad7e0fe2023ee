// Compares the items and files of a PKV file with those of the handset.
#include "storage/backup/pkv_jobs.h"
#include "storage/items/phone_items.h"

namespace kral::backup {
namespace {

using Answer = items::PhoneItems::Answer;

class VerifyJob {
 public:
  VerifyJob(Diag_FTM& phone, const efs::AbortWatch& aborts, const pkv::PkvSet& set)
      : items_(phone),
        set_(set),
        arrays_(phone, set),
        report_(phone, aborts, set.items.size() + set.files.size(), set.unread.size()) {}

  uint32_t Run() {
    for (const pkv::PkvNvItem& item : set_.items) {
      if (!Compare(item)) return KRAL_PKV_STATUS_STOPPED;
    }
    for (const pkv::PkvEfsFile& file : set_.files) {
      if (!Compare(file)) return KRAL_PKV_STATUS_STOPPED;
    }
    const KRAL_PKV_COUNTS& counts = report_.counts();
    if (counts.not_reached > 0) return KRAL_PKV_STATUS_LOST;
    return counts.done + counts.skipped == counts.total ? KRAL_PKV_STATUS_DONE : KRAL_PKV_STATUS_DIFFERENT;
  }

 private:
  // These give false when the caller has stopped the job.
  bool Compare(const pkv::PkvNvItem& item) {
    if (arrays_.HasNoPlace(item)) {
      report_.Add(item, KRAL_PKV_REFUSED, items::PhoneItems::kRefusedStatus);
      return !report_.stopped();
    }
    if (arrays_.IsInexpressible(item)) {
      report_.Add(item, KRAL_PKV_SKIPPED, 0);
      return !report_.stopped();
    }
    pkv::PkvNvItem present = item;
    const Answer answer = lost_ ? Answer::kLost : items_.Read(present, arrays_.IsElement(item));
    const bool equal = answer == Answer::kAnswered && present.status == 0 && present.data == item.data;
    Add(item, answer, equal, present.status);
    return !report_.stopped();
  }

  bool Compare(const pkv::PkvEfsFile& file) {
    pkv::PkvEfsFile present{.path = file.path, .mode = 0, .bytes = {}};
    uint32_t status = 0;
    const Answer answer = lost_ ? Answer::kLost : items_.ReadPresent(present, status);
    Add(file, answer, status == 0 && IsSameFile(file, present), status);
    return !report_.stopped();
  }

  template <class Entry>
  void Add(const Entry& entry, Answer answer, bool equal, uint32_t status) {
    lost_ = answer == Answer::kLost;
    if (lost_) return report_.Add(entry, KRAL_PKV_NOT_REACHED, 0);
    if (answer == Answer::kRefused) return report_.Add(entry, KRAL_PKV_REFUSED, items::PhoneItems::kRefusedStatus);
    report_.Add(entry, equal ? KRAL_PKV_DONE : KRAL_PKV_DIFFERENT, status);
  }

  items::PhoneItems items_;
  const pkv::PkvSet& set_;
  const ArrayItems arrays_;
  JobReport report_;
  bool lost_ = false;
};

}  // namespace

uint32_t Verify(Diag_FTM& phone, const std::string& path) {
  const efs::AbortableJob aborts(phone);
  pkv::PkvSet set;
  if (const uint32_t status = ReadSet(phone, path, set); status != KRAL_PKV_STATUS_DONE) return status;
  return VerifyJob(phone, aborts, set).Run();
}

uint32_t Verify(Diag_FTM& phone, const pkv::PkvSet& set) {
  const efs::AbortableJob aborts(phone);
  return VerifyJob(phone, aborts, set).Run();
}

}  // namespace kral::backup
