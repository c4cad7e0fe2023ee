// Operations on names and files that take one request: status, links, renaming, removing, permissions.
#include <cstring>

#include "base/outputs.h"
#include "base/text_argument.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {
namespace {

// For requests that answer with an error number at the end and nothing else.
template <class... Fields>
Reply AskForError(Diag_FTM& phone, u32* error_number, const EfsRequest<Fields...>& row,
                  std::type_identity_t<Field<Fields>>... fields) {
  u32 error = 0;
  const Reply reply = Ask(phone, row, fields...);
  return Checked(reply, [&] {
    if (!ReadFromEnd(phone, {&error})) return false;
    Put(error_number, error);
    return true;
  });
}

bool TakeStat(Diag_FTM& phone, const char* path, FileStatus& status) {
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

Reply Stat(Diag_FTM& phone, Tries tries, const char* path, FileStatus& status) {
  const Reply reply = Ask(phone, tries, kStat, PathField(path));
  return Checked(reply, [&] { return TakeStat(phone, path, status); });
}

bool StatInto(Diag_FTM& phone, const char* path, const StatOutputs& outputs) {
  FileStatus status;
  if (!Stat(phone, Tries::kOne, path, status)) return false;
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

Reply Unlink(Diag_FTM& phone, const char* path, u32* error_number) {
  return AskForError(phone, error_number, kUnlink, PathField(path));
}

Reply RemoveDirectory(Diag_FTM& phone, const char* folder, u32* error_number) {
  return AskForError(phone, error_number, kRemoveDirectory, PathField(folder));
}

Reply CreateLink(Diag_FTM& phone, const char* target, const char* link, u32* error_number) {
  return AskForError(phone, error_number, kSymbolicLink, PathField(target), PathField(link));
}

Reply Rename(Diag_FTM& phone, const char* old_path, const char* new_path, u32* error_number) {
  return AskForError(phone, error_number, kRename, PathField(old_path), PathField(new_path));
}

Reply ChangeMode(Diag_FTM& phone, const char* path, uint16_t mode, u32* error_number) {
  return AskForError(phone, error_number, kChangeMode, mode, PathField(path));
}

Reply Access(Diag_FTM& phone, const char* path, uint16_t permission_bits, u32* error_number) {
  return AskForError(phone, error_number, kAccess, permission_bits, PathField(path));
}

bool ReadLink(Diag_FTM& phone, const char* link, u32* error_number, char* target, u32 size) {
  u32 error = 0;
  if (!Ask(phone, kReadLink, PathField(link)) || !ReadAt(phone, kErrorBehindHeader, error)) return false;
  if (error == kDone) {
    const auto text = TextAt(phone.packet().response(), kLinkText);
    if (!text) {
      phone.log().WriteLine(kLogErr, "KRAL_EfsReadLink() -- target has no end");
      return Fail(BadReply(phone, "has a target without an end"));
    }
    if (target != nullptr && text->size() >= size) {
      phone.log().WriteLine(kLogErr, "KRAL_EfsReadLink() -- no room for the target");
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "the target of %s has %zu bytes, more than the buffer of %u takes",
                          TextOrEmpty(link), text->size(), size));
    }
    if (target != nullptr) std::memcpy(target, text->c_str(), text->size() + 1);
  }
  Put(error_number, error);
  return true;
}

Reply MakeDirectory(Diag_FTM& phone, const char* folder, u32& error) {
  Compose(phone, kMakeDirectory, kModeOfNewDirectories, PathField(folder));
  if (!IsWithinLimit(phone)) return ReplyKind::kNotSent;
  const Reply reply =
      Checked(ExchangeOnce(phone, PacketTimeOut(phone)), [&] { return ReadAt(phone, kErrorBehindHeader, error); });
  if (!reply) return reply;
  if (error == kExists) {
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = %d : Directory already exists",
                          static_cast<int>(error));
  } else {
    phone.log().WriteLine(error == kDone ? kLogRet : kLogErr, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = %d",
                          static_cast<int>(error));
  }
  return reply;
}

bool MakeDirectoryOnce(Diag_FTM& phone, const char* folder, u32* error_number) {
  u32 error = 0;
  if (!MakeDirectory(phone, folder, error)) return false;
  Put(error_number, error);
  return error == kExists || IsDone(error, folder);
}

}  // namespace kral::efs
