// Switches the handset's operating mode, waits as each mode needs, and reads the mode back.
#include <algorithm>
#include <optional>

#include "commands/core/core_diag.h"
#include "commands/core/core_diag_format.h"
#include "commands/ftm_settings.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"

namespace kral::diag {
namespace {

constexpr uint32_t kPollIntervalMs = 100;

// By whoever has these requests for a part of its work.
bool IsAborted(Diag_FTM& phone) {
  return !phone.server_mode() && phone.transport().aborted();
}

void Pause(Diag_FTM& phone, uint32_t milliseconds) {
  constexpr uint32_t kLookAroundMs = 50;
  while (milliseconds > 0 && !IsAborted(phone) && !phone.device_gone()) {
    const uint32_t piece = std::min(milliseconds, kLookAroundMs);
    phone.clock().SleepMs(piece);
    milliseconds -= piece;
  }
}

// The delay that follows a switch, with its log lines.
struct SwitchDelay {
  uint32_t time_out_id;
  const char* name;
};
constexpr SwitchDelay kFtmDelay{kTimeOutAfterFtmSwitch, "FTM"};
constexpr SwitchDelay kOnlineDelay{kTimeOutAfterOnlineSwitch, "ONLINE"};
constexpr SwitchDelay kOfflineDelay{kTimeOutAfterOfflineSwitch, "OFFLINE"};

void WaitAfterSwitch(Diag_FTM& phone, const SwitchDelay& delay) {
  const uint32_t milliseconds = phone.TimeOut(delay.time_out_id);
  if (milliseconds == 0) {
    phone.log().WriteLine(kLogRet, "KRAL_DIAG_CONTROL_F() -- post-%s-mode-switch delay is zero.", delay.name);
    return;
  }
  phone.log().WriteLine(kLogRet, "KRAL_DIAG_CONTROL_F() -- post-%s-mode-switch delay is %dms.", delay.name,
                        static_cast<int>(milliseconds));
  Pause(phone, milliseconds);
}

bool IsReadBack(uint16_t mode) {
  return mode <= kModeLowPower && mode != kModeReset;
}

bool HasReached(uint16_t mode, uint32_t state) {
  switch (mode) {
    case kModeOfflineAnalog:
    case kModeOfflineDigital:
      return state >= kStateOfflineFirst && state <= kStateOfflineLast;
    case kModeFactoryTest:
      return state == kStateFactoryTest;
    case kModeOnline:
      return state == kStateOnline;
    case kModeLowPower:
      return state == kStateLowPower;
    default:
      return false;
  }
}

Failure NotReached(uint16_t mode, uint32_t told, uint32_t total) {
  return Failure(KRAL_ERROR_NO_ANSWER, "the handset is not in mode %d after %u ms, but tells state %u", mode, total,
                 told)
      .Status(KRAL_ERROR_STATUS_COMMAND, told);
}

// `mode` as the caller passed it: bits above the low four are sent nowhere, but they make the read-back time out.
bool PollMode(Diag_FTM& phone, uint16_t mode, uint32_t total) {
  const uint32_t start = phone.clock().TickMs();
  std::optional<uint32_t> told;
  for (;;) {
    uint32_t state = 0;
    const bool answered = GetPhoneOperatingMode(phone, state);
    if (answered) told = state;
    const bool reached = answered && HasReached(mode, state);
    const uint32_t used = phone.clock().TickMs() - start;
    const bool is_over = IsAborted(phone) || phone.device_gone();
    if (reached || is_over || used >= total) {
      phone.log().WriteLine(
          kLogRet, "DIAG_CONTROL_F -- mode switching status polling has %s (time used = %d, total timeout = %d) ms.",
          reached ? "succeeded" : "timeout", static_cast<int>(used), static_cast<int>(total));
      if (!reached && told && !is_over) Fail(NotReached(mode, *told, total));  // else the last request has said why
      return reached;
    }
    phone.clock().SleepMs(kPollIntervalMs);
  }
}

bool ReadBack(Diag_FTM& phone, uint16_t mode, bool sent) {
  const uint32_t total = phone.TimeOut(kTimeOutModeReadBack);
  phone.log().WriteLine(kLogRet, "DIAG_CONTROL_F -- post-runtime-mode-switch timeout is %d ms.",
                        static_cast<int>(total));
  if (phone.state<ftm::Settings>().command_code != kSubsystemDispatch) {
    // Handsets of the legacy FTM command cannot be asked for their mode.
    Pause(phone, total);
    phone.log().WriteLine(
        kLogRet,
        "DIAG_CONTROL_F -- mode switching status polling skipped with FTM_COMMAND_59; did an extra sleep with %d ms",
        static_cast<int>(total));
    return sent;
  }
  return PollMode(phone, mode, total);
}

}  // namespace

bool GetPhoneOperatingMode(Diag_FTM& phone, uint32_t& state) {
  if (phone.target_type() == kTargetApplication) {
    phone.log().WriteLine(kLogRet,
                          "GetPhoneOperatingMode() is not supported in ZTD target. "
                          "Use 0x4B, 0x32, 0x3, 0x0 to check diag service");
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "an application processor cannot be asked for its operating mode"));
  }
  if (!Send(phone, kOperatingMode)) return false;
  return phone.packet().ResponseAt32(operating_mode_reply::kState, state) || Fail(BadReply(phone, "has no mode"));
}

bool ControlMode(Diag_FTM& phone, uint16_t mode) {
  const uint16_t sent_mode = mode & 15;
  phone.log().WriteLine(kLogFn, "KRAL_DIAG_CONTROL_F(eMode=%d)", sent_mode);
  // Not the last word: a handset may switch without answering, so the read-back decides where there is one.
  const Reply reply = Send(phone, kModeControl, sent_mode);
  const bool sent = static_cast<bool>(reply);
  // Whoever is plugged in next was not told to switch: its mode says nothing.
  if (reply.kind() == ReplyKind::kGone && IsReadBack(sent_mode)) return false;
  // A silent handset may have switched: then the read-back says what came of it. Any other failure is the reason.
  std::optional<KeepFailure> reason;
  if (!sent && reply.kind() != ReplyKind::kNone) reason.emplace();

  switch (sent_mode) {
    case kModeFactoryTest:
      WaitAfterSwitch(phone, kFtmDelay);
      return ReadBack(phone, mode, sent);
    case kModeOnline:
      WaitAfterSwitch(phone, kOnlineDelay);
      return ReadBack(phone, mode, sent);
    case kModeOfflineAnalog:
    case kModeOfflineDigital:
      WaitAfterSwitch(phone, kOfflineDelay);
      return ReadBack(phone, mode, sent);
    case kModeLowPower:
      phone.log().WriteLine(kLogRet,
                            "KRAL_DIAG_CONTROL_F() -- enabling phone mode read back flag for LPM, please make sure "
                            "VARN_Timeout_Runtime_Mode_Switching is configured long enough.");
      return ReadBack(phone, mode, sent);
    default:
      phone.log().WriteLine(kLogRet, "DIAG_CONTROL_F -- no mode read back for eMode = %d", sent_mode);
      return sent;
  }
}

}  // namespace kral::diag
