// Reads items and files of the handset into a set and writes it at the end, so that nothing changes before all is read.
#include <algorithm>
#include <array>
#include <set>

#include "base/failure.h"
#include "commands/core/core_diag.h"
#include "commands/nv/nv_item.h"
#include "platform/file_util.h"
#include "storage/backup/pkv_jobs.h"
#include "storage/items/phone_identity.h"
#include "storage/items/phone_items.h"
#include "storage/pkv/pkv_array_note.h"

namespace kral::backup {
namespace {

using Answer = items::PhoneItems::Answer;

constexpr size_t kMostFileBytes = kCompoundFileLimit / 2;  // of all files; the items take less than the rest

struct Wanted {
  uint16_t id;
  uint16_t index;
  uint16_t subscription;
  bool element;
};

// The ids of the range, and beyond it those that are defined. Elements can be named in subscription 0 only.
std::vector<Wanted> WantedItems(Diag_FTM& phone) {
  const Settings& settings = phone.state<Settings>();
  auto highest_elements = DefinedItems(phone);
  for (uint32_t id = settings.first_item; id <= settings.last_item; ++id) {
    highest_elements.emplace(static_cast<uint16_t>(id), uint16_t{0});
  }
  std::vector<Wanted> wanted;
  for (uint16_t subscription = 0; subscription < settings.subscriptions; ++subscription) {
    for (const auto& [id, highest] : highest_elements) {
      if (highest != 0 && subscription != 0) continue;
      for (uint32_t index = 0; index <= highest; ++index)
        wanted.push_back({id, static_cast<uint16_t>(index), subscription, highest != 0});
    }
  }
  return wanted;
}

class BackupJob {
 public:
  BackupJob(Diag_FTM& phone, const efs::AbortWatch& aborts) : phone_(phone), aborts_(aborts), items_(phone) {}

  uint32_t Run(pkv::PkvSet& set) {
    if (aborts_.aborted()) return KRAL_PKV_STATUS_STOPPED;
    std::vector<items::PhoneItems::FoundFile> files;
    std::vector<items::PhoneItems::UnlistedFolder> unlisted;
    const Answer found = items_.FindFiles(files, unlisted);
    if (aborts_.aborted()) return KRAL_PKV_STATUS_STOPPED;
    if (found == Answer::kLost) return KRAL_PKV_STATUS_LOST;
    const std::vector<Wanted> items = WantedItems(phone_);
    JobReport report(phone_, aborts_, items.size() + unlisted.size() + files.size(), 0);
    for (const Wanted& item : items) {
      if (!ReadItem(item, set, report)) return End(report);
    }
    for (const auto& [path, status] : unlisted) {
      report.Add(pkv::PkvEfsFile{.path = path, .mode = 0, .bytes = {}}, KRAL_PKV_REFUSED, status);
      if (report.stopped()) return End(report);
    }
    for (const items::PhoneItems::FoundFile& file : files) {
      if (!ReadFile(file, set, report)) return End(report);
    }
    std::set<uint16_t> arrays;
    for (const Wanted& item : items) {
      if (item.element) arrays.insert(item.id);
    }
    pkv::NoteArrays(arrays, set.properties);
    if (set.items.empty() && set.files.empty()) return KRAL_PKV_STATUS_NOTHING_READ;
    return report.counts().refused > 0 ? KRAL_PKV_STATUS_INCOMPLETE : KRAL_PKV_STATUS_DONE;
  }

 private:
  static uint32_t End(const JobReport& report) {
    return report.stopped() ? KRAL_PKV_STATUS_STOPPED : KRAL_PKV_STATUS_LOST;
  }

  // False when the job is over.
  bool ReadItem(const Wanted& wanted, pkv::PkvSet& set, JobReport& report) {
    pkv::PkvNvItem item{.id = wanted.id, .index = wanted.index, .subscription = wanted.subscription};
    const Answer answer = items_.Read(item, wanted.element);
    if (answer == Answer::kLost) return false;
    if (answer == Answer::kRefused) {
      report.Add(item, KRAL_PKV_REFUSED, items::PhoneItems::kRefusedStatus);
    } else if (item.status != nv::kDone) {
      const bool has_none = item.status == nv::kNeverWritten || item.status == nv::kNoSuchItem;
      report.Add(item, has_none ? KRAL_PKV_SKIPPED : KRAL_PKV_REFUSED, item.status);
    } else {
      set.items.push_back(item);
      report.Add(item, KRAL_PKV_DONE, 0);
    }
    return !report.stopped();
  }

  bool ReadFile(const items::PhoneItems::FoundFile& found, pkv::PkvSet& set, JobReport& report) {
    pkv::PkvEfsFile file{.path = found.path, .mode = found.mode, .bytes = {}};
    uint32_t status = 0;
    // An item file comes whole with one request; a plain one may have grown since it was listed.
    const Answer answer =
        file.is_item_file() ? items_.ReadTold(file, found.size, status) : items_.ReadPresent(file, status);
    if (answer == Answer::kLost || report.stopped()) return false;
    // Less than the handset lists would be a backup that looks whole. The same for more than a file of ours holds.
    if (status == 0 && (file.bytes.size() < found.size || file.bytes.size() > bytes_left_)) {
      status = items::PhoneItems::kRefusedStatus;
    }
    if (status == 0) bytes_left_ -= file.bytes.size();
    report.Add(file, status == 0 ? KRAL_PKV_DONE : KRAL_PKV_REFUSED, status);
    if (status == 0) set.files.push_back(std::move(file));
    return !report.stopped();
  }

  Diag_FTM& phone_;
  const efs::AbortWatch& aborts_;
  items::PhoneItems items_;
  size_t bytes_left_ = kMostFileBytes;
};

}  // namespace

uint32_t Backup(Diag_FTM& phone, const std::string& path) {
  const efs::AbortableJob aborts(phone);
  pkv::PkvSet set;
  phone.state<Settings>().counts = {};
  // Before the many requests that would otherwise be in vain.
  if (const std::error_code error = AtomicFile().Open(path)) {
    phone.log().WriteLine(kLogErr, "%s: %s", path.c_str(), error.message().c_str());
    Fail(FileFailure(path, "cannot be written")
             .System(error)
             .Status(KRAL_ERROR_STATUS_RESULT, KRAL_PKV_STATUS_CANNOT_OPEN));
    return KRAL_PKV_STATUS_CANNOT_OPEN;
  }
  items::AppendIdentity(phone, set.properties);
  const uint32_t status = BackupJob(phone, aborts).Run(set);
  if (status != KRAL_PKV_STATUS_DONE && status != KRAL_PKV_STATUS_INCOMPLETE) {
    phone.log().WriteLine(kLogErr, "KRAL_BackupNVFromMobileToPKV() - nothing written, status %u", status);
    return status;
  }
  const pkv::PkvOutcome outcome = pkv::WritePkv(path, set, &phone.log());
  if (!outcome.done()) NoteFile(phone.log(), outcome);
  return outcome.done() ? status : StatusOf(outcome.result);
}

}  // namespace kral::backup
