// The parts of which transfers are made, and the progress they tell. None knows who it is for: what the caller is told,
// the exported transfers pass on.
#ifndef KRAL_STORAGE_EFS_EFS_TRANSFER_H
#define KRAL_STORAGE_EFS_EFS_TRANSFER_H

#include <functional>
#include <span>
#include <string>
#include <vector>

#include "base/little_endian.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_format.h"
#include "storage/efs/efs_request.h"

namespace kral::efs {

// Who is told how far a transfer has come; empty: nobody. What the phone's packet buffer holds may not survive it.
using Progress = std::function<void(u32 operation, u32 done, u32 total)>;

// The caller's transfer callback, whichever it is at the time. It names the ends of a transfer by the address of a
// path's text or of a buffer.
Progress CallersProgress(Diag_FTM& phone, const void* source, const void* destination);

inline void Tell(const Progress& progress, u32 operation, u32 done, u32 total) {
  if (progress) progress(operation, done, total);
}

// Whether a read or write reply answers the packet at this offset. That to an earlier packet, come late, does not; nor
// does one of more bytes than the `most` of this packet, where larger ones were tried first.
inline bool IsOfChunk(std::span<const u8> reply, u32 descriptor, u32 offset, u32 most) {
  return LoadLe<u32>(reply, kHandleAt) == descriptor && LoadLe<u32>(reply, kTransferOffset) == offset &&
         LoadLe<u32>(reply, kTransferCount).value_or(0) <= most;
}

// --- Whole transfers ------------------------------------------------------------------------------------------------

bool WriteMemory(Diag_FTM& phone, std::span<const u8> bytes, const char* efs_file, const Progress& progress);
// As a plain file whatever it is, of `size` bytes at least and at most, for who has asked for its status already.
bool ReadPlainFile(Diag_FTM& phone, const char* efs_file, u8* buffer, u32* size);

// Gets every entry of the handset's types that the filter selects; false, with the reason noted, ends the listing.
using EntrySink = std::function<bool(const KRAL_EFS_ENTRY& entry)>;
void TellCaller(Diag_FTM& phone, const KRAL_EFS_ENTRY& entry);  // the directory callback
bool ListEntries(Diag_FTM& phone, const std::string& folder, uint8_t filter, const EntrySink& sink);

// --- The single requests of which they are made ---------------------------------------------------------------------
// Their reply is the expected one when the handset told an error number, and what belongs to 0 if it is that. An error
// number is noted by whoever cannot do with it.

// Every field is written when the handset answers; those behind the error number count only when it is 0.
Reply Stat(Diag_FTM& phone, Tries tries, const char* path, FileStatus& status);
// The file system that holds a path (efs_file_system.cpp).
Reply AskStatus(Diag_FTM& phone, Tries tries, const char* path, u32& error, KRAL_EFS_STATFS& status);
Reply MakeDirectory(Diag_FTM& phone, const char* folder, u32& error);
// Item files whole (efs_item.cpp). `data` is untouched on failure.
Reply PutItem(Diag_FTM& phone, const char* efs_file, std::span<const u8> data, u32& error);
Reply GetItem(Diag_FTM& phone, Tries tries, const char* efs_file, u32 length, std::vector<u8>& data, u32& error);

}  // namespace kral::efs

#endif
