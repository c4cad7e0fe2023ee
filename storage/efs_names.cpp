// Operations on names and files that take one request: status, links, renaming, removing, permissions.
#include <cstring>

#include "commands/outputs.h"
#include "frame/base/text_argument.h"
#include "storage/efs_client.h"
#include "storage/efs_request.h"
#include "storage/efs_transfer.h"

namespace kral::efs {
namespace {

// For requests that answer with an error number at the end and nothing else.
template <class... Fields>
bool AskForError(Diag_FTM& phone, u32* error_number, const EfsRequest<Fields...>& row,
                 std::type_identity_t<Field<Fields>>... fields) {
  u32 error = 0;
  if (!Ask(phone, row, fields...) || !ReadFromEnd(phone, {&error})) return false;
  Put(error_number, error);
  return true;
}

bool AskStat(Diag_FTM& phone, Tries tries, const char* path, FileStatus& status) {
  if (!Ask(phone, tries, kStat, PathField(path))) return false;
  FileStatus s;
  if (!ReadFromEnd(
          phone, {&s.change_time, &s.modify_time, &s.access_time, &s.link_count, &s.size, &s.mode, &s.error_number})) {
    return false;
  }
  status = s;
  phone.log().WriteLine(kLogRet,
                        "KRAL_EFS2_DIAG_STAT(                               sFilePath = %s, iErrorNo = 0x%X, iMode = "
                        "0x%X, iSize = 0x%X,                               iNlink = 0x%X, iAtime = 0x%X, iMtime = "
                        "0x%X, iCtime  = 0x%X)",
                        TextOrEmpty(path), s.error_number, s.mode, s.size, s.link_count, s.access_time, s.modify_time,
                        s.change_time);
  return true;
}

}  // namespace

bool FileStatus::is_item_file() const {
  return exists() && (mode & kModeKind) == kItemFile;
}

bool Stat(Diag_FTM& phone, const char* path, FileStatus& status) {
  return AskStat(phone, Tries::kOne, path, status);
}

bool StatInTransfer(Diag_FTM& phone, const char* path, FileStatus& status) {
  return AskStat(phone, Tries::kTransfer, path, status);
}

bool StatInto(Diag_FTM& phone, const char* path, const StatOutputs& outputs) {
  FileStatus status;
  if (!Stat(phone, path, status)) return false;
  Put(outputs.error_number, status.error_number);
  if (!status.exists()) return true;
  Put(outputs.mode, status.mode);
  Put(outputs.size, status.size);
  Put(outputs.link_count, status.link_count);
  Put(outputs.access_time, status.access_time);
  Put(outputs.modify_time, status.modify_time);
  Put(outputs.change_time, status.change_time);
  return true;
}

bool Unlink(Diag_FTM& phone, const char* path, u32* error_number) {
  return AskForError(phone, error_number, kUnlink, PathField(path));
}

bool RemoveDirectory(Diag_FTM& phone, const char* folder, u32* error_number) {
  return AskForError(phone, error_number, kRemoveDirectory, PathField(folder));
}

bool CreateLink(Diag_FTM& phone, const char* target, const char* link, u32* error_number) {
  return AskForError(phone, error_number, kSymbolicLink, PathField(target), PathField(link));
}

bool Rename(Diag_FTM& phone, const char* old_path, const char* new_path, u32* error_number) {
  return AskForError(phone, error_number, kRename, PathField(old_path), PathField(new_path));
}

bool ChangeMode(Diag_FTM& phone, const char* path, uint16_t mode, u32* error_number) {
  return AskForError(phone, error_number, kChangeMode, mode, PathField(path));
}

bool Access(Diag_FTM& phone, const char* path, uint16_t permission_bits, u32* error_number) {
  return AskForError(phone, error_number, kAccess, permission_bits, PathField(path));
}

bool ReadLink(Diag_FTM& phone, const char* link, u32* error_number, char* target, u32 size) {
  u32 error = 0;
  if (!Ask(phone, kReadLink, PathField(link)) || !phone.packet().ResponseAt32(kErrorBehindHeader, error)) return false;
  if (error == kDone) {
    const auto text = TextAt(phone.packet().response(), kLinkText);
    if (!text || (target != nullptr && text->size() >= size)) {
      phone.log().WriteLine(kLogErr, "KRAL_EfsReadLink() -- %s", text ? "no room for the target" : "target has no end");
      return false;
    }
    if (target != nullptr) std::memcpy(target, text->c_str(), text->size() + 1);
  }
  Put(error_number, error);
  return true;
}

bool MakeDirectory(Diag_FTM& phone, const char* folder, u32* error_number) {
  Compose(phone, kMakeDirectory, kModeOfNewDirectories, PathField(folder));
  u32 error = 0;
  if (!IsWithinLimit(phone) || !Exchange(phone, PacketTimeOut(phone)) ||
      !phone.packet().ResponseAt32(kErrorBehindHeader, error)) {
    return false;
  }
  if (error == kExists) {
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = %d : Directory already exists",
                          static_cast<int>(error));
  } else {
    phone.log().WriteLine(error == kDone ? kLogRet : kLogErr, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = %d",
                          static_cast<int>(error));
  }
  Put(error_number, error);
  return error == kDone || error == kExists;
}

}  // namespace kral::efs
