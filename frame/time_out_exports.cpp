// Exports of the time-outs: those of the phone object, and the one that the software download object keeps.
#include "base/time_outs.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "kral/connection.h"

namespace {

bool IsOfPhone(uint32_t id) {
  return id < kral::kTimeOutCount;
}

bool BadId(uint32_t id) {
  return kral::Fail(kral::Failure(KRAL_ERROR_ARGUMENT, "the time-out id %u is not one of 0 to 20", id));
}

bool Configure(kral::Diag_FTM& phone, uint32_t id, int32_t milliseconds) {
  if (IsOfPhone(id)) return phone.ConfigureTimeOut(id, milliseconds);
  if (id != kral::kTimeOutSoftwareDownload) return BadId(id);
  const auto download = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  if (download && download->ConfigureTimeOut(id, milliseconds)) return true;
  return kral::Fail(kral::Failure(KRAL_ERROR_ARGUMENT, "time-out %u is the phone server's, and there is none", id));
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
  return kral::ExportCall(handle, __func__)
      .Logged("( eTimeOutId = %d, iNewValue_ms = %d )", static_cast<int>(id), milliseconds)
      .RunAtOnce(Configure, id, milliseconds);
}

int32_t KRAL_CALL KRAL_GetTimeOut(KRAL_HANDLE handle, uint32_t id) {
  int32_t milliseconds = 0;
  kral::ExportCall(handle, __func__).RunAtOnce([&](kral::Diag_FTM& phone) {
    milliseconds = Get(phone, id);
    return IsOfPhone(id) || id == kral::kTimeOutSoftwareDownload || BadId(id);
  });
  return milliseconds;
}

}  // extern "C"
