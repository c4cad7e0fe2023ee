// The steps of a job on one handset, each with the operation of the family it belongs to.
#include <algorithm>
#include <utility>

#include "base/at_exit.h"
#include "commands/core/core_diag.h"
#include "download/boot/kivrat.h"
#include "download/download_client.h"
#include "download/flash_all.h"
#include "download/kova/kova_format.h"
#include "download/link/download_settings.h"
#include "kral/diag.h"
#include "station/handset_worker.h"
#include "storage/backup/pkv_jobs.h"
#include "storage/items/phone_identity.h"

namespace kral::station {
namespace {

constexpr uint32_t kHelloNops = 3;
constexpr uint32_t kFirstPatienceMs = 200;

kivrat::Programmer AsProgrammer(const images::PhoneImage& file) {
  const uint64_t size = file.GetTotalSize();
  return {size, [&file, size](uint64_t offset, std::span<uint8_t> room, size_t& count) {
            count = static_cast<size_t>(std::min<uint64_t>(room.size(), size - std::min(offset, size)));
            try {
              file.Read(static_cast<uint32_t>(offset), room.data(), static_cast<uint32_t>(count), 0);
            } catch (const images::PhoneImageException&) {
              return std::make_error_code(std::errc::io_error);
            }
            return std::error_code();
          }};
}

}  // namespace

bool HandsetWorker::Do(const Step& step) {
  switch (step.kind) {
    case StepKind::kIdentity:
      return AwaitDiagnostics(phone_.TimeOut(kTimeOutDefaultCommand)) && ReadIdentity(step.asked_for);
    case StepKind::kEnterLoader:
      return EnterLoader();
    case StepKind::kProgrammer:
      return StartProgrammer(step) && GreetFirst();
    case StepKind::kPartitionTable:
      return Greet() && download::SendPartitionTable(phone_, *step.table, step.number != 0 ? 1 : 0, nullptr);
    case StepKind::kImage:
      return Greet() && WriteImage(step);
    case StepKind::kReset:
      return Restart();
    case StepKind::kMode:
      return SetMode(step.number);
    case StepKind::kRestore:
      return backup::Run(
          phone_, step.file, [&] { return backup::Restore(phone_, *step.set); }, nullptr);
    case StepKind::kVerify:
      return backup::Run(
          phone_, step.file, [&] { return backup::Verify(phone_, *step.set); }, nullptr);
  }
  return false;
}

// Where the identity is only taken along, a handset that does not know a request may be a good one; one that is gone
// is not.
bool HandsetWorker::ReadIdentity(bool whole) {
  pkv::PkvProperties properties;
  items::AppendIdentity(phone_, properties);
  const auto value = [&properties](std::string_view name) {
    for (const auto& [key, text] : properties.values) {
      if (key == name) return text;
    }
    return std::string();
  };
  const std::string serial = value("ESN");
  const std::string revision = value("SoftwareRevision");
  handset_.SetIdentity(value("Model"), revision, serial);
  if (!serial.empty() && !revision.empty()) return true;
  return !whole && failure_->record().code != KRAL_ERROR_LOST && failure_->record().code != KRAL_ERROR_NO_ANSWER;
}

// A handset may change over without an answer, and its port with it: what comes next shows whether it has.
bool HandsetWorker::EnterLoader() {
  const Reply reply = diag::EnterDownload(phone_);
  if (!reply && reply.kind() != ReplyKind::kNone && reply.kind() != ReplyKind::kGone && !reply.not_sent()) return false;
  const auto programmer =
      std::ranges::find_if(plan_, [](const Step& step) { return step.kind == StepKind::kProgrammer; });
  return programmer->number == KRAL_VENTRIMS_PROGRAMMER_BOOT || InTime(AwaitLoader(options_.start_ms));
}

bool HandsetWorker::StartProgrammer(const Step& step) {
  if (programmer_started_) return true;
  programmer_started_ =
      step.hex ? download::LoadProgrammer(phone_, *step.hex, kova::kAmplePacket, nullptr) : BootTransfer(step);
  return programmer_started_;
}

bool HandsetWorker::BootTransfer(const Step& step) {
  kivrat::Settings& settings = phone_.state<kivrat::Settings>();
  const uint32_t retries = settings.hello_retries;
  settings.hello_retries = UINT32_MAX;
  const AtExit set_back([&] { settings.hello_retries = retries; });
  const uint32_t start = Now();
  const uint32_t within_ms = options_.hello_ms != 0 ? options_.hello_ms : options_.start_ms;
  const auto is_late = [&] { return Now() - start >= within_ms; };
  uint32_t version = 0;
  if (!kivrat::Connect(phone_, version, nullptr, [&] { return stopped() || is_late(); })) {
    if (stopped() || InTime(!is_late())) return false;
    return Fail(
        Failure(KRAL_ERROR_NO_ANSWER, "the boot loader on COM%d said no hello within %u ms", phone_.port(), within_ms));
  }
  if (download::ServeFlashProgrammer(phone_, AsProgrammer(*step.boot))) return true;
  phone_.GiveBackPort();
  return false;
}

// One that was never heard is no programmer for this handset: waiting once more would help nobody.
bool HandsetWorker::GreetFirst() {
  const bool greeted = Greet();
  is_final_ = !greeted && failure_->record().code == KRAL_ERROR_NO_ANSWER;
  return greeted;
}

// A hello is a row of waits; together they end within `within_ms`.
bool HandsetWorker::Greet(uint32_t within_ms) {
  if (greeted_) return true;
  download::Settings& settings = phone_.state<download::Settings>();
  const uint32_t limit = settings.handshake_limit_ms;
  const uint32_t delay = settings.hello_retry_delay_ms;
  const uint32_t wait = std::max(within_ms / (kHelloNops + 2 * std::max(settings.hello_tries.load(), 1u)), 1u);
  const AtExit set_back([&] {
    settings.handshake_limit_ms = limit;
    settings.hello_retry_delay_ms = delay;
  });
  settings.handshake_limit_ms = std::min({limit, wait, options_.command_ms != 0 ? options_.command_ms : UINT32_MAX});
  settings.hello_retry_delay_ms = std::min(delay, wait);
  greeted_ = download::StreamHello(phone_, KRAL_STREAM_HELLO_VARIANT, &block_size_, &window_);
  if (options_.block_size != 0) block_size_ = std::min(block_size_, options_.block_size);
  return greeted_;
}

bool HandsetWorker::WriteImage(const Step& step) {
  const download::WriteArguments arguments{step.image_type, step.method, block_size_, window_};
  const images::PhoneImage* const header = step.image->has_header ? &step.image->header.image() : nullptr;
  return download::WriteImage(phone_, step.image->image.image(), header, arguments, nullptr);
}

// What answers again in diagnostics has been restarted, whether or not it could say so.
bool HandsetWorker::Restart() {
  if (!download::KovaReset(phone_) && failure_->record().code == KRAL_ERROR_REFUSED) return false;
  greeted_ = programmer_started_ = false;
  if (!InTime(AwaitDiagnostics(options_.start_ms))) return false;
  is_final_ = !IsSameHandset(true);
  return !is_final_ && ReadIdentity(false);
}

bool HandsetWorker::SetMode(uint32_t mode) {
  if (!diag::ControlMode(phone_, static_cast<uint16_t>(mode))) return false;
  return mode != KRAL_MODE_RESET || (InTime(AwaitDiagnostics(options_.start_ms)) && IsSameHandset());
}

// With a request that every handset knows, or refuses: it answers either way. The first tries are short, for one that
// is still starting; each later one waits longer, for one that is slow.
bool HandsetWorker::AwaitDiagnostics(uint32_t within_ms) {
  const uint32_t longest = std::max(phone_.TimeOut(kTimeOutDefaultCommand), 1u);
  uint32_t patience = std::min(kFirstPatienceMs, longest);
  const auto answers = [&] {
    CDiagPacket& version = phone_.packet();
    version.Reset();
    version.Append8(0);
    if (!phone_.IsPortOpen()) return false;
    const Reply reply = phone_.Send(version, std::exchange(patience, std::min(2 * patience, longest)));
    return reply || reply.refusal() != 0;
  };
  if (Await(within_ms, answers)) return true;
  return !stopped() &&
         Fail(Failure(KRAL_ERROR_NO_ANSWER, "the handset on COM%d did not answer in diagnostics within %u ms",
                      phone_.port(), within_ms));
}

bool HandsetWorker::AwaitLoader(uint32_t within_ms) {
  if (Await(within_ms, [this] { return download::KovaNop(phone_); })) return true;
  return !stopped() &&
         Fail(Failure(KRAL_ERROR_NO_ANSWER, "the loader of the handset on COM%d did not answer within %u ms",
                      phone_.port(), within_ms));
}

}  // namespace kral::station
