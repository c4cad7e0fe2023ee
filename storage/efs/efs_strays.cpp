// Looks at replies that nobody waited for. Closing what they name is the sender's.
#include "storage/efs/efs_strays.h"

#include <algorithm>
#include <chrono>

#include "base/little_endian.h"

namespace kral::efs {
namespace {

// How long the answer to a try that was given up is waited for once the line is free, whatever else comes: the handset
// answers in order, so it comes at once or never.
constexpr u32 kLateAnswerMs = 80;

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
  const u32 longest_ms = (handles.unanswered - left) * kLateAnswerMs;
  const u32 start = phone.clock().TickMs();
  // Through a phone server no reply comes unasked.
  u32 elapsed = 0;
  while (handles.unanswered > left && elapsed < longest_ms && !phone.server_mode()) {
    const u32 wait_ms = std::min(kLateAnswerMs, longest_ms - elapsed);
    const auto record = phone.responses().PopWithin(std::chrono::milliseconds(wait_ms));
    if (!record) break;
    NoteLateReply(phone, *record);
    elapsed = phone.clock().TickMs() - start;
  }
  if (handles.unanswered <= left) return true;
  phone.log().WriteLine(kLogErr, "EFS2 answer to an opening request is lost: the handset may keep a handle open");
  return false;
}

}  // namespace kral::efs
