// Exports of the time-outs: those of the phone object, and the one that the software download object keeps.
#include "frame/base/time_outs.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "kral/connection.h"

namespace {

bool IsOfPhone(uint32_t id) {
  return id < kral::kTimeOutCount;
}

bool Configure(kral::Diag_FTM& phone, uint32_t id, int32_t milliseconds) {
  if (IsOfPhone(id)) return phone.ConfigureTimeOut(id, milliseconds);
  if (id != kral::kTimeOutSoftwareDownload) return false;
  const auto download = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  return download && download->ConfigureTimeOut(id, milliseconds);
}

int32_t Get(kral::Diag_FTM& phone, uint32_t id) {
  if (IsOfPhone(id)) return phone.GetTimeOut(id);
  if (id != kral::kTimeOutSoftwareDownload) return 0;
  const auto download = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  return download ? download->GetTimeOut(id) : 0;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_ConfigureTimeOut(KRAL_HANDLE handle, uint32_t id, int32_t milliseconds) {
  kral::LogFormatted(handle, "KRAL_ConfigureTimeOut( eTimeOutId = %d, iNewValue_ms = %d )", static_cast<int>(id),
                     milliseconds);
  return kral::OnPhoneAtOnce(handle, Configure, id, milliseconds);
}

int32_t KRAL_CALL KRAL_GetTimeOut(KRAL_HANDLE handle, uint32_t id) {
  kral::LogName(handle, "KRAL_GetTimeOut");
  int32_t milliseconds = 0;
  kral::OnPhoneAtOnce(handle, [&](kral::Diag_FTM& phone) {
    milliseconds = Get(phone, id);
    return true;
  });
  return milliseconds;
}

}  // extern "C"
