// What transfers in both directions share: who they are for, and the progress they report.
#ifndef KRAL_STORAGE_EFS_TRANSFER_H
#define KRAL_STORAGE_EFS_TRANSFER_H

#include <vector>

#include "storage/efs_client.h"
#include "storage/efs_format.h"

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
    callback(ends.source, ends.destination, operation, 0, done, total, phone.efs().callback_context);
  }
}

// Fetches an item file whole (efs_item.cpp). `data` is untouched on failure.
bool GetItem(Diag_FTM& phone, const char* efs_file, u32 length, const TransferEnds& ends, std::vector<u8>& data);

}  // namespace kral::efs

#endif
