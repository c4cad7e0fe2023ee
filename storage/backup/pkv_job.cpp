// What backups, restores and comparisons share: counts and reports, the files that the latter two begin with, which
// items are elements of arrays, and when files are the same. The jobs are run in pkv_run.cpp.
#include "storage/backup/pkv_jobs.h"

#include "base/failure.h"
#include "base/guarded_call.h"
#include "kral/efs.h"
#include "storage/nv/nv_tool.h"
#include "storage/pkv/pkv_array_note.h"

namespace kral::backup {
namespace {

uint32_t* CounterOf(KRAL_PKV_COUNTS& counts, uint32_t result) {
  switch (result) {
    case KRAL_PKV_DONE:
      return &counts.done;
    case KRAL_PKV_SKIPPED:
      return &counts.skipped;
    case KRAL_PKV_REFUSED:
      return &counts.refused;
    case KRAL_PKV_DIFFERENT:
      return &counts.different;
    case KRAL_PKV_NOT_READ_BACK:
      return &counts.not_read_back;
    default:
      return &counts.not_reached;
  }
}

}  // namespace

bool ConfigureBackup(Diag_FTM& phone, uint16_t first_item, uint16_t last_item, uint16_t subscriptions) {
  constexpr uint16_t kMostSubscriptions = 16;
  if (first_item > last_item || subscriptions < 1 || subscriptions > kMostSubscriptions) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "items %d to %d in %d subscriptions cannot be backed up", first_item,
                        last_item, subscriptions));
  }
  Settings& settings = phone.state<Settings>();
  settings.first_item = first_item;
  settings.last_item = last_item;
  settings.subscriptions = subscriptions;
  return true;
}

JobReport::JobReport(Diag_FTM& phone, const efs::AbortWatch& aborts, size_t total, size_t passed_over)
    : phone_(phone),
      settings_(phone.state<Settings>()),
      aborts_(aborts),
      passed_over_(static_cast<uint32_t>(passed_over)) {
  settings_.counts = {};
  settings_.counts.total = static_cast<uint32_t>(total + passed_over);
  settings_.counts.skipped = passed_over_;
}

JobReport::~JobReport() {
  settings_.counts.not_reached += settings_.counts.total - passed_over_ - reported_;
}

void JobReport::Add(const pkv::PkvNvItem& item, uint32_t result, uint32_t status) {
  KRAL_PKV_ITEM record{item.id, item.index, item.subscription, 0, status, result};
  Add(record, nullptr);
}

void JobReport::Add(const pkv::PkvEfsFile& file, uint32_t result, uint32_t status) {
  KRAL_PKV_ITEM record{0, 0, 0, 0, status, result};
  Add(record, file.path.c_str());
}

void JobReport::Add(KRAL_PKV_ITEM& record, const char* path) {
  KRAL_PKV_COUNTS& counts = settings_.counts;
  ++*CounterOf(counts, record.result);
  ++reported_;
  if (stopped()) return;
  const auto callback = settings_.callback.load();
  if (callback == nullptr) return;
  // One that fails does not say that it is to go on.
  uint8_t go_on = 0;
  CallGuarded([&] { go_on = callback(&record, path, reported_, counts.total - passed_over_, phone_.handle()); });
  stopped_ = go_on == 0;
}

uint32_t StatusOf(pkv::PkvResult result) {
  switch (result) {
    case pkv::PkvResult::kDone:
      return KRAL_PKV_STATUS_DONE;
    case pkv::PkvResult::kNoStorage:
      return KRAL_PKV_STATUS_NO_STORAGE;
    case pkv::PkvResult::kDamagedItem:
      return KRAL_PKV_STATUS_BAD_ITEM;
    case pkv::PkvResult::kNoItem:
      return KRAL_PKV_STATUS_NOTHING_READ;
    case pkv::PkvResult::kCannotOpen:
    case pkv::PkvResult::kCannotWrite:
      break;
  }
  return KRAL_PKV_STATUS_CANNOT_OPEN;
}

void NoteFile(DataLogFileHandler& log, const pkv::PkvOutcome& outcome) {
  log.WriteLine(kLogErr, "%s", outcome.text.c_str());
  Fail(Failure(KRAL_ERROR_BAD_FILE, "%s", outcome.text.c_str())
           .Status(KRAL_ERROR_STATUS_RESULT, StatusOf(outcome.result)));
}

uint32_t ReadSet(Diag_FTM& phone, const std::string& path, pkv::PkvSet& set) {
  phone.state<Settings>().counts = {};
  return ReadSet(phone.log(), path, set);
}

uint32_t ReadSet(DataLogFileHandler& log, const std::string& path, pkv::PkvSet& set) {
  const pkv::PkvOutcome outcome = pkv::ReadPkv(path, set);
  if (!outcome.done()) NoteFile(log, outcome);
  pkv::LogUnread(log, path, set);
  if (!outcome.done() || !set.items.empty() || !set.files.empty()) return StatusOf(outcome.result);
  log.WriteLine(kLogErr, "%s: holds no item and no file", path.c_str());
  Fail(FileFailure(path, "holds no item and no file").Status(KRAL_ERROR_STATUS_RESULT, KRAL_PKV_STATUS_BAD_ITEM));
  return KRAL_PKV_STATUS_BAD_ITEM;
}

std::map<uint16_t, uint16_t> DefinedItems(Diag_FTM& phone) {
  std::map<uint16_t, uint16_t> items;
  const auto tool = Kral_ResourceManager::GetFamily<nv::NVTool_Manager>(phone.handle(), FamilySlot::kNvManager, {});
  if (!tool) return items;
  tool->definitions().ForEach([&](const nv::NvItem& item) {
    if (item.id && !item.is_file()) items.emplace(*item.id, item.max_index);
  });
  return items;
}

bool IsSameFile(const pkv::PkvEfsFile& kept, const pkv::PkvEfsFile& present) {
  if (kept.bytes != present.bytes) return false;
  if (kept.mode == 0) return true;
  const bool same_kind = kept.is_item_file() == present.is_item_file() || kept.bytes.size() > KRAL_EFS_ITEM_SIZE;
  return same_kind && kept.permissions() == present.permissions();
}

ArrayItems::ArrayItems(Diag_FTM& phone, const pkv::PkvSet& set) {
  const auto noted = pkv::NotedArrays(set.properties);
  if (noted) ids_ = *noted;
  for (const pkv::PkvNvItem& item : set.items) {
    if (item.index != 0) ids_.insert(item.id);
  }
  for (const auto& [id, highest_element] : DefinedItems(phone)) {
    if (highest_element != 0 && !ids_.contains(id)) (noted ? unclear_ : ids_).insert(id);
  }
}

}  // namespace kral::backup
