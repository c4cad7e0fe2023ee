// Item files: small files that are written and read whole, by one request.
#include <algorithm>

#include "frame/base/text_argument.h"
#include "platform/file_util.h"
#include "storage/efs_client.h"
#include "storage/efs_request.h"
#include "storage/efs_transfer.h"

namespace kral::efs {
namespace {

bool IsPathWithinLimit(Diag_FTM& phone, Path path) {
  if (path.size() - 1 <= kLongestItemPath && path.back() == 0) return true;
  phone.log().WriteLine(kLogErr, "EFS2 item request not sent: its path is too long");
  return false;
}

}  // namespace

bool PutItemFromMemory(Diag_FTM& phone, const char* efs_file, const u8* buffer, u32 size) {
  if (size > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_DIAG_Put buffer size is too big. Item file max size is %i bytes, ",
                          static_cast<int>(KRAL_EFS_ITEM_SIZE));
    return false;
  }
  if (buffer == nullptr && size > 0) return false;
  const Path path = PathField(efs_file);
  if (!IsPathWithinLimit(phone, path)) return false;
  Compose(phone, kPutItem, size, kItemFlags, kItemSequence, Bytes(buffer, size), path);
  u32 error = 0;
  if (!Exchange(phone, DefaultTimeOut(phone)) || !ReadFromEnd(phone, {&error})) return false;
  if (error == kDone) return true;
  phone.log().WriteLine(kLogErr, "EFS Put item error code %u", error);
  return false;
}

bool PutItemFromFile(Diag_FTM& phone, const char* local_file, const char* efs_file) {
  std::vector<u8> data;
  const char* const name = TextOrEmpty(local_file);
  if (const auto error = ReadWholeFile(name, KRAL_EFS_ITEM_SIZE, data)) {
    if (error == std::errc::file_too_large) {
      phone.log().WriteLine(kLogErr, "KRAL_EFS2_DIAG_Put source file '%s' is too big. Item file max size is %i bytes, ",
                            name, static_cast<int>(KRAL_EFS_ITEM_SIZE));
    } else {
      phone.log().WriteLine(kLogErr, "fopen() failed to open PC file %s", name);
    }
    return false;
  }
  return PutItemFromMemory(phone, efs_file, data.data(), static_cast<u32>(data.size()));
}

bool GetItem(Diag_FTM& phone, Tries tries, const char* efs_file, u32 length, const TransferEnds& ends,
             std::vector<u8>& data) {
  const Path path = PathField(efs_file);
  if (!IsPathWithinLimit(phone, path)) return false;
  Compose(phone, kGetItem, length, static_cast<u32>(path.size()), kItemSequence, path);
  const CDiagPacket& packet = phone.packet();
  u32 count = 0;
  u32 error = 0;
  if (!AskComposed(phone, tries) || !packet.ResponseAt32(kItemCount, count) ||
      !packet.ResponseAt32(kItemError, error)) {
    return false;
  }
  if (error != kDone) {
    phone.log().WriteLine(kLogErr, "EFS Get item  error code %d", static_cast<int>(error));
    return false;
  }
  const auto reply = packet.response();
  if (reply.size() < kItemData || count > length || count > reply.size() - kItemData) {
    phone.log().WriteLine(kLogErr, "EFS Get item reply of %d bytes does not hold %u", static_cast<int>(reply.size()),
                          count);
    return false;
  }
  const auto content = reply.subspan(kItemData, count);
  data.assign(content.begin(), content.end());
  phone.log().WriteLine(kLogRet, " EFS Get Transferred %u", count);
  Report(phone, ends, KRAL_EFS_OPERATION_GET_ITEM, count, length);
  return true;
}

bool GetItemToFile(Diag_FTM& phone, const char* local_file, const char* efs_file, u32 length) {
  if (local_file == nullptr || length > KRAL_EFS_ITEM_SIZE) {
    phone.log().WriteLine(kLogErr, "KRAL_Efs2GetItem() -- item files hold at most %d bytes",
                          static_cast<int>(KRAL_EFS_ITEM_SIZE));
    return false;
  }
  std::vector<u8> data;
  const TransferEnds ends{AddressOf(efs_file), AddressOf(local_file)};
  if (!GetItem(phone, Tries::kOne, efs_file, length, ends, data)) return false;
  if (!ReplaceWholeFile(local_file, data)) return true;
  phone.log().WriteLine(kLogErr, "Failed to write item file data to the local file: '%s'", local_file);
  return false;
}

}  // namespace kral::efs
