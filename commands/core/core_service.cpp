// Service requests without a shape of their own: keys, switches, service code, error log, status records, download.
#include <algorithm>
#include <array>
#include <span>

#include "base/outputs.h"
#include "commands/core/core_diag.h"
#include "commands/core/core_diag_format.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"
#include "kral/connection.h"

namespace kral::diag {
namespace {

constexpr u8 kNvBackupSubsystem = 55;
constexpr u32 kTimeOutNvBackup = KRAL_TIME_OUT_NV_BACKUP;

void LogEntry(Diag_FTM& phone, const char* name) {
  phone.log().WriteLine(kLogFn, "%s()", name);
}

// Requests whose reply is handed to the caller as it came.
template <class Row>
bool ReadReply(Diag_FTM& phone, const char* name, const Row& row, uint16_t* size, uint8_t* reply) {
  LogEntry(phone, name);
  if (size == nullptr || reply == nullptr) {
    phone.log().WriteLine(kLogErr, "%s() -- no reply buffer", name);
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no buffer for the reply"));
  }
  if (!Send(phone, row)) return false;
  const auto response = phone.packet().response();
  const auto copied = static_cast<uint16_t>(std::min<size_t>(response.size(), *size));
  std::copy_n(response.begin(), copied, reply);
  *size = copied;
  return true;
}

}  // namespace

Reply PressKey(Diag_FTM& phone, uint8_t hold, uint8_t key) {
  LogEntry(phone, "KRAL_DIAG_HS_KEY_F");
  return Send(phone, kKeyPress, hold, key);
}

bool GetSwitches(Diag_FTM& phone, uint16_t* switches) {
  LogEntry(phone, "KRAL_DIAG_GET_DIPSW_F");
  if (!Send(phone, kGetSwitches)) return false;
  uint16_t word = 0;
  if (!phone.packet().ResponseAt16(1, word)) {
    phone.log().WriteLine(kLogErr, "KRAL_DIAG_GET_DIPSW_F() -- reply without a switch word");
    return Fail(BadReply(phone, "has no switch word"));
  }
  Put(switches, word);
  return true;
}

Reply SetSwitches(Diag_FTM& phone, uint16_t switches) {
  LogEntry(phone, "KRAL_DIAG_SET_DIPSW_F");
  return Send(phone, kSetSwitches, switches);
}

Reply EnterDownload(Diag_FTM& phone) {
  LogEntry(phone, "KRAL_DIAG_DLOAD_F");
  return Send(phone, kEnterDownload);
}

bool SendServiceCode(Diag_FTM& phone, const char* code, uint8_t* result) {
  if (code == nullptr) {
    phone.log().WriteLine(kLogErr, "KRAL_SPC() -- no service programming code");
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no service programming code"));
  }
  // The code goes to the log in clear, on purpose: a station's log must show what was tried.
  phone.log().WriteLine(kLogFn, "KRAL_SPC( iSPC[6] = %c%c%c%c%c%c)", code[0], code[1], code[2], code[3], code[4],
                        code[5]);
  std::array<uint8_t, 6> digits{};
  std::copy_n(code, digits.size(), digits.begin());
  if (!Send(phone, kServiceCode, digits)) return false;
  uint8_t accepted = 0;
  if (!phone.packet().Read8(accepted)) return Fail(BadReply(phone, "has no result"));
  Put(result, accepted);
  return true;
}

Reply FreezeSecurity(Diag_FTM& phone) {
  LogEntry(phone, "KRAL_DIAG_SECURITY_FREEZE_F");
  return Send(phone, kSecurityFreeze);
}

Reply BackUpNv(Diag_FTM& phone) {
  LogEntry(phone, "KRAL_DIAG_NV_CNV_DIAG_BACKUP_F");
  return SendWithin(phone, kTimeOutNvBackup, kNvBackup, kNvBackupSubsystem, u16{0});
}

Reply ClearErrorRecord(Diag_FTM& phone, uint8_t record) {
  LogEntry(phone, "KRAL_DIAG_ERR_CLEAR_F");
  return Send(phone, kErrorLogClear, record);
}

bool ReadErrorLog(Diag_FTM& phone, uint16_t* size, uint8_t* reply) {
  return ReadReply(phone, "KRAL_DIAG_ERR_READ_F", kErrorLogRead, size, reply);
}

bool ReadStatus(Diag_FTM& phone, uint16_t* size, uint8_t* reply) {
  return ReadReply(phone, "KRAL_DIAG_STATUS_F", kStatus, size, reply);
}

bool ReadIs2000Status(Diag_FTM& phone, uint16_t* size, uint8_t* reply) {
  return ReadReply(phone, "KRAL_DIAG_IS2000_STATUS_F", kIs2000Status, size, reply);
}

bool RefuseGsmCallControl(Diag_FTM& phone, const char* name) {
  LogEntry(phone, name);
  phone.log().WriteLine(kLogErr, "%s() -- no request is defined for this function", name);
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "no request is defined for %s", name));
}

}  // namespace kral::diag
