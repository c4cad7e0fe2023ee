// Looks at replies that nobody waited for. Closing what they name is the sender's.
#include "storage/efs/efs_strays.h"

#include <algorithm>
#include <chrono>

#include "base/little_endian.h"

namespace kral::efs {
namespace {

// How long the answers to tries that were given up are waited for once the line is free: the handset answers in order,
// so they come at once or never.
constexpr std::chrono::milliseconds kLateAnswer{80};
constexpr int kMostLateReplies = 64;  // a handset that never stops talking is not listened to for ever

struct Kind {
  u16 open;
  OpenHandles Settings::*handles;
};
constexpr Kind kKinds[] = {
    {kOpen.header.command, &Settings::files},
    {kOpenDirectory.header.command, &Settings::directories},
};

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
    OpenHandles& handles = phone.state<Settings>().*kind.handles;
    if (LoadLe<u16>(reply, 2) != kind.open || handles.unanswered == 0) continue;
    if (opened->error == kDone && handles.in_use == opened->value) return;  // an answer that came twice
    --handles.unanswered;
    if (opened->error == kDone) handles.strays.push_back(opened->value);
  }
}

bool AwaitLateAnswers(Diag_FTM& phone, const OpenHandles& handles, u32 count) {
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

}  // namespace kral::efs
