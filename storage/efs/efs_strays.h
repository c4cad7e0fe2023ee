// Handles that the handset opened for tries which were given up. Their answers may come late, in front of any other
// request's: each of those handles is then closed, for the handset has few of them.
#ifndef KRAL_STORAGE_EFS_EFS_STRAYS_H
#define KRAL_STORAGE_EFS_EFS_STRAYS_H

#include "storage/efs/efs_format.h"
#include "storage/efs/efs_settings.h"

namespace kral::efs {

// What an opening request is answered by.
struct Opened {
  u32 value;
  u32 error;
};
std::optional<Opened> ReadOpened(std::span<const u8> reply);

// Looks at a reply that was not waited for.
void NoteLateReply(Diag_FTM& phone, std::span<const u8> reply);
// Waits a moment for the answers to so many opening requests that were given up. False (logged) when not all came.
bool AwaitLateAnswers(Diag_FTM& phone, const OpenHandles& handles, u32 count);

}  // namespace kral::efs

#endif
