// Exports of PKV backups: name line, handle, operation.
#include "base/at_exit.h"
#include "base/outputs.h"
#include "base/text_argument.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"
#include "kral/pkv.h"
#include "storage/backup/pkv_jobs.h"

namespace backup = kral::backup;
using kral::AtExit;
using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::TextOrEmpty;

namespace {

using Job = uint32_t (*)(Diag_FTM& phone, const std::string& path);

// What a job as a whole came to. What was noted before may be something that it got over.
Failure Judgement(uint32_t status, const char* file, const KRAL_PKV_COUNTS& counts) {
  switch (status) {
    case KRAL_PKV_STATUS_INCOMPLETE:
      return Failure(KRAL_ERROR_REFUSED, "%s lacks %u of %u items and files, which the handset refused", file,
                     counts.refused, counts.total);
    case KRAL_PKV_STATUS_NOTHING_READ:
      return Failure(KRAL_ERROR_REFUSED, "the handset gave nothing for %s: %u of %u items and files were refused", file,
                     counts.refused, counts.total);
    case KRAL_PKV_STATUS_NOT_WRITTEN:
      return Failure(counts.refused != 0 ? KRAL_ERROR_REFUSED : KRAL_ERROR_MISMATCH,
                     "of %s the handset refused %u of %u items and files, and %u read back otherwise", file,
                     counts.refused, counts.total, counts.different + counts.not_read_back);
    case KRAL_PKV_STATUS_DIFFERENT:
      return Failure(KRAL_ERROR_MISMATCH, "%u of %u items and files of %s differ on the handset, and %u were refused",
                     counts.different, counts.total, file, counts.refused);
    case KRAL_PKV_STATUS_LOST:
      return Failure(KRAL_ERROR_LOST, "the handset stopped answering with %u of %u items and files not reached",
                     counts.not_reached, counts.total);
    case KRAL_PKV_STATUS_STOPPED:
      return Failure(KRAL_ERROR_ABORTED, "stopped by the caller with %u of %u items and files not reached",
                     counts.not_reached, counts.total);
    default:
      return Failure(KRAL_ERROR_BAD_FILE, "%s is damaged, or no PKV file", file);
  }
}

// Whether what was noted says more: of what fails at the file, whether or not the handset has answered, and of a
// handset that was not reached at all.
bool IsToldByWhatWasNoted(uint32_t status, const KRAL_PKV_COUNTS& counts) {
  return status == KRAL_PKV_STATUS_CANNOT_OPEN || status == KRAL_PKV_STATUS_NO_STORAGE ||
         status == KRAL_PKV_STATUS_BAD_ITEM || (status == KRAL_PKV_STATUS_NOTHING_READ && counts.done > 0) ||
         (status == KRAL_PKV_STATUS_LOST && counts.not_reached + counts.skipped == counts.total);
}

bool Run(Diag_FTM& phone, Job job, const char* file, uint32_t* status) {
  kral::Put(status, uint32_t{KRAL_PKV_STATUS_UNEXPECTED});
  backup::Settings& settings = phone.state<backup::Settings>();
  if (settings.running) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "a backup, restore or comparison is under way")
                    .Status(KRAL_ERROR_STATUS_RESULT, KRAL_PKV_STATUS_UNEXPECTED));
  }
  settings.running = true;
  const AtExit ended([&settings] { settings.running = false; });
  const uint32_t result = job(phone, TextOrEmpty(file));
  kral::Put(status, result);
  if (result == KRAL_PKV_STATUS_DONE) return true;
  if (kral::IsFailureNoted() && IsToldByWhatWasNoted(result, settings.counts)) return false;
  return Fail(Judgement(result, TextOrEmpty(file), settings.counts).Status(KRAL_ERROR_STATUS_RESULT, result));
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
  return ExportCall(handle, __func__).Named("KRAL_NV_BackupNVFromMobile").Run(Run, backup::Backup, file, status);
}

uint8_t KRAL_CALL KRAL_RestoreNVFromPKV(KRAL_HANDLE handle, const char* file, uint32_t* status) {
  return ExportCall(handle, __func__).Run(Run, backup::Restore, file, status);
}

uint8_t KRAL_CALL KRAL_PKV_Verify(KRAL_HANDLE handle, const char* file, uint32_t* status) {
  return ExportCall(handle, __func__).Run(Run, backup::Verify, file, status);
}

uint8_t KRAL_CALL KRAL_UploadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options) {
  return ExportCall(handle, __func__).Run(RunOnServer, __func__, &kral::SoftwareDownload::UploadPkvFile, file, options);
}

uint8_t KRAL_CALL KRAL_DownloadPkvFile(KRAL_HANDLE handle, const char* file, uint32_t options) {
  return ExportCall(handle, __func__)
      .Run(RunOnServer, __func__, &kral::SoftwareDownload::DownloadPkvFile, file, options);
}

}  // extern "C"
