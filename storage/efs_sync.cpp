// Has the handset write its file system out, and waits for it.
#include <algorithm>

#include "storage/efs_client.h"
#include "storage/efs_request.h"

namespace kral::efs {
namespace {

constexpr u32 kPollMs = 100;

// One of the two requests; false (logged) when it does not tell the state.
bool AskState(Diag_FTM& phone, const EfsRequest<Path>& row, const char* name, const char* path, u32& state) {
  u32 error = 0;
  const bool answered = Ask(phone, row, PathField(path)) && phone.packet().ResponseAt32(kErrorBehindHeader, error);
  if (!answered && LastRefusal(phone) == kBadCommand) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::%s is not supported by target", name);
  } else if (error != kDone) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait received ERRNO %d when sending %s command",
                          static_cast<int>(error), name);
  }
  return answered && error == kDone && phone.packet().ResponseAt32(kSyncState, state);
}

}  // namespace

bool SyncWithWait(Diag_FTM& phone, const char* path, u32 time_out_ms) {
  const u32 start = phone.clock().TickMs();
  const auto elapsed = [&] { return phone.clock().TickMs() - start; };
  u32 state = 0;
  if (!AskState(phone, kSyncWithoutWait, "_EFS2_DIAG_SYNC_NO_WAIT", path, state)) return false;
  if (state == kInSync) {
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::already in sync message is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  while (elapsed() < time_out_ms) {
    phone.clock().SleepMs(std::min(kPollMs, time_out_ms));
    if (!AskState(phone, kSyncStatus, "_EFS2_DIAG_GET_SYNC_STATUS", path, state)) return false;
    if (state != kInSync) continue;
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::sync is complete is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::not in sync after %d ms", static_cast<int>(elapsed()));
  return false;
}

}  // namespace kral::efs
