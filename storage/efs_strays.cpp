// Closes handles of the handset, and finds those of which nobody knows.
#include "storage/efs_strays.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "frame/base/failure.h"
#include "storage/efs_request.h"

namespace kral::efs {
namespace {

// How long the answers to tries that were given up are waited for once the line is free: the handset answers in order,
// so they come at once or never.
constexpr std::chrono::milliseconds kLateAnswer{80};
constexpr uint32_t kSettleMs = 20;    // a bound for what takes microseconds on a machine that is not busy
constexpr int kMostLateReplies = 64;  // a handset that never stops talking is not listened to for ever

struct Kind {
  u16 open;
  const EfsRequest<u32>& close;
  EfsOpenHandles EfsSettings::*handles;
};
constexpr Kind kKinds[] = {
    {kOpen.header.command, kClose, &EfsSettings::files},
    {kOpenDirectory.header.command, kCloseDirectory, &EfsSettings::directories},
};

bool IsAwaited(const EfsSettings& settings) {
  return settings.files.unanswered + settings.directories.unanswered > 0;
}

}  // namespace

std::optional<Opened> ReadOpened(std::span<const u8> reply) {
  const auto value = LoadLe<u32>(reply, kHandleAt);
  const auto error = LoadLe<u32>(reply, kErrorBehindHandle);
  if (!value || !error) return std::nullopt;
  return Opened{*value, *error};
}

void NoteLateReply(Diag_FTM& phone, std::span<const u8> reply) {
  const auto opened = ReadOpened(reply);
  if (!opened || reply[0] != kSubsystemDispatch || reply[1] != kSubsystem) return;
  for (const Kind& kind : kKinds) {
    EfsOpenHandles& handles = phone.efs().*kind.handles;
    if (LoadLe<u16>(reply, 2) != kind.open || handles.unanswered == 0) continue;
    if (opened->error == kDone && handles.in_use == opened->value) return;  // an answer that came twice
    --handles.unanswered;
    if (opened->error == kDone) handles.strays.push_back(opened->value);
  }
}

void NoteLateReplies(Diag_FTM& phone) {
  // What has been read and is on its way to the queue would be thrown away as well.
  if (IsAwaited(phone.efs()) && !phone.server_mode()) phone.dispatcher().WaitUntilDispatched(kSettleMs);
  while (IsAwaited(phone.efs())) {
    const auto record = phone.responses().Pop();
    if (!record) return;
    NoteLateReply(phone, *record);
  }
}

bool AwaitLateAnswers(Diag_FTM& phone, const EfsOpenHandles& handles, u32 count) {
  const u32 left = handles.unanswered - std::min(count, handles.unanswered);
  // Through a phone server no reply comes unasked.
  for (int i = 0; i < kMostLateReplies && handles.unanswered > left && !phone.server_mode(); ++i) {
    const auto record = phone.responses().PopWithin(kLateAnswer);
    if (!record) break;
    NoteLateReply(phone, *record);
  }
  if (handles.unanswered <= left) return true;
  phone.log().WriteLine(kLogErr, "EFS2 answer to an opening request is lost: the handset may keep a handle open");
  return false;
}

void CloseStrays(Diag_FTM& phone) {
  for (const Kind& kind : kKinds) {
    auto& strays = (phone.efs().*kind.handles).strays;
    for (const u32 value : std::exchange(strays, {})) {
      phone.log().WriteLine(kLogRet, "EFS2 handle %u was opened by a request given up, and is closed", value);
      const KeepFailure keep;
      const bool closed = CloseHandle(phone, kind.close, value, DefaultTimeOut(phone));
      // After an abort a silent handset is not waited for: it is told with the next operation.
      if (!closed && phone.efs().gave_up) strays.push_back(value);
    }
  }
}

bool CloseHandle(Diag_FTM& phone, const EfsRequest<u32>& close, u32 value, u32 time_out_ms) {
  CDiagPacket& packet = phone.packet(kSidePacket);
  packet.Reset();
  packet.Append8(kSubsystemDispatch);
  packet.Append8(close.header.subsystem);
  packet.Append16(close.header.command);
  packet.Append32(value);
  bool unanswered = false;
  const int tries = CleanUpTries(phone);
  for (int attempt = 0; attempt < tries; ++attempt) {
    u32 error = 0;
    const Reply reply = Checked(ExchangeToCleanUp(phone, packet, time_out_ms), [&] {
      return packet.ResponseAt32(kErrorBehindHeader, error) ||
             Fail(Failure(KRAL_ERROR_LINK, "the reply to the closing of a handle is too short"));
    });
    if (!reply) {
      unanswered = true;
      continue;
    }
    // A handset that does not know the handle any more has closed it on a try whose answer was lost.
    if (IsDone(error, "what is to be closed") || (unanswered && error == kBadDescriptor)) return true;
  }
  phone.log().WriteLine(kLogErr, "EFS2 handle %u could not be closed", value);
  return false;
}

}  // namespace kral::efs
