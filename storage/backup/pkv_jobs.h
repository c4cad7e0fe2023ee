// Backups to PKV files, restores from them, comparisons with them. Each gives KRAL_PKV_STATUS_...
#ifndef KRAL_STORAGE_BACKUP_PKV_JOBS_H
#define KRAL_STORAGE_BACKUP_PKV_JOBS_H

#include <atomic>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>

#include "frame/diag_ftm.h"
#include "kral/pkv.h"
#include "storage/efs/efs_client.h"
#include "storage/nv/nv_definitions.h"
#include "storage/pkv/pkv_set.h"

namespace kral::backup {

// What backups read, and what became of the last one's items.
struct Settings {
  std::atomic<KRAL_PKV_CALLBACK> callback{nullptr};  // set from any thread
  uint16_t first_item = 0;
  uint16_t last_item = 9999;
  uint16_t subscriptions = 1;
  KRAL_PKV_COUNTS counts{};
  bool running = false;  // a backup, restore or comparison: its callback must not begin another one
};

uint32_t Backup(Diag_FTM& phone, const std::string& path);   // pkv_backup.cpp
uint32_t Restore(Diag_FTM& phone, const std::string& path);  // pkv_restore.cpp
uint32_t Verify(Diag_FTM& phone, const std::string& path);   // pkv_verify.cpp

// With a set that has been read already, for this handset and others at the same time.
uint32_t Restore(Diag_FTM& phone, const pkv::PkvSet& set);
uint32_t Verify(Diag_FTM& phone, const pkv::PkvSet& set);

// One of these as a whole: refused while another one of the handset runs, and judged at its end, by the name of the
// file. True when the status is 0.
bool Run(Diag_FTM& phone, const std::string& file, const std::function<uint32_t()>& job, uint32_t* status);

bool ConfigureBackup(Diag_FTM& phone, uint16_t first_item, uint16_t last_item, uint16_t subscriptions);

// What the three share (pkv_job.cpp): what became of each item, for the counts and the caller's callback.
class JobReport {
 public:
  // `passed_over` of the file are counted as skipped; the callback does not get them. The watch is the job's, which
  // knows of aborts since it began.
  JobReport(Diag_FTM& phone, const efs::AbortWatch& aborts, size_t total, size_t passed_over);
  ~JobReport();  // what was not reported was not reached
  JobReport(const JobReport&) = delete;
  JobReport& operator=(const JobReport&) = delete;

  // Each item and file is reported once. After the caller has stopped the job, by the callback or by an abort, they are
  // counted only.
  void Add(const pkv::PkvNvItem& item, uint32_t result, uint32_t status);
  void Add(const pkv::PkvEfsFile& file, uint32_t result, uint32_t status);
  bool stopped() const { return stopped_ || aborts_.aborted(); }
  const KRAL_PKV_COUNTS& counts() const { return settings_.counts; }

 private:
  void Add(KRAL_PKV_ITEM& record, const char* path);

  Diag_FTM& phone_;
  Settings& settings_;
  const efs::AbortWatch& aborts_;
  const uint32_t passed_over_;
  uint32_t reported_ = 0;
  bool stopped_ = false;
};

// What is wrong with a file is logged, and noted as the failure.
void NoteFile(DataLogFileHandler& log, const pkv::PkvOutcome& outcome);
// Reads the file of a restore or a comparison.
uint32_t ReadSet(Diag_FTM& phone, const std::string& path, pkv::PkvSet& set);
uint32_t ReadSet(DataLogFileHandler& log, const std::string& path, pkv::PkvSet& set);
uint32_t StatusOf(pkv::PkvResult result);

// The highest element (0: no array) by id, of the items that are defined for the handset's NV tool.
std::map<uint16_t, uint16_t> DefinedItems(Diag_FTM& phone);

// Whether the handset holds what the file keeps: content, kind and permissions. A file that is too large for an item
// file has come back as a plain one. A mode of 0 is unknown.
bool IsSameFile(const pkv::PkvEfsFile& kept, const pkv::PkvEfsFile& present);

// Which items are elements of arrays: those with an index word other than 0, all others of the same id in the set, and
// those that the file notes. Where it has no such note, those that are defined so.
class ArrayItems {
 public:
  ArrayItems(Diag_FTM& phone, const pkv::PkvSet& set);
  bool IsElement(const pkv::PkvNvItem& item) const { return ids_.contains(item.id); }
  // No request names both a subscription and an element.
  bool IsInexpressible(const pkv::PkvNvItem& item) const { return item.subscription != 0 && IsElement(item); }
  // An index that no request can name: it would become another element's. Or an item that is defined as an array, but
  // kept in a file that notes arrays and not this one: read without knowing which element.
  bool HasNoPlace(const pkv::PkvNvItem& item) const {
    return item.index > nv::kHighestElement || unclear_.contains(item.id);
  }

 private:
  std::set<uint16_t> ids_;
  std::set<uint16_t> unclear_;
};

}  // namespace kral::backup

#endif
