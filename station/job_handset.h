// One handset of a job: what is known of it and how far it has come. The work itself is the HandsetWorker's.
#ifndef KRAL_STATION_JOB_HANDSET_H
#define KRAL_STATION_JOB_HANDSET_H

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "base/mutex.h"
#include "frame/diag_ftm.h"
#include "kral/ventrims.h"
#include "station/step.h"

namespace kral::station {

// For any thread.
class JobHandset {
 public:
  // Holds a use of the handle, for as long as it lives. `own_port`: the handle was made for the job's sake.
  JobHandset(KRAL_HANDLE handle, std::shared_ptr<Diag_FTM> phone, bool own_port);
  ~JobHandset();
  JobHandset(const JobHandset&) = delete;
  JobHandset& operator=(const JobHandset&) = delete;

  KRAL_HANDLE handle() const { return handle_; }
  Diag_FTM& phone() const { return *phone_; }
  bool own_port() const { return own_port_; }

  // --- The caller ---
  void Abort();
  const std::atomic<bool>& stop() const { return stop_; }
  bool ended() const;
  KRAL_VENTRIMS_PROGRESS progress() const;
  KRAL_VENTRIMS_RESULT result() const;

  // --- The job, and the thread that works on it. Each change is told to `changed`, without a lock held. ---
  // Before the start. `changed` is told for bytes at most ten times a second.
  void Prepare(uint64_t bytes_total, std::function<void()> changed);
  bool Begin();  // false for one that was aborted while it waited
  void BeginStep(uint32_t number, const Step& step);
  void Report(uint32_t done, uint32_t total);
  void EndStep();  // what it moved counts from now on
  void BeginReturn();
  void EndReturn();  // one attempt more
  void SetIdentity(const std::string& model, const std::string& revision, const std::string& serial);
  // The first of these counts. A failure of one that was aborted is the abort.
  void Pass();
  void FailWith(const KRAL_ERROR& error);

 private:
  void End(uint32_t state, const KRAL_ERROR* error);
  void EndLocked(uint32_t state, const KRAL_ERROR* error) KRAL_REQUIRES(mutex_);
  bool ended_locked() const KRAL_REQUIRES(mutex_) { return record_.state >= KRAL_VENTRIMS_PASSED; }
  void Tell() const;

  const KRAL_HANDLE handle_;
  const std::shared_ptr<Diag_FTM> phone_;
  const bool own_port_;
  std::function<void()> changed_;
  std::atomic<bool> stop_{false};

  mutable Mutex mutex_;  // for the moment of a copy
  KRAL_VENTRIMS_PROGRESS record_ KRAL_GUARDED_BY(mutex_){};
  KRAL_ERROR error_ KRAL_GUARDED_BY(mutex_){};
  uint64_t bytes_before_ KRAL_GUARDED_BY(mutex_) = 0;  // of the steps that are done
  bool counts_bytes_ KRAL_GUARDED_BY(mutex_) = false;  // the present step
  uint32_t began_ KRAL_GUARDED_BY(mutex_) = 0;
  uint32_t told_ KRAL_GUARDED_BY(mutex_) = 0;
};

}  // namespace kral::station

#endif
