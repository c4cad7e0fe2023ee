// Has the handset write its file system out, and waits for it.
#include <algorithm>

#include "storage/efs_client.h"
#include "storage/efs_request.h"

namespace kral::efs {
namespace {

constexpr u32 kPollMs = 100;

enum class Told { kState, kNothing, kFailure };

// One of the two requests. A failure is logged; an answer that got lost may come with the next one.
Told AskState(Diag_FTM& phone, const EfsRequest<Path>& row, const char* name, const char* path, u32& state) {
  u32 error = 0;
  const bool answered = Ask(phone, row, PathField(path)) && phone.packet().ResponseAt32(kErrorBehindHeader, error);
  if (!answered && LastRefusal(phone) == refusal::kCommand) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::%s is not supported by target", name);
    return Told::kFailure;
  }
  if (!answered) return LastRefusal(phone) == 0 ? Told::kNothing : Told::kFailure;
  if (error != kDone) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait received ERRNO %d when sending %s command",
                          static_cast<int>(error), name);
    return Told::kFailure;
  }
  if (phone.packet().ResponseAt32(kSyncState, state)) return Told::kState;
  phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait: the reply to %s tells no state", name);
  return Told::kFailure;
}

}  // namespace

bool SyncWithWait(Diag_FTM& phone, const char* path, u32 time_out_ms) {
  const u32 start = phone.clock().TickMs();
  const auto elapsed = [&] { return phone.clock().TickMs() - start; };
  u32 state = 0;
  if (AskState(phone, kSyncWithoutWait, "_EFS2_DIAG_SYNC_NO_WAIT", path, state) != Told::kState) return false;
  if (state == kInSync) {
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::already in sync message is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  for (u32 waited = elapsed(); waited < time_out_ms; waited = elapsed()) {
    phone.clock().SleepMs(std::min(kPollMs, time_out_ms - waited));
    const Told told = AskState(phone, kSyncStatus, "_EFS2_DIAG_GET_SYNC_STATUS", path, state);
    if (told == Told::kFailure) return false;
    if (told == Told::kNothing || state != kInSync) continue;
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::sync is complete is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::not in sync after %d ms", static_cast<int>(elapsed()));
  return false;
}

}  // namespace kral::efs
