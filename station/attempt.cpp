// Sets a phone object up for a job's work and back. The time-out is set back only where it is still the job's.
#include "station/attempt.h"

#include "download/link/download_settings.h"
#include "storage/backup/pkv_jobs.h"

namespace kral::station {
namespace {

// The backup's callback has no value to tell by whose it is: it comes on the thread of the work.
thread_local JobHandset* worked_on = nullptr;

download::Settings& DownloadOf(Diag_FTM& phone) {
  return phone.state<download::Settings>();
}

backup::Settings& BackupOf(Diag_FTM& phone) {
  return phone.state<backup::Settings>();
}

}  // namespace

HandsetWorker::Attempt::Attempt(Diag_FTM& phone, JobHandset& handset, uint32_t command_ms)
    : phone_(phone),
      resynchronising_(phone),
      item_callback_(BackupOf(phone).callback),
      command_ms_(command_ms),
      handsets_command_ms_(phone.TimeOut(kTimeOutDefaultCommand)),
      abort_(phone.transport().SetAbort(&handset.stop())) {
  worked_on = &handset;
  download::Settings& download = DownloadOf(phone);
  download.abort = false;  // the handset's stop is looked at after this
  download.keep_abort = true;
  download.part_value = reinterpret_cast<uintptr_t>(&handset);
  download.part_callback = &Attempt::OnBytes;
  BackupOf(phone).callback = &Attempt::OnItem;
  if (command_ms != 0) phone.ConfigureTimeOut(kTimeOutDefaultCommand, static_cast<int32_t>(command_ms));
}

HandsetWorker::Attempt::~Attempt() {
  if (command_ms_ != 0 && phone_.TimeOut(kTimeOutDefaultCommand) == command_ms_)
    phone_.ConfigureTimeOut(kTimeOutDefaultCommand, static_cast<int32_t>(handsets_command_ms_));
  BackupOf(phone_).callback = item_callback_;
  download::Settings& download = DownloadOf(phone_);
  download.part_callback = nullptr;
  download.keep_abort = false;
  phone_.transport().SetAbort(abort_);
  worked_on = nullptr;
}

void HandsetWorker::Attempt::OnBytes(KRAL_HANDLE, uint32_t done, uint32_t total, uintptr_t value) {
  reinterpret_cast<JobHandset*>(value)->Report(done, total);
}

uint8_t HandsetWorker::Attempt::OnItem(const KRAL_PKV_ITEM*, const char*, uint32_t done, uint32_t total, KRAL_HANDLE) {
  if (worked_on == nullptr) return 0;
  worked_on->Report(done, total);
  return worked_on->stop() ? 0 : 1;
}

}  // namespace kral::station
