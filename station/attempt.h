// What a phone object is set to while a job works on it, and set back from afterwards.
#ifndef KRAL_STATION_ATTEMPT_H
#define KRAL_STATION_ATTEMPT_H

#include <atomic>
#include <cstdint>

#include "kral/download.h"
#include "kral/pkv.h"
#include "station/handset_worker.h"

namespace kral::station {

// Under the request lock, for as long as it lives: the progress of downloads and backups goes to the handset of the
// job, and its stop ends every wait.
class HandsetWorker::Attempt {
 public:
  Attempt(Diag_FTM& phone, JobHandset& handset, uint32_t command_ms);
  ~Attempt();
  Attempt(const Attempt&) = delete;
  Attempt& operator=(const Attempt&) = delete;

 private:
  static void KRAL_CALL OnBytes(KRAL_HANDLE handle, uint32_t done, uint32_t total, uintptr_t value);
  static uint8_t KRAL_CALL OnItem(const KRAL_PKV_ITEM* item, const char* path, uint32_t done, uint32_t total,
                                  KRAL_HANDLE handle);

  Diag_FTM& phone_;
  const Diag_FTM::Resynchronising resynchronising_;
  const KRAL_PKV_CALLBACK item_callback_;
  const uint32_t command_ms_;  // of the job; 0: the handset's own
  const uint32_t handsets_command_ms_;
  const std::atomic<bool>* const abort_;
};

}  // namespace kral::station

#endif
