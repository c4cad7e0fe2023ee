// Chooses the way to each kind of item: numbered, RF NV dispatcher, file. The requests are those of backups, which tell
// late answers from this request's own.
#include "storage/nv/nv_mobile.h"

#include <algorithm>

#include "commands/ftm/rf_nv.h"
#include "commands/nv/nv_item.h"
#include "storage/efs/efs_request.h"

namespace kral::nv {
namespace {

using Kind = NvAnswer::Kind;
using Answer = items::PhoneItems::Answer;

// Without a status; why is noted where the request failed.
NvAnswer Unanswered(Answer answer) {
  return {answer == Answer::kLost ? Kind::kNoAnswer : Kind::kRefused};
}

NvAnswer Judged(uint16_t id, uint16_t status) {
  if (status == kDone) return {Kind::kOk};
  Fail(Refusal(id, status));
  return {Kind::kRefused, status};
}

// By the error number of the handset's file system.
NvAnswer JudgedFile(const std::string& path, uint32_t error) {
  if (efs::IsDone(error, path.c_str())) return {Kind::kOk};
  return {Kind::kRefused, error == efs::kMissing ? kNeverWritten : kDone};
}

}  // namespace

uint32_t ModeOfNewFile(size_t size) {
  return (size <= KRAL_EFS_ITEM_SIZE ? efs::kItemFile : efs::kPlainFile) | efs::kModeOfNewFiles;
}

bool NvMobile::CanName(const NvItem& item) const {
  return item.is_file() || !item.is_array() || subscription_ == 0;
}

pkv::PkvNvItem NvMobile::Numbered(const NvItem& item, uint16_t element) const {
  pkv::PkvNvItem numbered;
  numbered.id = *item.id;
  numbered.index = element;
  numbered.subscription = subscription_;
  return numbered;
}

NvAnswer NvMobile::Read(NvItem& item, uint16_t element, NvBytes& stored) {
  if (!CanName(item)) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: elements of arrays can be read for subscription 0 only",
                 item.Title().c_str()));
    return {Kind::kRefused, kNeverWritten};
  }
  if (item.is_file()) {
    uint16_t status = kDone;
    // Outside factory test mode the same bytes are read from the item's file.
    if (item.id && has_rf_dispatcher_) {
      if (ReadRf(phone_, *item.id, stored, status)) return Judged(*item.id, status);
      has_rf_dispatcher_ = false;
    }
    return ReadFile(item, stored);
  }
  pkv::PkvNvItem numbered = Numbered(item, element);
  const Answer answer = items_.Read(numbered, item.is_array());
  const size_t size = item.is_array() ? kDataSize - 1 : kDataSize;
  stored.assign(numbered.data.begin(), numbered.data.begin() + static_cast<std::ptrdiff_t>(size));
  if (answer != Answer::kAnswered) return Unanswered(answer);
  phone_.log().WriteLine(kLogRet, "DIAG_NV_READ_F NV Id:%d Status:%d", *item.id, numbered.status);
  return Judged(*item.id, numbered.status);
}

NvAnswer NvMobile::Write(const NvItem& item, uint16_t element, std::span<const uint8_t> stored) {
  if (!CanName(item)) {
    phone_.log().WriteLine(kLogErr, "%s: elements of arrays can be written for subscription 0 only",
                           item.Title().c_str());
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: elements of arrays can be written for subscription 0 only",
                 item.Title().c_str()));
    return {Kind::kRefused};
  }
  uint16_t status = kDone;
  if (item.is_file()) {
    if (item.id && has_rf_dispatcher_ && stored.size() <= kRfDataSize) {
      if (WriteRf(phone_, *item.id, stored, status)) return Judged(*item.id, status);
      has_rf_dispatcher_ = false;
    }
    return WriteFile(item, stored);
  }
  pkv::PkvNvItem numbered = Numbered(item, element);
  std::copy_n(stored.begin(), std::min(stored.size(), numbered.data.size()), numbered.data.begin());
  const Answer answer = items_.Write(numbered, item.is_array(), status);
  if (answer != Answer::kAnswered) return Unanswered(answer);
  phone_.log().WriteLine(kLogRet, "DIAG_NV_WRITE_F NV Id:%d Status:%d", *item.id, status);
  return Judged(*item.id, status);
}

NvAnswer NvMobile::ReadFile(NvItem& item, NvBytes& stored) {
  uint32_t mode = 0;
  uint32_t size = 0;
  uint32_t error = 0;
  const Answer told = items_.Status(item.path.c_str(), mode, size, error);
  if (told != Answer::kAnswered) return Unanswered(told);
  if (error != efs::kDone) return JudgedFile(item.path, error);
  if (size > kLongestValue) {
    phone_.log().WriteLine(kLogErr, "%s has %u bytes, too many for an item", item.path.c_str(), size);
    Fail(Failure(KRAL_ERROR_LINK, "the file %s has %u bytes, too many for an item", item.path.c_str(), size));
    return {Kind::kRefused};
  }
  item.mode = mode;
  pkv::PkvEfsFile file{item.path, mode, {}};
  const Answer answer = items_.ReadTold(file, size, error);
  if (answer != Answer::kAnswered) return Unanswered(answer);
  stored = std::move(file.bytes);
  return JudgedFile(item.path, error);
}

NvAnswer NvMobile::WriteFile(const NvItem& item, std::span<const uint8_t> stored) {
  pkv::PkvEfsFile file{item.path, 0, {stored.begin(), stored.end()}};
  uint32_t size = 0;
  uint32_t error = 0;
  const Answer told = items_.Status(item.path.c_str(), file.mode, size, error);
  if (told != Answer::kAnswered) return Unanswered(told);
  // A file that is there stays what it is; another one becomes what it was where it was seen.
  const bool is_there = error == efs::kDone;
  if (!is_there) file.mode = item.mode != 0 ? item.mode : ModeOfNewFile(stored.size());
  Answer answer = items_.WriteFile(file, error);
  // An item file that outgrows its requests is removed, and made anew as a plain one.
  const bool is_new = !is_there || (file.is_item_file() && stored.size() > KRAL_EFS_ITEM_SIZE);
  const bool is_mode_known = is_there || item.mode != 0;
  if (answer == Answer::kAnswered && error == efs::kDone && is_new && is_mode_known) {
    answer = items_.SetPermissions(file, error);
  }
  if (answer != Answer::kAnswered) return Unanswered(answer);
  return JudgedFile(item.path, error);
}

Answer NvMobile::ListItemFiles(std::vector<items::PhoneItems::FoundFile>& files) {
  return items_.FindFiles(files);
}

}  // namespace kral::nv
