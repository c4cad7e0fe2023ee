// What transfers in both directions share: who they are for, and the progress they report.
#ifndef KRAL_STORAGE_EFS_TRANSFER_H
#define KRAL_STORAGE_EFS_TRANSFER_H

#include <vector>

#include "frame/base/guarded_call.h"
#include "frame/base/little_endian.h"
#include "storage/efs_client.h"
#include "storage/efs_format.h"
#include "storage/efs_request.h"

namespace kral::efs {

// As the transfer callback names them: the address of a path's text or of a buffer.
struct TransferEnds {
  uintptr_t source;
  uintptr_t destination;
};

inline uintptr_t AddressOf(const void* memory) {
  return reinterpret_cast<uintptr_t>(memory);
}

// Calls the transfer callback, if there is one. What the phone's packet buffer holds may not survive it.
inline void Report(Diag_FTM& phone, const TransferEnds& ends, u32 operation, u32 done, u32 total) {
  if (const auto callback = phone.efs().transfer_callback.load()) {
    const KRAL_HANDLE context = phone.efs().callback_context;
    CallGuarded([&] { callback(ends.source, ends.destination, operation, 0, done, total, context); });
  }
}

// Whether a read or write reply answers the packet at this offset. That to an earlier packet, come late, does not.
inline bool IsOfChunk(std::span<const u8> reply, u32 descriptor, u32 offset) {
  return LoadLe<u32>(reply, kHandleAt) == descriptor && LoadLe<u32>(reply, kTransferOffset) == offset;
}

// The single requests of which transfers are made, with the tries of a transfer.

// Stat (efs_names.cpp).
bool StatInTransfer(Diag_FTM& phone, const char* path, FileStatus& status);
// The file system that holds a path (efs_file_system.cpp); false also when the reply is too short for its fields.
bool AskStatus(Diag_FTM& phone, Tries tries, const char* path, u32& error, KRAL_EFS_STATFS& status);
// Fetches an item file whole (efs_item.cpp). `data` is untouched on failure.
bool GetItem(Diag_FTM& phone, Tries tries, const char* efs_file, u32 length, const TransferEnds& ends,
             std::vector<u8>& data);

}  // namespace kral::efs

#endif
