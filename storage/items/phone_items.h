// Single items and files on the handset, as backups need them: every request is tried again, and the late answer to an
// earlier request is never taken for this one's. A device that went away is not opened again: what is back by then may
// be another handset, and half of the work would be done on each.
#ifndef KRAL_STORAGE_ITEMS_PHONE_ITEMS_H
#define KRAL_STORAGE_ITEMS_PHONE_ITEMS_H

#include <cstdint>
#include <functional>
#include <set>
#include <span>
#include <string>
#include <vector>

#include "frame/diag_ftm.h"
#include "storage/efs/efs_client.h"
#include "storage/pkv/file_section.h"
#include "storage/pkv/pkv_format.h"

namespace kral::items {

inline constexpr int kTries = 3;  // of a request whose answer does not come

class PhoneItems {
 public:
  enum class Answer {
    kAnswered,  // with a status
    kRefused,   // or passed over in silence, or never sent: no status, but the handset is there
    kLost,      // no answer, in spite of all tries or until an abort; or the device went away
  };
  static constexpr uint32_t kRefusedStatus = 0xFFFF;
  // As many full items as one packet of a batch takes.
  static constexpr size_t kMostInBatch = 9;

  explicit PhoneItems(Diag_FTM& phone) : phone_(phone), aborts_(phone) {}
  PhoneItems(const PhoneItems&) = delete;
  PhoneItems& operator=(const PhoneItems&) = delete;

  // --- NV items; an `element` is the one of an array item that the index word names ---------------------------------
  Answer Read(pkv::PkvNvItem& item, bool element);                           // data and status
  Answer Write(const pkv::PkvNvItem& item, bool element, uint16_t& status);  // one by one
  // At most kMostInBatch of subscription 0, in one packet. Gives the statuses up to the first that is not 0.
  Answer WriteBatch(std::span<const pkv::PkvNvItem> items, const std::function<bool(const pkv::PkvNvItem&)>& is_element,
                    std::vector<uint16_t>& statuses);
  // Whether the caller does not count the item's being read-only as a failure.
  bool MayBeReadOnly(uint16_t id) const;

  // --- Files; the status is the handset's error number ---------------------------------------------------------------
  struct FoundFile {
    std::string path;
    uint32_t mode;
    uint32_t size;
  };
  // A folder whose files, or some of them, are not found, and why.
  struct UnlistedFolder {
    std::string path;
    uint32_t status;
  };
  // Appends what the item folders hold. A handset without them, or without a file system, has none; other folders that
  // cannot be listed are logged and told. The caller's directory callback sees the entries. An abort ends it early.
  Answer FindFiles(std::vector<FoundFile>& files, std::vector<UnlistedFolder>& unlisted);
  Answer FindFiles(std::vector<FoundFile>& files);  // kRefused when there are unlisted ones
  // Of a file or folder, when the status is 0.
  Answer Status(const char* path, uint32_t& mode, uint32_t& size, uint32_t& status);
  // By path, and by the mode and size that the handset told. An item file that is larger than an item request takes is
  // read as a plain one, which not every handset lets happen.
  Answer ReadTold(pkv::PkvEfsFile& file, uint32_t size, uint32_t& status);
  // By path; the mode is what the handset tells now.
  Answer ReadPresent(pkv::PkvEfsFile& file, uint32_t& status);
  Answer WriteFile(const pkv::PkvEfsFile& file, uint32_t& status);  // with its folders; permissions are the handset's
  Answer SetPermissions(const pkv::PkvEfsFile& file, uint32_t& status);

 private:
  Answer Try(const std::function<Reply()>& ask);
  Answer Unanswered();
  bool went_away() const { return has_answered_ && phone_.device_gone(); }
  Answer Walk(const std::string& path, int depth, std::vector<FoundFile>& files, std::vector<UnlistedFolder>& unlisted);
  void TellUnlisted(const std::string& folder, uint32_t status, std::vector<UnlistedFolder>& unlisted);
  bool List(const std::string& folder, std::vector<KRAL_EFS_ENTRY>& entries);
  Answer ReadItemFile(pkv::PkvEfsFile& file, uint32_t& status);
  Answer ReadPlainFile(pkv::PkvEfsFile& file, uint32_t size, uint32_t& status);
  Answer WriteItemFile(const pkv::PkvEfsFile& file, uint32_t& status);
  Answer WritePlainFile(const pkv::PkvEfsFile& file, uint32_t& status);
  void MakeFolders(const std::string& path);

  Diag_FTM& phone_;
  const Diag_FTM::Resynchronising resynchronising_{phone_};  // replies to item requests do not name their file
  const efs::AbortWatch aborts_;
  size_t walked_ = 0;    // folders and what is listed as one
  uint8_t refusal_ = 0;  // the code of the last Try that was refused
  bool has_answered_ = false;
  std::set<std::string, std::less<>> folders_;  // that were made, or were there
};

}  // namespace kral::items

#endif
