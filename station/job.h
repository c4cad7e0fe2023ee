// A job: steps and handsets, the threads that work on them, and what callers ask of it.
#ifndef KRAL_STATION_JOB_H
#define KRAL_STATION_JOB_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "base/worker_thread.h"
#include "kral/ventrims.h"
#include "station/job_handset.h"
#include "station/step.h"

namespace kral::station {

// For any thread. What gives false has noted its failure. Held by shared pointers: of the table, of calls under way,
// and of its threads.
class Job : public std::enable_shared_from_this<Job> {
 public:
  explicit Job(KRAL_VENTRIMS_JOB handle);
  Job(const Job&) = delete;
  Job& operator=(const Job&) = delete;

  // --- Setting it up, before the start ---
  bool SetOptions(const KRAL_VENTRIMS_OPTIONS& options);
  KRAL_VENTRIMS_OPTIONS options() const;
  bool AddStep(Step step);
  bool AddPort(uint32_t port, uint32_t* handset);
  bool AddHandle(KRAL_HANDLE handle, uint32_t* handset);
  bool SetCallback(KRAL_VENTRIMS_CALLBACK callback, uintptr_t value);

  // --- Running it ---
  bool Start();
  bool Abort(uint32_t handset);
  bool Wait(uint32_t time_out_ms);
  // Aborts it and waits for its threads.
  void Close();
  // Whether this thread is in a callback of the job.
  bool IsCalling() const;

  // --- Looking at it ---
  KRAL_VENTRIMS_STATE state() const;
  std::shared_ptr<JobHandset> handset(uint32_t number) const;  // null, with the failure noted
  bool StepName(uint32_t step, std::string& name) const;

 private:
  using Handsets = std::vector<std::shared_ptr<JobHandset>>;

  bool IsNewLocked() const KRAL_REQUIRES(mutex_);
  bool AddLocked(KRAL_HANDLE handle, bool own_port, uint32_t* handset) KRAL_REQUIRES(mutex_);
  bool TakeUp();
  bool LookAtFiles();
  bool OpenPorts();
  bool Claim();
  void Unclaim();
  bool StartThreads();
  void Work();
  void WorkOn(JobHandset& handset);
  void EndOfThread();
  bool AwaitSettled();
  bool AwaitThreads();
  void Tell(uint32_t handset) const;

  const KRAL_VENTRIMS_JOB handle_;
  std::atomic<bool> stop_{false};  // while it starts

  // The state, and before the start what follows it.
  mutable Mutex mutex_;
  Condition changed_;
  uint32_t state_ KRAL_GUARDED_BY(mutex_) = KRAL_VENTRIMS_NEW;
  uint32_t threads_ KRAL_GUARDED_BY(mutex_) = 0;  // that have not ended
  uint32_t started_ KRAL_GUARDED_BY(mutex_) = 0;  // ticks
  uint32_t ended_ KRAL_GUARDED_BY(mutex_) = 0;

  // From the start on these are only read, by any thread.
  KRAL_VENTRIMS_OPTIONS options_;
  std::vector<Step> steps_;
  Handsets handsets_;
  KRAL_VENTRIMS_CALLBACK callback_ = nullptr;
  uintptr_t callback_value_ = 0;
  Plan plan_;

  std::atomic<size_t> next_{0};                         // handset without a thread
  std::vector<std::unique_ptr<WorkerThread>> workers_;  // of the thread that starts or frees the job
};

}  // namespace kral::station

#endif
