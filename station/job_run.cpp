// Starts a job, and runs its threads: each takes the next handset that waits until there are none left.
#include <algorithm>
#include <chrono>
#include <mutex>

#include "base/at_exit.h"
#include "base/failure.h"
#include "base/guarded_call.h"
#include "frame/phone_claim.h"
#include "frame/request_failure.h"
#include "station/handset_worker.h"
#include "station/job.h"
#include "station/job_files.h"
#include "station/job_plan.h"
#include "storage/efs/efs_client.h"

namespace kral::station {
namespace {

constexpr std::chrono::milliseconds kClosing{15000};

// The job in whose callback this thread is.
thread_local const Job* calling = nullptr;

bool Aborted() {
  return Fail(Failure(KRAL_ERROR_ABORTED, "the job was aborted while it was started"));
}

bool OpenPort(JobHandset& handset, bool boot_loader) {
  Diag_FTM& phone = handset.phone();
  const std::lock_guard lock(phone.request_lock());
  if (handset.own_port() && !phone.connected()) {
    phone.SetReceiveMode(ReceiveMode::kWakeOnData);
    efs::SetAutomaticPacketSizes(phone, true);
  }
  const bool open = boot_loader ? phone.BorrowPort() != nullptr : phone.IsPortOpen();
  return open || Fail(PortFailure(phone));
}

void GiveBackPorts(const std::vector<std::shared_ptr<JobHandset>>& handsets) {
  for (const auto& handset : handsets) {
    const std::lock_guard lock(handset->phone().request_lock());
    handset->phone().GiveBackPort();
  }
}

}  // namespace

bool Job::Start() {
  if (!TakeUp()) return false;
  bool running = false;
  const AtExit settle([&] {  // also where there is no memory
    if (running) return;
    Unclaim();
    const MutexLock lock(mutex_);
    state_ = KRAL_VENTRIMS_NEW;
    plan_.clear();
    stop_ = false;
    changed_.NotifyAll();
  });
  running = LookAtFiles() && Claim() && OpenPorts() && StartThreads();
  return running;
}

// From here on nobody changes what the job is made of.
bool Job::TakeUp() {
  const MutexLock lock(mutex_);
  if (state_ != KRAL_VENTRIMS_NEW) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job has been started already"));
  if (handsets_.empty()) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job has no handsets"));
  auto plan = MakePlan(steps_, options_.flags);
  if (!plan) return false;
  plan_ = std::move(*plan);
  state_ = KRAL_VENTRIMS_STARTING;
  stop_ = false;
  return true;
}

bool Job::LookAtFiles() {
  JobFiles files;
  uint64_t bytes = 0;
  for (Step& step : plan_) {
    if (stop_) return Aborted();
    if (!files.Open(step)) return false;
    bytes += step.bytes;
  }
  for (uint32_t i = 0; i < handsets_.size(); ++i) handsets_[i]->Prepare(bytes, [this, i] { Tell(i); });
  return true;
}

bool Job::Claim() {
  for (const auto& handset : handsets_) {
    uint32_t nobody = 0;
    if (handset->phone().state<PhoneClaim>().job.compare_exchange_strong(nobody, handle_)) continue;
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "COM%d is worked on by another job", handset->phone().port()));
  }
  return true;
}

void Job::Unclaim() {
  for (const auto& handset : handsets_) {
    uint32_t own = handle_;
    handset->phone().state<PhoneClaim>().job.compare_exchange_strong(own, 0);
  }
}

bool Job::OpenPorts() {
  const bool boot_loader = BeginsInBootLoader(plan_);
  for (const auto& handset : handsets_) {
    if (!stop_ && OpenPort(*handset, boot_loader)) continue;
    const KeepFailure keep;
    if (boot_loader) GiveBackPorts(handsets_);
    return stop_ ? Aborted() : false;
  }
  return true;
}

bool Job::StartThreads() {
  const size_t wanted = options_.at_once == 0 ? handsets_.size() : std::min<size_t>(options_.at_once, handsets_.size());
  workers_.clear();
  workers_.reserve(wanted);
  next_ = 0;
  // Under the lock the threads wait for the end of this: no callback comes before the job runs.
  const MutexLock lock(mutex_);
  if (stop_) return Aborted();
  for (size_t i = 0; i < wanted; ++i) {
    workers_.push_back(std::make_unique<WorkerThread>());
    if (!workers_.back()->Start([this] { Work(); }, shared_from_this())) {
      workers_.pop_back();
      break;
    }
    ++threads_;
  }
  if (threads_ == 0) return Fail(Failure(KRAL_ERROR_INTERNAL, "there is no thread for the job"));
  state_ = KRAL_VENTRIMS_RUNNING;
  started_ = SystemClock().TickMs();
  return true;
}

