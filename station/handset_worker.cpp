// The attempts at each step, and the way back of a handset that was lost. The steps are in handset_steps.cpp.
#include "station/handset_worker.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <mutex>
#include <string>

#include "base/little_endian.h"
#include "commands/core/core_diag.h"
#include "commands/nv/nv_item.h"
#include "download/download_client.h"
#include "download/link/download_settings.h"
#include "frame/request_failure.h"
#include "station/attempt.h"

namespace kral::station {
namespace {

constexpr uint32_t kLookAroundMs = 50;

// The cable, the port or the handset's patience; a retry helps against nothing else.
bool MayPass(uint32_t code) {
  return code == KRAL_ERROR_NO_PORT || code == KRAL_ERROR_PORT_IN_USE || code == KRAL_ERROR_NO_ANSWER ||
         code == KRAL_ERROR_LINK || code == KRAL_ERROR_LOST;
}

KRAL_ERROR RecordOf(const CallFailure& failure, const Step& step) {
  if (failure.noted()) return failure.record();
  return Failure(KRAL_ERROR_INTERNAL, "%s failed; the text log may say why", step.name.c_str()).record();
}

}  // namespace

HandsetWorker::HandsetWorker(JobHandset& handset, const Plan& plan, const KRAL_VENTRIMS_OPTIONS& options)
    : handset_(handset), phone_(handset.phone()), plan_(plan), options_(options), retries_left_(options.retries) {}

void HandsetWorker::Run() {
  if (!handset_.Begin()) return;
  for (uint32_t i = 0; i < plan_.size(); ++i) {
    handset_.BeginStep(i, plan_[i]);
    phone_.log().WriteLine(kLogFn, "KRAL_VENTRIMS: step %u of %zu, %s", i + 1, plan_.size(), plan_[i].name.c_str());
    if (!RunStep(plan_[i])) return;
    handset_.EndStep();
  }
  handset_.Pass();
}

bool HandsetWorker::RunStep(const Step& step) {
  bool lost = false;  // the attempt before
  for (;;) {
    CallFailure failure;
    failure_ = &failure;
    bool recovered = true;
    bool done = false;
    {
      const std::lock_guard lock(phone_.request_lock());
      const Attempt attempt(phone_, handset_, options_.command_ms);
      if (!stopped() && lost) recovered = Recover(step);
      if (lost && recovered && !stopped()) handset_.EndReturn();
      if (!stopped() && recovered) done = IsThere(step) && Do(step);
    }
    failure_ = nullptr;
    if (done && !stopped()) return true;
    const KRAL_ERROR record = RecordOf(failure, step);
    if (stopped() || !recovered || is_final_ || !MayPass(record.code) || retries_left_ == 0) {
      phone_.log().WriteLine(kLogErr, "KRAL_VENTRIMS: %s: %s", step.name.c_str(), record.text);
      handset_.FailWith(record);
      return false;
    }
    --retries_left_;
    lost_by_ = record.code;
    lost = true;
    handset_.BeginReturn();
  }
}

// What of the handset's state is needed to go on with the step. Nothing is done again here that was done before.
bool HandsetWorker::Recover(const Step& step) {
  if (!AwaitPort()) return false;
  switch (step.kind) {
    case StepKind::kEnterLoader:
      return !IsStillInDiagnostics() || IsSameHandset();
    case StepKind::kReset:
      return true;  // it may have been carried out: what it waits for tells
    case StepKind::kProgrammer:
      if (programmer_started_ || step.number == KRAL_VENTRIMS_PROGRAMMER_BOOT) return true;
      return download::KovaNop(phone_) ||
             Fail(Failure(KRAL_ERROR_LOST, "COM%d came back without its loader: it cannot go on", phone_.port()));
    case StepKind::kPartitionTable:
    case StepKind::kImage:
      return GreetAgain();
    default:
      return AwaitDiagnostics(options_.return_ms) && IsSameHandset();
  }
}

// It may have been carried out already, and is waited for then. A loader takes the question for noise; a boot loader
// would take it for a packet of its own, and is not asked.
bool HandsetWorker::IsStillInDiagnostics() {
  const bool has_boot_programmer = std::ranges::any_of(plan_, [](const Step& step) {
    return step.kind == StepKind::kProgrammer && step.number == KRAL_VENTRIMS_PROGRAMMER_BOOT;
  });
  const KeepFailure keep;
  return !has_boot_programmer && phone_.IsPhoneConnected();
}

// The next request would open the port again, whatever is on it by then. Where a download goes on, the handset says
// hello; in front of one its going is a part of the way.
bool HandsetWorker::IsThere(const Step& step) {
  const bool in_diagnostics = step.kind == StepKind::kIdentity || step.kind == StepKind::kMode ||
                              step.kind == StepKind::kRestore || step.kind == StepKind::kVerify;
  return !in_diagnostics || !phone_.device_gone() || Fail(PortFailure(phone_));
}

// Whatever has been put into the socket while the cable was out answers like the handset that was there.
// New software may have lost the number, or may not tell it; it does not tell another one.
bool HandsetWorker::IsSameHandset(bool with_new_software) {
  const std::string known = handset_.progress().serial;
  if (known.empty()) return true;
  uint32_t serial = 0;
  bool told = false;
  const auto answers = [&] {
    told = diag::ReadSerialNumber(phone_, &serial);
    return told || failure_->record().code == KRAL_ERROR_REFUSED;
  };
  if (!Await(options_.return_ms, answers)) return false;
  if (with_new_software && (!told || serial == 0)) return true;
  if (!told)
    return Fail(Failure(KRAL_ERROR_LOST, "what came back on COM%d does not tell its serial number: it was %s",
                        phone_.port(), known.c_str()));
  return MayHaveSerial(serial) || FailAsAnother(serial);
}

bool HandsetWorker::FailAsAnother(uint32_t serial) {
  return Fail(Failure(KRAL_ERROR_LOST, "another handset came back on COM%d: %08X, not %s", phone_.port(),
                      static_cast<unsigned>(serial), handset_.progress().serial));
}

// The one that it told, or one that the job itself writes.
bool HandsetWorker::MayHaveSerial(uint32_t serial) const {
  std::array<char, 16> text{};
  std::snprintf(text.data(), text.size(), "%08X", static_cast<unsigned>(serial));
  const auto writes_it = [serial](const pkv::PkvNvItem& item) {
    return item.id == nv::kEsnItem && item.subscription == 0 && LoadLe<uint32_t>(item.data) == serial;
  };
  return std::string(text.data()) == handset_.progress().serial || std::ranges::any_of(plan_, [&](const Step& step) {
           return step.kind == StepKind::kRestore && std::ranges::any_of(step.set->items, writes_it);
         });
}

bool HandsetWorker::GreetAgain() {
  greeted_ = false;
  const uint32_t start = Now();
  const auto greeted_or_over = [&] {
    if (Greet(options_.return_ms - std::min(Now() - start, options_.return_ms))) return true;
    // Nothing tells when a caller's transport is back.
    return phone_.IsPortOpen() && !phone_.transport().port().user_defined();
  };
  Await(options_.return_ms, greeted_or_over);
  if (greeted_ || stopped()) return greeted_;
  if (lost_by_ != KRAL_ERROR_LOST) return false;  // silent or garbled, then and now
  if (failure_->record().code != KRAL_ERROR_NO_ANSWER)
    return Fail(
        Failure(KRAL_ERROR_LOST, "COM%d came back without its flash programmer: it cannot go on", phone_.port()));
  return Fail(Failure(KRAL_ERROR_NO_ANSWER, "the handset on COM%d stopped answering: no hello came within %u ms",
                      phone_.port(), options_.return_ms));
}

bool HandsetWorker::AwaitPort() {
  phone_.GiveBackPort();
  if (Await(options_.return_ms, [this] { return phone_.IsPortOpen(); })) return true;
  return !stopped() &&
         Fail(Failure(KRAL_ERROR_LOST, "COM%d did not return within %u ms", phone_.port(), options_.return_ms));
}

bool HandsetWorker::Await(uint32_t within_ms, const std::function<bool()>& holds) {
  const uint32_t start = Now();
  while (!holds()) {
    if (stopped() || Now() - start >= within_ms || !Pause(kLookAroundMs)) return false;
  }
  return true;
}

bool HandsetWorker::InTime(bool in_time) {
  is_final_ = !in_time;
  return in_time;
}

bool HandsetWorker::Pause(uint32_t milliseconds) {
  while (milliseconds > 0 && !stopped()) {
    const uint32_t piece = std::min(milliseconds, kLookAroundMs);
    phone_.clock().SleepMs(piece);
    milliseconds -= piece;
  }
  return !stopped();
}

}  // namespace kral::station
