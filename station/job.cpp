// Sets a job up and answers what is asked about it. Its start and its threads are in job_run.cpp.
#include "station/job.h"

#include <algorithm>

#include "base/failure.h"
#include "frame/export_call.h"
#include "frame/resource_manager.h"
#include "station/job_plan.h"

namespace kral::station {
namespace {

constexpr uint32_t kFlags = KRAL_VENTRIMS_ENTER_LOADER | KRAL_VENTRIMS_RESET;
constexpr uint32_t kMostRetries = 100;
constexpr uint32_t kLongestMs = 3600000;
constexpr uint32_t kLastPort = 255;

KRAL_VENTRIMS_OPTIONS DefaultOptions() {
  return {.size = sizeof(KRAL_VENTRIMS_OPTIONS),
          .flags = 0,
          .at_once = 0,
          .retries = 2,
          .return_ms = 30000,
          .start_ms = 60000,
          .command_ms = 0,
          .block_size = 0,
          .hello_ms = 0};
}

const char* WhatIsWrong(const KRAL_VENTRIMS_OPTIONS& options) {
  if ((options.flags & ~kFlags) != 0) return "there is an unknown flag among the options";
  if (options.at_once > Kral_ResourceManager::kContextCount) return "no more than 50 handsets can be worked on at once";
  if (options.retries > kMostRetries) return "no more than 100 retries are possible";
  if (std::max({options.return_ms, options.start_ms, options.command_ms, options.hello_ms}) > kLongestMs)
    return "no time-out is longer than 3,600,000 ms";
  return nullptr;
}

bool Started() {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "the job has been started, and is not changed any more"));
}

}  // namespace

Job::Job(KRAL_VENTRIMS_JOB handle) : handle_(handle), options_(DefaultOptions()) {}

bool Job::IsNewLocked() const {
  return state_ == KRAL_VENTRIMS_NEW || Started();
}

KRAL_VENTRIMS_OPTIONS Job::options() const {
  const MutexLock lock(mutex_);
  return options_;
}

bool Job::SetOptions(const KRAL_VENTRIMS_OPTIONS& options) {
  if (const char* const wrong = WhatIsWrong(options)) return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", wrong));
  const MutexLock lock(mutex_);
  if (!IsNewLocked()) return false;
  options_ = options;
  options_.size = sizeof options_;
  return true;
}

bool Job::AddStep(Step step) {
  const MutexLock lock(mutex_);
  if (!IsNewLocked()) return false;
  steps_.push_back(std::move(step));
  return true;
}

bool Job::AddPort(uint32_t port, uint32_t* handset) {
  if (port == 0 || port > kLastPort)
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the port number %u is not one of 1 to 255", port));
  const MutexLock lock(mutex_);
  if (!IsNewLocked()) return false;
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(static_cast<uint16_t>(port));
  return handle != 0 && AddLocked(handle, true, handset);
}

bool Job::AddHandle(KRAL_HANDLE handle, uint32_t* handset) {
  const MutexLock lock(mutex_);
  if (!IsNewLocked()) return false;
  uint16_t port = 0;
  if (!Kral_ResourceManager::PortOf(handle, port)) return Fail(UnknownHandle(handle));
  // One use more, so that it stays ours until the job is freed.
  const KRAL_HANDLE shared = Kral_ResourceManager::CreateContext(port);
  if (shared == handle) return AddLocked(handle, false, handset);
  if (shared != 0) Kral_ResourceManager::ReleaseContext(shared, false);
  return Fail(UnknownHandle(handle));
}

// Takes over the use of the handle.
bool Job::AddLocked(KRAL_HANDLE handle, bool own_port, uint32_t* handset) {
  std::shared_ptr<JobHandset> added;
  try {
    handsets_.reserve(handsets_.size() + 1);
    if (auto phone = Kral_ResourceManager::GetPhone(handle))
      added = std::make_shared<JobHandset>(handle, std::move(phone), own_port);
  } catch (...) {
    Kral_ResourceManager::ReleaseContext(handle, false);
    throw;
  }
  if (!added) Kral_ResourceManager::ReleaseContext(handle, false);
  if (!added || added->phone().server_mode()) return Fail(Failure(KRAL_ERROR_ARGUMENT, "a job needs direct mode"));
  const int port = added->phone().port();
  for (const auto& other : handsets_) {
    if (other->handle() == handle) return Fail(Failure(KRAL_ERROR_ARGUMENT, "COM%d is in the job already", port));
  }
  handsets_.push_back(std::move(added));
  if (handset != nullptr) *handset = static_cast<uint32_t>(handsets_.size() - 1);
  return true;
}

bool Job::SetCallback(KRAL_VENTRIMS_CALLBACK callback, uintptr_t value) {
  const MutexLock lock(mutex_);
  if (!IsNewLocked()) return false;
  callback_ = callback;
  callback_value_ = value;
  return true;
}

KRAL_VENTRIMS_STATE Job::state() const {
  KRAL_VENTRIMS_STATE state{};
  state.size = sizeof state;
  const MutexLock lock(mutex_);
  state.state = state_;
  state.handsets = static_cast<uint32_t>(handsets_.size());
  if (state_ == KRAL_VENTRIMS_NEW) {
    const FailureMark mark;
    const auto plan = MakePlan(steps_, options_.flags);
    mark.GoBack();
    state.steps = plan ? static_cast<uint32_t>(plan->size()) : 0;
  } else {
    state.steps = static_cast<uint32_t>(plan_.size());
    const uint32_t now = state_ == KRAL_VENTRIMS_ENDED ? ended_ : SystemClock().TickMs();
    if (state_ != KRAL_VENTRIMS_STARTING) state.elapsed_ms = now - started_;
  }
  uint32_t* const counts[] = {&state.waiting, &state.working, &state.working,
                              &state.passed,  &state.failed,  &state.aborted};
  for (const auto& handset : handsets_) {
    const KRAL_VENTRIMS_PROGRESS progress = handset->progress();
    ++*counts[progress.state];
    state.bytes_done += progress.bytes_done;
    state.bytes_total += progress.bytes_total;
  }
  return state;
}

std::shared_ptr<JobHandset> Job::handset(uint32_t number) const {
  const MutexLock lock(mutex_);
  if (number < handsets_.size()) return handsets_[number];
  Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no handset %u in the job, but %zu from 0 on", number, handsets_.size()));
  return nullptr;
}

bool Job::StepName(uint32_t step, std::string& name) const {
  const MutexLock lock(mutex_);
  const auto plan = state_ == KRAL_VENTRIMS_NEW ? MakePlan(steps_, options_.flags) : std::optional(plan_);
  if (!plan) return false;
  if (step >= plan->size()) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no step %u in the job, but %zu from 0 on", step, plan->size()));
  }
  name = (*plan)[step].name;
  return true;
}

}  // namespace kral::station