void Job::Work() {
  const AtExit end([this] { EndOfThread(); });
  { const MutexLock lock(mutex_); }
  for (size_t i = next_++; i < handsets_.size(); i = next_++) WorkOn(*handsets_[i]);
}

void Job::WorkOn(JobHandset& handset) {
  // Whatever ends the work, its callback ending the thread included, the handset gets a verdict.
  const AtExit judge([&] {
    handset.FailWith(Failure(KRAL_ERROR_INTERNAL, "the thread that worked on it was ended").record());
    const std::lock_guard lock(handset.phone().request_lock());
    handset.phone().GiveBackPort();
  });
  try {
    HandsetWorker(handset, plan_, options_).Run();
  } catch (const std::exception& exception) {
    handset.FailWith(Failure(KRAL_ERROR_INTERNAL, "%s", exception.what()).record());
  }
}

// The last one leaves no handset without a verdict, whatever became of the others.
void Job::EndOfThread() {
  bool last = false;
  {
    const MutexLock lock(mutex_);
    last = threads_ == 1;
    if (!last) --threads_;
  }
  if (!last) return changed_.NotifyAll();
  const Failure left(KRAL_ERROR_INTERNAL, "no thread was left to work on it");
  for (const auto& handset : handsets_) handset->FailWith(left.record());
  const MutexLock lock(mutex_);
  threads_ = 0;
  state_ = KRAL_VENTRIMS_ENDED;
  ended_ = SystemClock().TickMs();
  changed_.NotifyAll();
}

void Job::Tell(uint32_t handset) const {
  KRAL_VENTRIMS_CALLBACK const callback = callback_;
  if (callback == nullptr) return;
  const Job* const outer = std::exchange(calling, this);
  const AtExit back([outer] { calling = outer; });
  CallGuarded([&] { callback(handle_, handset, callback_value_); });
}

bool Job::IsCalling() const {
  return calling == this;
}

bool Job::Abort(uint32_t handset) {
  const bool all = handset == KRAL_VENTRIMS_ALL;
  Handsets chosen;
  {
    const MutexLock lock(mutex_);
    if (!all && handset >= handsets_.size())
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no handset %u in the job", handset));
    if (state_ == KRAL_VENTRIMS_NEW) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job has not been started"));
    if (state_ == KRAL_VENTRIMS_STARTING) {
      if (!all) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job is only just being started"));
      stop_ = true;
      return true;
    }
    chosen = all ? handsets_ : Handsets{handsets_[handset]};
  }
  for (const auto& one : chosen) one->Abort();
  return true;
}

bool Job::Wait(uint32_t time_out_ms) {
  MutexLock lock(mutex_);
  if (state_ == KRAL_VENTRIMS_NEW) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job has not been started"));
  // A start that fails leads back to a new job.
  changed_.WaitFor(lock, std::chrono::milliseconds(time_out_ms), [this]() KRAL_REQUIRES(mutex_) {
    return state_ == KRAL_VENTRIMS_ENDED || state_ == KRAL_VENTRIMS_NEW;
  });
  return state_ == KRAL_VENTRIMS_ENDED;
}

void Job::Close() {
  if (!AwaitSettled() || workers_.empty()) return;
  for (const auto& handset : handsets_) handset->Abort();
  if (!AwaitThreads()) return;  // they end on their own, and keep the job until then
  for (const auto& worker : workers_) worker->Join();
}

// Nothing is being started any more, and nothing will be. False when a start does not come to an end.
bool Job::AwaitSettled() {
  MutexLock lock(mutex_);
  stop_ = true;
  const bool settled =
      changed_.WaitFor(lock, kClosing, [this]() KRAL_REQUIRES(mutex_) { return state_ != KRAL_VENTRIMS_STARTING; });
  if (state_ == KRAL_VENTRIMS_NEW) state_ = KRAL_VENTRIMS_ENDED;
  return settled;
}

bool Job::AwaitThreads() {
  MutexLock lock(mutex_);
  return changed_.WaitFor(lock, kClosing, [this]() KRAL_REQUIRES(mutex_) { return threads_ == 0; });
}

}  // namespace kral::station
