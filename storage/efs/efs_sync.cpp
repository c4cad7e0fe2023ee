// Has the handset write its file system out, and waits for it.
#include <algorithm>

#include "base/text_argument.h"
#include "storage/efs/efs_client.h"
#include "storage/efs/efs_request.h"

namespace kral::efs {
namespace {

constexpr u32 kPollMs = 100;

// What the handset told. A state is there when the error number is that of success.
struct SyncAnswer {
  u32 error = kDone;
  u32 state = 0;
};

// One of the two requests. A failure is logged.
Reply AskState(Diag_FTM& phone, const EfsRequest<Path>& row, const char* name, const char* path, SyncAnswer& answer) {
  const Reply reply = Checked(Ask(phone, row, PathField(path)), [&] {
    return ReadAt(phone, kErrorBehindHeader, answer.error) &&
           (answer.error != kDone || ReadAt(phone, kSyncState, answer.state));
  });
  if (reply.refusal() == refusal::kCommand) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::%s is not supported by target", name);
  } else if (reply.kind() == ReplyKind::kOther && reply.refusal() == 0) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait: the reply to %s tells no state", name);
  } else if (reply && !IsDone(answer.error, path)) {
    phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait received ERRNO %d when sending %s command",
                          static_cast<int>(answer.error), name);
  }
  return reply;
}

}  // namespace

bool SyncWithWait(Diag_FTM& phone, const char* path, u32 time_out_ms) {
  const Transfer transfer(phone);
  const u32 start = phone.clock().TickMs();
  const auto elapsed = [&] { return phone.clock().TickMs() - start; };
  SyncAnswer answer;
  Reply reply = AskState(phone, kSyncWithoutWait, "_EFS2_DIAG_SYNC_NO_WAIT", path, answer);
  if (!reply || answer.error != kDone) return false;
  if (answer.state == kInSync) {
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::already in sync message is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  for (u32 waited = elapsed(); waited < time_out_ms; waited = elapsed()) {
    phone.clock().SleepMs(std::min(kPollMs, time_out_ms - waited));
    if (IsAborted(phone, "Sync")) return false;
    reply = AskState(phone, kSyncStatus, "_EFS2_DIAG_GET_SYNC_STATUS", path, answer);
    if (reply.kind() == ReplyKind::kOther || answer.error != kDone) return false;
    // Whoever is plugged in next was not asked to write anything out.
    if (reply.kind() == ReplyKind::kGone) return false;
    // An answer that got lost may come with the next one.
    if (!reply || answer.state != kInSync) continue;
    phone.log().WriteLine(kLogRet, "KRAL_EFS2_SyncWithWait::sync is complete is received at %d ms",
                          static_cast<int>(elapsed()));
    return true;
  }
  phone.log().WriteLine(kLogErr, "KRAL_EFS2_SyncWithWait::not in sync after %d ms", static_cast<int>(elapsed()));
  if (reply) Fail(Failure(KRAL_ERROR_NO_ANSWER, "%s is not in sync after %u ms", TextOrEmpty(path), time_out_ms));
  return false;
}

}  // namespace kral::efs
