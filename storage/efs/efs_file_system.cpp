// What the file system and the memory under it tell about themselves, and its golden copy.
#include <algorithm>
#include <array>
#include <cstring>

#include "base/outputs.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_request.h"
#include "storage/efs/efs_transfer.h"

namespace kral::efs {

Reply AskStatus(Diag_FTM& phone, Tries tries, const char* path, u32& error, KRAL_EFS_STATFS& status) {
  return Checked(Ask(phone, tries, kFileSystemStatus, PathField(path)), [&] {
    return ReadFromEnd(phone, {&status.max_file_count, &status.file_count, &status.max_file_size, &status.free_blocks,
                               &status.available_blocks, &status.total_blocks, &status.block_size, &status.type,
                               &status.file_system_id, &error});
  });
}

bool FileSystemStatus(Diag_FTM& phone, const char* path, u32* error_number, KRAL_EFS_STATFS* status) {
  u32 error = 0;
  KRAL_EFS_STATFS answer{};
  if (!AskStatus(phone, Tries::kOne, path, error, answer)) return false;
  if (error == kDone) Put(status, answer);
  Put(error_number, error);
  return true;
}

bool UsedSpace(Diag_FTM& phone, const char* path, uint64_t* used) {
  u32 error = 0;
  KRAL_EFS_STATFS status{};
  if (!AskStatus(phone, Tries::kOne, path, error, status)) return false;
  if (!IsDone(error, path)) {
    phone.log().WriteLine(kLogErr, "EFS Command Returned Error Number: %d, Verify file/directory exists",
                          static_cast<int>(error));
    return false;
  }
  // A handset that counts more free blocks than it has uses none.
  const u32 used_blocks = status.total_blocks - std::min(status.free_blocks, status.total_blocks);
  const uint64_t bytes = uint64_t{used_blocks} * status.block_size;
  phone.log().WriteLine(kLogRet, "Space used is: %lld bytes", static_cast<long long>(bytes));
  Put(used, bytes);
  return true;
}

bool DeviceInfo(Diag_FTM& phone, u32* error_number, KRAL_EFS_DEVICE_INFO* info) {
  u32 error = 0;
  if (!Ask(phone, kDeviceInfo) || !ReadAt(phone, kErrorBehindHeader, error)) return false;
  if (error == kDone) {
    KRAL_EFS_DEVICE_INFO answer{};
    size_t offset = device_info::kFields;
    for (u32* field : {&answer.total_blocks, &answer.pages_per_block, &answer.page_size, &answer.total_page_size,
                       &answer.maker_id, &answer.device_id, &answer.device_type}) {
      if (!ReadAt(phone, offset, *field)) return false;
      offset += sizeof(u32);
    }
    const auto name = TextAt(phone.packet().response(), device_info::kName);
    if (!name) return Fail(BadReply(phone, "has a name without an end"));
    name->copy(answer.name, sizeof(answer.name) - 1);
    Put(info, answer);
  }
  Put(error_number, error);
  return true;
}

bool ExtendedInfo(Diag_FTM& phone, u32 query, u32* error_number, u32* data_type, u32* number, char* text,
                  u32 text_size) {
  u32 error = 0;
  if (!Ask(phone, kExtendedInfo, query) || !ReadAt(phone, kErrorBehindHeader, error)) return false;
  if (error == kDone) {
    u32 type = 0;
    u32 value = 0;
    if (!ReadAt(phone, extended_info::kDataType, type)) return false;
    if (type == extended_info::kNumber) {
      if (!ReadAt(phone, extended_info::kData, value)) return false;
      Put(number, value);
    } else if (type == extended_info::kText) {
      const auto answer = TextAt(phone.packet().response(), extended_info::kData);
      if (!answer) return Fail(BadReply(phone, "has a text without an end"));
      if (text != nullptr && answer->size() >= text_size) {
        return Fail(Failure(KRAL_ERROR_ARGUMENT, "the text has %zu bytes, more than the buffer of %u takes",
                            answer->size(), text_size));
      }
      if (text != nullptr) std::memcpy(text, answer->c_str(), answer->size() + 1);
    } else {
      phone.log().WriteLine(kLogErr, "KRAL_EFS2_DIAG_EXTENDED_INFO( ) -- Error: invalid data return type");
      return Fail(BadReply(phone, "has data of an unknown type"));
    }
    Put(data_type, type);
  }
  Put(error_number, error);
  return true;
}

bool MakeGoldenCopy(Diag_FTM& phone, const char* path, u32* error_number) {
  u32 error = 0;
  if (!Ask(phone, kMakeGoldenCopy, PathField(path)) || !ReadFromEnd(phone, {&error})) return false;
  phone.log().WriteLine(error == kDone ? kLogRet : kLogErr, "KRAL_EFS2_EFS2_DIAG_MAKE_GOLDEN_COPY: ERRNO=%d",
                        static_cast<int>(error));
  Put(error_number, error);
  return true;
}

}  // namespace kral::efs
