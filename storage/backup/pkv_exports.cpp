// Exports of PKV backups: name line, handle, operation.
#include "base/outputs.h"
#include "base/text_argument.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"
#include "kral/pkv.h"
#include "storage/backup/pkv_jobs.h"

namespace backup = kral::backup;
using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::TextOrEmpty;

namespace {

template <uint32_t (*kJob)(Diag_FTM& phone, const std::string& path)>
bool Run(Diag_FTM& phone, const char* file, uint32_t* status) {
  const std::string path = TextOrEmpty(file);
  return backup::Run(
      phone, path, [&] { return kJob(phone, path); }, status);
}

bool SetCallback(Diag_FTM& phone, KRAL_PKV_CALLBACK callback) {
  phone.state<backup::Settings>().callback = callback;
  return true;
}

bool GetCounts(Diag_FTM& phone, KRAL_PKV_COUNTS* counts) {
  kral::Put(counts, phone.state<backup::Settings>().counts);
  return true;
}

using ServerJob = bool (kral::SoftwareDownload::*)(const std::string& file, uint32_t options);

bool RunOnServer(Diag_FTM& phone, const char* name, ServerJob job, const char* file, uint32_t options) {
  const auto server = kral::Kral_ResourceManager::GetSoftwareDownload(phone.handle());
  if (server && ((*server).*job)(TextOrEmpty(file), options)) return true;
  phone.log().WriteLine(kral::kLogErr, "%s() - %s", name, server ? "the download agent failed" : "no phone server");
  return server ? Fail(Failure(KRAL_ERROR_REFUSED, "the phone server's download agent failed"))
                : Fail(Failure(KRAL_ERROR_ARGUMENT, "only a phone server can do this, and the connection has none"));
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_PKV_ConfigureCallBack(KRAL_HANDLE handle, KRAL_PKV_CALLBACK callback) {
  return ExportCall(handle, __func__).RunAtOnce(SetCallback, callback);
}

uint8_t KRAL_CALL KRAL_PKV_ConfigureBackup(KRAL_HANDLE handle, uint16_t first_item, uint16_t last_item,
                                           uint16_t subscriptions) {
  return ExportCall(handle, __func__).Run(backup::ConfigureBackup, first_item, last_item, subscriptions);
}

uint8_t KRAL_CALL KRAL_PKV_GetCounts(KRAL_HANDLE handle, KRAL_PKV_COUNTS* counts) {
  return ExportCall(handle, __func__).Run(GetCounts, counts);
}

uint8_t KRAL_CALL KRAL_BackupNVFromMobileToPKV(KRAL_HANDLE handle, const char* file, uint32_t* status) {
  // The line deliberately does not show the function's own name.
  return ExportCall(handle, __func__).Named("KRAL_NV_BackupNVFromMobile").Run(Run<&backup::Backup>, file, status);
}

uint8_t KRAL_CALL KRAL_RestoreNVFromPKV(KRAL_HANDLE handle, const char* file, uint32_t* status) {
  return ExportCall(handle, __func__).Run(Run<&backup::Restore>, file, status);
}

uint8_t KRAL_CALL KRAL_PKV_Verify(KRAL_HANDLE handle, const char* file, uint32_t* status) {
  return ExportCall(handle, __func__).Run(Run<&backup::Verify>, file, status);
}

uint8_t KRAL_CALL KRAL_UploadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options) {
  return ExportCall(handle, __func__).Run(RunOnServer, __func__, &kral::SoftwareDownload::UploadPkvFile, file, options);
}

uint8_t KRAL_CALL KRAL_DownloadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options) {
  return ExportCall(handle, __func__)
      .Run(RunOnServer, __func__, &kral::SoftwareDownload::DownloadPkvFile, file, options);
}

}  // extern "C"
