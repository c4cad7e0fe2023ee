// FTM settings of a handset, RF mode and channel, and the way into and out of factory test mode.
#include "commands/ftm/ftm_mode.h"

#include <array>

#include "base/outputs.h"
#include "commands/core/core_diag.h"
#include "commands/ftm/ftm_frame.h"
#include "commands/nv/nv_item.h"
#include "frame/diag_ftm.h"

namespace kral::ftm {
namespace {

// NV item: the handset boots into factory test mode when its first byte is not 0.
constexpr u16 kBootFlagItem = 453;

// What an application-processor target is reported as, from the check of its diagnostic service.
constexpr u32 kServiceAlive = 12;
constexpr u32 kServiceSilent = 13;

bool IsGsmMode(u16 rf_mode) {
  return (rf_mode >= 10 && rf_mode <= 12) || rf_mode == 18;
}

void WaitAfterGsmMode(Diag_FTM& phone) {
  const u32 milliseconds = phone.TimeOut(kTimeOutGsmRfModeDelay);
  if (milliseconds == 0) {
    phone.log().WriteLine(kLogRet, "KRAL_FTM_SET_MODE() -- GSM RF Mode set delay is zero.");
    return;
  }
  phone.log().WriteLine(kLogRet, "KRAL_FTM_SET_MODE() -- GSM RF Mode set  delay is %dms.",
                        static_cast<int>(milliseconds));
  phone.clock().SleepMs(milliseconds);
}

bool QueryOperatingMode(Diag_FTM& phone, u32& state) {
  if (phone.target_type() != kTargetApplication) return diag::GetPhoneOperatingMode(phone, state);
  diag::GetPhoneOperatingMode(phone, state);  // only says in the log that there is no such query
  const bool alive = phone.IsDiagServiceAlive();
  state = alive ? kServiceAlive : kServiceSilent;
  return alive;  // of a silent service nobody knows the mode
}

bool ReadBootFlag(Diag_FTM& phone, bool& is_ftm) {
  std::array<u8, nv::kDataSize> data{};
  u16 status = 0;
  if (!nv::Read(phone, kBootFlagItem, data, status)) return false;
  if (status != nv::kDone) {
    phone.log().WriteLine(kLogErr, "KRAL_IsFTM_Mode() - Failed to read NV FTM mode");
    return Fail(nv::Refusal(kBootFlagItem, status));
  }
  is_ftm = data[0] != 0;
  return true;
}

}  // namespace

bool SetModeId(Diag_FTM& phone, uint16_t mode_id) {
  phone.state<Settings>().mode_id = mode_id;
  BeginHeader(phone);
  return true;
}

bool GetModeId(Diag_FTM& phone, uint16_t* mode_id) {
  Put(mode_id, static_cast<u16>(phone.state<Settings>().mode_id));
  return true;
}

bool SetCommandCode(Diag_FTM& phone, uint16_t code) {
  if (code != kCommandCode59 && code != kCommandCode75) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the command code %d is neither 59 nor 75", code));
  }
  phone.state<Settings>().command_code = code;
  return true;
}

bool GetCommandCode(Diag_FTM& phone, uint16_t* code) {
  Put(code, static_cast<u16>(phone.state<Settings>().command_code));
  return true;
}

bool ChooseModeId(Diag_FTM& phone, uint16_t rf_mode) {
  Settings& settings = phone.state<Settings>();
  settings.last_rf_mode = rf_mode;  // also when the mode is refused below
  const auto mode_id = ModeIdForRfMode(rf_mode, settings.mode_id);
  if (!mode_id) {
    phone.log().WriteLine(kLogErr, "KRAL_FTM_SET_MODE() -- RF mode %d has no mode id", rf_mode);
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the RF mode %d is not one of the listed modes, 2 to 92", rf_mode));
  }
  settings.mode_id = *mode_id;
  return true;
}

void WaitAfterMode(Diag_FTM& phone, uint16_t rf_mode) {
  if (IsGsmMode(rf_mode)) WaitAfterGsmMode(phone);
}

bool SetMode(Diag_FTM& phone, uint16_t rf_mode) {
  phone.packet().Reset();
  if (!ChooseModeId(phone, rf_mode)) return false;
  const bool sent = static_cast<bool>(Send(phone, kSetMode, rf_mode));
  WaitAfterMode(phone, rf_mode);
  return sent;
}

Reply SetChannel(Diag_FTM& phone, uint16_t channel) {
  return Send(phone, kSetChannel, channel);
}

Reply SetTxOn(Diag_FTM& phone) {
  phone.log().WriteLine(kLogFn, "KRAL_FTM_SET_TX_ON()");
  return Send(phone, kSetTxOn);
}

Reply SetTxOff(Diag_FTM& phone) {
  phone.log().WriteLine(kLogFn, "KRAL_FTM_SET_TX_OFF()");
  return Send(phone, kSetTxOff);
}

bool QueryFtm(Diag_FTM& phone, bool& is_ftm) {
  phone.log().WriteLine(kLogFn, "KRAL_IsFTM_Mode()");
  const uint32_t command_code = phone.state<Settings>().command_code;
  switch (command_code) {
    case kCommandCode75: {
      u32 state = 0;
      if (!QueryOperatingMode(phone, state)) return false;
      is_ftm = state == diag::kStateFactoryTest;
      phone.log().WriteLine(kLogRet, "KRAL_IsFTM_Mode(pbIsFTMMode=%d)", is_ftm);
      return true;
    }
    case kCommandCode59:
      return ReadBootFlag(phone, is_ftm);
    default:
      phone.log().WriteLine(kLogErr, "KRAL_IsFTM_Mode() - Invalid Command Mode");
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "the command code %u is neither 59 nor 75", command_code));
  }
}

bool IsFtm(Diag_FTM& phone, uint8_t* is_ftm) {
  bool answer = false;
  if (!QueryFtm(phone, answer)) return false;
  Put(is_ftm, static_cast<u8>(answer));
  return true;
}

bool ChangeBootMode(Diag_FTM& phone, uint8_t ftm, uint8_t reset) {
  if (!diag::ControlMode(phone, diag::kModeOfflineDigital)) return false;
  u16 status = 0;
  const std::array<u8, 1> flag{ftm};
  const bool written{nv::Write(phone, kBootFlagItem, flag, status)};
  if (written && status != nv::kDone) {
    phone.log().WriteLine(kLogErr, "KRAL_ChangeFTM_BootMode() - Failed to write NV FTM mode");
    return Fail(nv::Refusal(kBootFlagItem, status));
  }
  const KeepFailure keep;
  if (reset != 0) diag::ControlMode(phone, diag::kModeReset);  // a handset that resets need not answer
  return written;
}

bool ChangeModeRuntime(Diag_FTM& phone, uint8_t ftm) {
  if (phone.state<Settings>().command_code != kCommandCode75) {
    phone.log().WriteLine(kLogErr, "KRAL_ChangeFTM_ModeRuntime: Failed: Does not support non FTM_COMMAND_75 mode");
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the mode can be changed with command code 75 only"));
  }
  bool is_ftm = false;
  if (!QueryFtm(phone, is_ftm)) return false;
  if (is_ftm == (ftm != 0)) return true;
  return diag::ControlMode(phone, ftm != 0 ? diag::kModeFactoryTest : diag::kModeOnline);
}

}  // namespace kral::ftm
