// Reads and writes items on the handset: plain, of one subscription, elements, RF NV items, files.
#include "storage/nv_mobile.h"

#include <algorithm>

#include "commands/nv_item.h"
#include "commands/rf_nv.h"
#include "storage/efs_client.h"
#include "storage/efs_request.h"

namespace kral::nv {
namespace {

// As handsets have them: some without the slash in front.
constexpr const char* kItemFolders[] = {"/nv/items", "nv/item_files/conf", "nv/reg_files/conf", "/nv/item_files/rfnv",
                                        "nv/item_store/rfnv"};
constexpr int kDeepestFolder = 8;
constexpr uint32_t kEntriesAtFirst = 1024;
constexpr size_t kMostFiles = 20000;

using Kind = NvAnswer::Kind;

// Sends once more when the handset is there and only this request went unanswered.
template <class Ask>
NvAnswer Persistently(Diag_FTM& phone, Ask ask) {
  NvAnswer answer = ask();
  if (answer.kind != Kind::kNoAnswer || !phone.IsPhoneConnected()) return answer;
  answer = ask();
  if (answer.kind == Kind::kNoAnswer && phone.IsPhoneConnected()) answer.kind = Kind::kRefused;
  return answer;
}

}  // namespace

NvAnswer NvMobile::Judged(bool answered, uint16_t status) const {
  if (answered) return {status == kDone ? Kind::kOk : Kind::kRefused, status};
  return {efs::LastRefusal(phone_) != 0 ? Kind::kRefused : Kind::kNoAnswer, 0};
}

NvAnswer NvMobile::Read(const NvItem& item, uint16_t element, NvBytes& stored) {
  return Persistently(phone_, [&] { return ReadOnce(item, element, stored); });
}

NvAnswer NvMobile::Write(const NvItem& item, uint16_t element, std::span<const uint8_t> stored) {
  return Persistently(phone_, [&] { return WriteOnce(item, element, stored); });
}

NvAnswer NvMobile::ReadOnce(const NvItem& item, uint16_t element, NvBytes& stored) {
  uint16_t status = kDone;
  if (item.is_file()) {
    // Outside factory test mode the same bytes are read from the item's file.
    if (item.id && has_rf_dispatcher_) {
      if (ReadRf(phone_, *item.id, stored, status)) return Judged(true, status);
      has_rf_dispatcher_ = false;
    }
    return ReadFile(item, stored);
  }
  stored.assign(item.is_array() ? kDataSize - 1 : kDataSize, 0);
  bool answered = false;
  if (item.is_array()) {
    answered = ReadElement(phone_, *item.id, static_cast<uint8_t>(element), stored, status);
  } else if (multi_sim_) {
    answered = ReadExtended(phone_, *item.id, subscription_, stored, status);
  } else {
    answered = nv::Read(phone_, *item.id, stored, status);
  }
  phone_.log().WriteLine(kLogRet, "DIAG_NV_READ_F NV Id:%d Status:%d", *item.id, status);
  return Judged(answered, status);
}

NvAnswer NvMobile::WriteOnce(const NvItem& item, uint16_t element, std::span<const uint8_t> stored) {
  uint16_t status = kDone;
  if (item.is_file()) {
    if (item.id && has_rf_dispatcher_) {
      if (WriteRf(phone_, *item.id, stored, status)) return Judged(true, status);
      has_rf_dispatcher_ = false;
    }
    return WriteFile(item, stored);
  }
  bool answered = false;
  if (item.is_array()) {
    answered = WriteElement(phone_, *item.id, static_cast<uint8_t>(element), stored, status);
  } else if (multi_sim_) {
    answered = WriteExtended(phone_, *item.id, subscription_, stored, status);
  } else {
    answered = nv::Write(phone_, *item.id, stored, status);
  }
  phone_.log().WriteLine(kLogRet, "DIAG_NV_WRITE_F NV Id:%d Status:%d", *item.id, status);
  return Judged(answered, status);
}

NvAnswer NvMobile::ReadFile(const NvItem& item, NvBytes& stored) {
  efs::FileStatus status;
  if (!efs::Stat(phone_, item.path.c_str(), status)) return Judged(false, 0);
  if (!status.exists()) return {Kind::kRefused, kNeverWritten};
  if (status.size > kLongestValue) {
    phone_.log().WriteLine(kLogErr, "%s has %u bytes, too many for an item", item.path.c_str(), status.size);
    return {Kind::kRefused};
  }
  auto size = status.size;
  stored.resize(size);
  if (!efs::ReadToMemory(phone_, item.path.c_str(), stored.data(), &size)) return Judged(false, 0);
  stored.resize(size);
  return {Kind::kOk};
}

NvAnswer NvMobile::WriteFile(const NvItem& item, std::span<const uint8_t> stored) {
  const char* const path = item.path.c_str();
  efs::FileStatus status;
  if (!efs::Stat(phone_, path, status)) return Judged(false, 0);
  const auto size = static_cast<uint32_t>(stored.size());
  // What is a plain file already stays one.
  const bool as_item_file = size <= KRAL_EFS_ITEM_SIZE && (!status.exists() || status.is_item_file());
  const auto write = [&] {
    return as_item_file ? efs::PutItemFromMemory(phone_, path, stored.data(), size)
                        : efs::WriteFromMemory(phone_, stored.data(), size, path);
  };
  if (write() || (!status.exists() && MakeParents(item.path) && write())) return {Kind::kOk};
  return phone_.IsPhoneConnected() ? NvAnswer{Kind::kRefused} : NvAnswer{Kind::kNoAnswer};
}

bool NvMobile::MakeParents(const std::string& path) {
  for (size_t slash = path.find('/', 1); slash != std::string::npos; slash = path.find('/', slash + 1)) {
    if (!efs::MakeDirectory(phone_, path.substr(0, slash).c_str(), nullptr)) return false;
  }
  return true;
}

bool NvMobile::ListItemFiles(std::vector<std::pair<std::string, uint32_t>>& files) {
  for (const char* folder : kItemFolders) {
    // A folder that is not there is asked for once; listing it would try again and again.
    efs::FileStatus status;
    if (!efs::Stat(phone_, folder, status)) {
      if (efs::LastRefusal(phone_) != 0) return true;  // a handset without files
      if (!phone_.IsPhoneConnected() || !efs::Stat(phone_, folder, status)) return false;
    }
    if (status.exists() && !ListFolder(folder, kDeepestFolder, files)) return false;
  }
  return true;
}

bool NvMobile::ListFolder(const std::string& folder, int depth, std::vector<std::pair<std::string, uint32_t>>& files) {
  std::vector<KRAL_EFS_ENTRY> entries(kEntriesAtFirst);
  uint32_t count = kEntriesAtFirst;
  for (;;) {
    const auto room = static_cast<uint32_t>(entries.size());
    if (!efs::ListDirectory(phone_, folder.c_str(), KRAL_EFS_FILTER_ALL, entries.data(), &count)) return false;
    if (count <= room) break;
    entries.resize(count);
  }
  for (uint32_t i = 0; i < count && files.size() < kMostFiles; ++i) {
    const KRAL_EFS_ENTRY& entry = entries[i];
    if (entry.type == KRAL_EFS_ENTRY_FILE) {
      files.emplace_back(entry.name, entry.size);
    } else if (entry.type == KRAL_EFS_ENTRY_DIRECTORY && depth > 0 && !ListFolder(entry.name, depth - 1, files)) {
      return false;
    }
  }
  return true;
}

}  // namespace kral::nv
