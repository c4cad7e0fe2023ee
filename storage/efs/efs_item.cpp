// Item files: small files that are written and read whole, by one request.
#include <algorithm>

#include "base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {
namespace {

bool IsPathWithinLimit(Diag_FTM& phone, Path path) {
  if (path.size() - 1 <= kLongestItemPath && path.back() == 0) return true;
  phone.log().WriteLine(kLogErr, "EFS2 item request not sent: its path is too long");
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "the path is too long: more than %zu bytes", kLongestItemPath));
}

Failure TooLargeForAnItem(const char* what, uint64_t size) {
  return Failure(KRAL_ERROR_ARGUMENT, "%s of %llu bytes: item files hold at most %d", what,
                 static_cast<unsigned long long>(size), KRAL_EFS_ITEM_SIZE);
}

bool TakeItem(Diag_FTM& phone, u32 length, std::vector<u8>& data, u32& error) {
  u32 count = 0;
  if (!ReadAt(phone, kItemCount, count) || !ReadAt(phone, kItemError, error)) return false;
  if (error != kDone) {
    phone.log().WriteLine(kLogErr, "EFS Get item  error code %d", static_cast<int>(error));
    return true;
  }
  const auto reply = phone.packet().response();
  if (reply.size() < kItemData || count > length || count > reply.size() - kItemData) {
    phone.log().WriteLine(kLogErr, "EFS Get item reply of %d bytes does not hold %u", static_cast<int>(reply.size()),
                          count);
    return Contradicts(phone);
  }
  const auto content = reply.subspan(kItemData, count);
  data.assign(content.begin(), content.end());
  phone.log().WriteLine(kLogRet, " EFS Get Transferred %u", count);
  return true;
}

}  // namespace

Reply PutItem(Diag_FTM& phone, const char* efs_file, std::span<const u8> data, u32& error) {
  const Path path = PathField(efs_file);
  if (!IsPathWithinLimit(phone, path)) return ReplyKind::kNotSent;
  Compose(phone, kPutItem, static_cast<u32>(data.size()), kItemFlags, kItemSequence, data, path);
  const Reply reply = Checked(ExchangeOnce(phone, DefaultTimeOut(phone)), [&] { return ReadFromEnd(phone, {&error}); });
  if (reply && error != kDone) phone.log().WriteLine(kLogErr, "EFS Put item error code %u", error);
  return reply;
}

bool PutItemFromMemory(Diag_FTM& phone, const char* efs_file, const u8* buffer, u32 size) {
  if (size > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_DIAG_Put buffer size is too big. Item file max size is %i bytes, ",
                          static_cast<int>(KRAL_EFS_ITEM_SIZE));
    return Fail(TooLargeForAnItem("a buffer", size));
  }
  if (buffer == nullptr && size > 0) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer with the data"));
  const Transfer transfer(phone);
  u32 error = 0;
  return PutItem(phone, efs_file, {buffer, size}, error) && IsDone(error, efs_file);
}

bool PutItemFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  std::vector<u8> data;
  const char* const name = TextOrEmpty(local_file);
  if (const auto error = ReadWholeFile(name, KRAL_EFS_ITEM_SIZE, data)) {
    if (error == std::errc::file_too_large) {
      phone.log().WriteLine(kLogErr, "KRAL_EFS2_DIAG_Put source file '%s' is too big. Item file max size is %i bytes, ",
                            name, static_cast<int>(KRAL_EFS_ITEM_SIZE));
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "the file %s is too large: item files hold at most %d bytes", name,
                          KRAL_EFS_ITEM_SIZE));
    }
    phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", name);
    return Fail(FileFailure(name, "cannot be read").System(error));
  }
  return PutItemFromMemory(phone, efs_file, data.data(), static_cast<u32>(data.size()));
}

Reply GetItem(Diag_FTM& phone, Tries tries, const char* efs_file, u32 length, std::vector<u8>& data, u32& error) {
  const Path path = PathField(efs_file);
  if (!IsPathWithinLimit(phone, path)) return ReplyKind::kNotSent;
  Compose(phone, kGetItem, length, static_cast<u32>(path.size()), kItemSequence, path);
  return Checked(AskComposed(phone, tries), [&] { return TakeItem(phone, length, data, error); });
}

bool GetItemToFile(Diag_FTM& phone, const char* local_file, const char* efs_file, u32 length) {
  if (local_file == nullptr || length > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "KRAL_Efs2GetItem() -- item files hold at most %d bytes",
                          static_cast<int>(KRAL_EFS_ITEM_SIZE));
    return local_file == nullptr ? Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no name of a local file"))
                                 : Fail(TooLargeForAnItem("a length", length));
  }
  const Transfer transfer(phone);
  std::vector<u8> data;
  u32 error = 0;
  if (!GetItem(phone, Tries::kOne, efs_file, length, data, error) || !IsDone(error, efs_file)) return false;
  Tell(CallersProgress(phone, efs_file, local_file), KRAL_EFS_OPERATION_GET_ITEM, static_cast<u32>(data.size()),
       length);
  const std::error_code written = ReplaceWholeFile(local_file, data);
  if (!written) return true;
  phone.log().WriteLine(kLogErr, "Failed to write item file data to the local file: '%s'", local_file);
  return Fail(FileFailure(local_file, "cannot be written").System(written));
}

}  // namespace kral::efs
