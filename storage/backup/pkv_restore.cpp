// Writes the items and files of a PKV file to the handset and reads back what it wrote: packet by packet, so that at
// any moment it is known what became of each item.
#include <algorithm>

#include "commands/nv/nv_item.h"
#include "storage/backup/pkv_jobs.h"
#include "storage/items/phone_items.h"

namespace kral::backup {
namespace {

using Answer = items::PhoneItems::Answer;

class RestoreJob {
 public:
  RestoreJob(Diag_FTM& phone, const efs::AbortWatch& aborts, const pkv::PkvSet& set)
      : aborts_(aborts),
        items_(phone),
        set_(set),
        arrays_(phone, set),
        report_(phone, aborts, set.items.size() + set.files.size(), set.unread.size()) {}

  uint32_t Run() {
    std::span<const pkv::PkvNvItem> rest(set_.items);  // subscription 0 comes first
    while (!rest.empty() && !report_.stopped()) rest = rest.subspan(RestorePacket(rest));
    for (const pkv::PkvEfsFile& file : set_.files) {
      if (!report_.stopped()) RestoreFile(file);
    }
    const KRAL_PKV_COUNTS& counts = report_.counts();
    if (report_.stopped()) return KRAL_PKV_STATUS_STOPPED;
    if (lost_) return KRAL_PKV_STATUS_LOST;
    return counts.done + counts.skipped == counts.total ? KRAL_PKV_STATUS_DONE : KRAL_PKV_STATUS_NOT_WRITTEN;
  }

 private:
  // As many items as go together; gives how many these were.
  size_t RestorePacket(std::span<const pkv::PkvNvItem> rest) {
    const pkv::PkvNvItem& first = rest.front();
    if (arrays_.HasNoPlace(first)) {
      report_.Add(first, KRAL_PKV_REFUSED, items::PhoneItems::kRefusedStatus);
      return 1;
    }
    size_t count = 0;
    while (count < std::min(rest.size(), items::PhoneItems::kMostInBatch) && rest[count].subscription == 0 &&
           !arrays_.HasNoPlace(rest[count])) {
      ++count;
    }
    const auto packet = rest.first(std::max<size_t>(count, 1));
    if (count == 0 && arrays_.IsInexpressible(first)) {
      report_.Add(first, KRAL_PKV_SKIPPED, 0);
      return 1;
    }
    std::vector<uint16_t> statuses;
    if (count > 0) WritePacket(packet, statuses);
    WriteSingly(packet, statuses);
    lost_ = lost_ || aborts_.aborted();  // what was written is not read back any more
    for (size_t i = 0; i < packet.size(); ++i) {
      if (i < statuses.size()) {
        Judge(packet[i], statuses[i]);
      } else {
        report_.Add(packet[i], KRAL_PKV_NOT_REACHED, 0);
      }
    }
    return packet.size();
  }

  // In batches, each of which ends with its first refused item.
  void WritePacket(std::span<const pkv::PkvNvItem> packet, std::vector<uint16_t>& statuses) {
    const auto is_element = [this](const pkv::PkvNvItem& item) { return arrays_.IsElement(item); };
    while (statuses.size() < packet.size() && batches_work_ && !lost_) {
      std::vector<uint16_t> more;
      const Answer answer = items_.WriteBatch(packet.subspan(statuses.size()), is_element, more);
      lost_ = answer == Answer::kLost;
      batches_work_ = answer != Answer::kRefused;
      if (answer == Answer::kAnswered) statuses.insert(statuses.end(), more.begin(), more.end());
    }
  }

  // What the handset does not take in batches.
  void WriteSingly(std::span<const pkv::PkvNvItem> packet, std::vector<uint16_t>& statuses) {
    while (statuses.size() < packet.size() && !lost_) {
      const pkv::PkvNvItem& item = packet[statuses.size()];
      uint16_t status = 0;
      const Answer answer = items_.Write(item, arrays_.IsElement(item), status);
      lost_ = answer == Answer::kLost;
      if (lost_) return;
      statuses.push_back(answer == Answer::kRefused ? uint16_t{items::PhoneItems::kRefusedStatus} : status);
    }
  }

  void Judge(const pkv::PkvNvItem& item, uint16_t status) {
    if (status != nv::kDone && status != nv::kReadOnly) return report_.Add(item, KRAL_PKV_REFUSED, status);
    pkv::PkvNvItem present = item;
    const Answer answer = lost_ ? Answer::kLost : items_.Read(present, arrays_.IsElement(item));
    lost_ = answer == Answer::kLost;
    const bool read = answer == Answer::kAnswered && present.status == nv::kDone;
    const bool equal = read && present.data == item.data;
    if (status == nv::kReadOnly) {
      return report_.Add(item, equal || items_.MayBeReadOnly(item.id) ? KRAL_PKV_SKIPPED : KRAL_PKV_REFUSED, status);
    }
    if (!read) return report_.Add(item, KRAL_PKV_NOT_READ_BACK, answer == Answer::kAnswered ? present.status : 0);
    report_.Add(item, equal ? KRAL_PKV_DONE : KRAL_PKV_DIFFERENT, 0);
  }

  // A file that cannot be written may be there already, read-only as it was when it was backed up.
  void RestoreFile(const pkv::PkvEfsFile& file) {
    uint32_t refusal = 0;
    const Answer written = lost_ ? Answer::kLost : items_.WriteFile(file, refusal);
    lost_ = written == Answer::kLost;
    if (lost_) return report_.Add(file, KRAL_PKV_NOT_REACHED, 0);
    pkv::PkvEfsFile present{.path = file.path, .mode = 0, .bytes = {}};
    uint32_t status = 0;
    const Answer read = ReadBack(file, present, status);
    lost_ = read == Answer::kLost;
    const bool was_read = read == Answer::kAnswered && status == 0;
    const bool equal = was_read && IsSameFile(file, present);
    if (refusal != 0) return report_.Add(file, equal ? KRAL_PKV_SKIPPED : KRAL_PKV_REFUSED, refusal);
    if (!was_read) return report_.Add(file, KRAL_PKV_NOT_READ_BACK, status);
    report_.Add(file, equal ? KRAL_PKV_DONE : KRAL_PKV_DIFFERENT, 0);
  }

  // Content first: the permissions may be such that it cannot be read afterwards.
  Answer ReadBack(const pkv::PkvEfsFile& file, pkv::PkvEfsFile& present, uint32_t& status) {
    const Answer answer = items_.ReadPresent(present, status);
    if (answer != Answer::kAnswered || status != 0 || present.bytes != file.bytes) return answer;
    if (file.mode == 0 || present.permissions() == file.permissions()) return answer;
    if (items_.SetPermissions(file, status) == Answer::kLost) return Answer::kLost;
    uint32_t size = 0;
    return items_.Status(file.path.c_str(), present.mode, size, status);
  }

  const efs::AbortWatch& aborts_;
  items::PhoneItems items_;
  const pkv::PkvSet& set_;
  const ArrayItems arrays_;
  JobReport report_;
  bool batches_work_ = true;
  bool lost_ = false;
};

}  // namespace

uint32_t Restore(Diag_FTM& phone, const std::string& path) {
  const efs::AbortableJob aborts(phone);
  pkv::PkvSet set;
  if (const uint32_t status = ReadSet(phone, path, set); status != KRAL_PKV_STATUS_DONE) return status;
  return RestoreJob(phone, aborts, set).Run();
}

uint32_t Restore(Diag_FTM& phone, const pkv::PkvSet& set) {
  const efs::AbortableJob aborts(phone);
  return RestoreJob(phone, aborts, set).Run();
}

}  // namespace kral::backup
