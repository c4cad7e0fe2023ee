// Keeps the record of one handset of a job.
#include "station/job_handset.h"

#include <algorithm>
#include <cstdio>

#include "base/failure.h"
#include "download/download_client.h"
#include "frame/phone_claim.h"
#include "frame/resource_manager.h"
#include "storage/efs/efs_client.h"

namespace kral::station {
namespace {

constexpr uint32_t kTellEveryMs = 100;

uint32_t Now() {
  return SystemClock().TickMs();
}

}  // namespace

JobHandset::JobHandset(KRAL_HANDLE handle, std::shared_ptr<Diag_FTM> phone, bool own_port)
    : handle_(handle), phone_(std::move(phone)), own_port_(own_port) {
  record_.size = sizeof record_;
  record_.handle = handle;
  record_.port = phone_->port();
  record_.attempts = 1;
}

JobHandset::~JobHandset() {
  Kral_ResourceManager::ReleaseContext(handle_, false);
}

void JobHandset::Abort() {
  stop_ = true;
  {
    const MutexLock lock(mutex_);
    if (ended_locked()) return;
    if (record_.state != KRAL_VENTRIMS_WAITING) {
      // Whichever of its requests is under way; these forget it when the next work begins.
      download::Abort(*phone_);
      efs::Abort(*phone_);
      return;
    }
    const Failure aborted(KRAL_ERROR_ABORTED, "aborted before the work on it began");
    EndLocked(KRAL_VENTRIMS_ABORTED, &aborted.record());
  }
}

bool JobHandset::ended() const {
  const MutexLock lock(mutex_);
  return ended_locked();
}

KRAL_VENTRIMS_PROGRESS JobHandset::progress() const {
  const MutexLock lock(mutex_);
  KRAL_VENTRIMS_PROGRESS record = record_;
  if (record.state == KRAL_VENTRIMS_WORKING || record.state == KRAL_VENTRIMS_RETURNING)
    record.elapsed_ms = Now() - began_;
  return record;
}

KRAL_VENTRIMS_RESULT JobHandset::result() const {
  KRAL_VENTRIMS_RESULT result{};
  result.size = sizeof result;
  result.progress = progress();
  const MutexLock lock(mutex_);
  result.passed = record_.state == KRAL_VENTRIMS_PASSED ? 1 : 0;
  result.error = error_;
  return result;
}

void JobHandset::Prepare(uint64_t bytes_total, std::function<void()> changed) {
  const MutexLock lock(mutex_);
  record_.bytes_total = bytes_total;
  changed_ = std::move(changed);
}

bool JobHandset::Begin() {
  {
    const MutexLock lock(mutex_);
    if (record_.state == KRAL_VENTRIMS_WAITING) {
      record_.state = KRAL_VENTRIMS_WORKING;
      began_ = Now();
      return true;
    }
  }
  Tell();  // here, not where it was aborted: callbacks come on threads of the job
  return false;
}

void JobHandset::BeginStep(uint32_t number, const Step& step) {
  {
    const MutexLock lock(mutex_);
    record_.step = number;
    record_.step_done = 0;
    record_.step_total = static_cast<uint32_t>(std::min<uint64_t>(step.bytes, UINT32_MAX));
    PutText(record_.step_name, step.name);
    counts_bytes_ = step.bytes != 0;
  }
  Tell();
}

void JobHandset::Report(uint32_t done, uint32_t total) {
  {
    const MutexLock lock(mutex_);
    record_.step_done = done;
    record_.step_total = total;
    if (counts_bytes_) record_.bytes_done = bytes_before_ + done;
    const uint32_t now = Now();
    if (now - told_ < kTellEveryMs) return;
    told_ = now;
  }
  Tell();
}

void JobHandset::EndStep() {
  const MutexLock lock(mutex_);
  bytes_before_ = record_.bytes_done;
}

void JobHandset::BeginReturn() {
  {
    const MutexLock lock(mutex_);
    record_.state = KRAL_VENTRIMS_RETURNING;
  }
  Tell();
}

void JobHandset::EndReturn() {
  {
    const MutexLock lock(mutex_);
    record_.state = KRAL_VENTRIMS_WORKING;
    ++record_.attempts;
  }
  Tell();
}

void JobHandset::SetIdentity(const std::string& model, const std::string& revision, const std::string& serial) {
  const MutexLock lock(mutex_);
  if (!model.empty()) PutText(record_.model, model);
  if (!revision.empty()) PutText(record_.revision, revision);
  if (!serial.empty()) PutText(record_.serial, serial);
}

void JobHandset::Pass() {
  End(KRAL_VENTRIMS_PASSED, nullptr);
}

void JobHandset::FailWith(const KRAL_ERROR& error) {
  if (!stop_) return End(KRAL_VENTRIMS_FAILED, &error);
  const Failure aborted(KRAL_ERROR_ABORTED, "aborted by the caller");
  End(KRAL_VENTRIMS_ABORTED, error.code == KRAL_ERROR_ABORTED ? &error : &aborted.record());
}

void JobHandset::End(uint32_t state, const KRAL_ERROR* error) {
  {
    const MutexLock lock(mutex_);
    if (ended_locked()) return;
    EndLocked(state, error);
  }
  Tell();
}

void JobHandset::EndLocked(uint32_t state, const KRAL_ERROR* error) {
  if (record_.state != KRAL_VENTRIMS_WAITING) record_.elapsed_ms = Now() - began_;
  record_.state = state;
  if (error != nullptr) error_ = *error;
  std::snprintf(error_.function, sizeof error_.function, "%s", error == nullptr ? "" : "KRAL_VENTRIMS_Start");
  // Here, so that who sees the end may start another job with it.
  phone_->state<PhoneClaim>().job = 0;
}

void JobHandset::Tell() const {
  if (changed_) changed_();
}

}  // namespace kral::station
