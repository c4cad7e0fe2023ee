// Exchanges and writes of the download protocols over the phone object's transport.
#include "download/link/download_connection.h"

#include <chrono>

#include "base/at_exit.h"
#include "base/failure.h"
#include "base/guarded_call.h"
#include "base/wire_codes.h"
#include "frame/request_failure.h"

namespace kral::download {
namespace {

constexpr uint32_t kLookAroundMs = 50;

}  // namespace

Reply DownloadConnection::ServerHasNoFramer() {
  Fail(Failure(KRAL_ERROR_ARGUMENT, "a phone server downloads by itself"));
  return ReplyKind::kNotSent;
}

Reply DownloadConnection::Exchange(std::span<const uint8_t> request, uint8_t expected_code, uint32_t time_out_ms) {
  if (phone_.server_mode()) return ServerHasNoFramer();
  // The leading flag is on for the length of an exchange, and off after it whatever it was before: required.
  CProtAHDLC& framer = phone_.transport().framer();
  framer.SetStartFlag(1);
  const AtExit exchanged([&framer] { framer.SetStartFlag(0); });
  room_.resize(kMaximumPacket);
  return phone_.SendSync(request, room_, expected_code, time_out_ms);
}

Reply DownloadConnection::AwaitReply(uint8_t expected_code, uint32_t time_out_ms) {
  const auto record = responses().PopWithin(std::chrono::milliseconds(time_out_ms));
  if (!record) return ReplyKind::kNone;
  room_.assign(record->begin(), record->end());
  const auto bytes = std::span<const uint8_t>(room_).first(room_.size() - std::min(room_.size(), kFcsSize));
  const uint8_t code = bytes.empty() ? uint8_t{0} : bytes[0];
  return {!bytes.empty() && code == expected_code ? ReplyKind::kExpected : ReplyKind::kOther, code, bytes};
}

Reply DownloadConnection::WriteHDLCNoRead(std::span<const uint8_t> request, uint32_t time_out_ms) {
  if (phone_.server_mode()) return ServerHasNoFramer();
  // Not opened afresh: what comes back on the port knows nothing of what was written before.
  if (!phone_.transport().connected()) {
    Fail(RequestFailure(phone_, ReplyKind::kGone, request, time_out_ms));
    return ReplyKind::kGone;
  }
  return phone_.SendASync(request, time_out_ms, true);
}

void DownloadConnection::BeginWork() {
  Settings& settings = phone_.state<Settings>();
  if (!settings.keep_abort) settings.abort = false;
  reported_ = false;
}

bool DownloadConnection::Pause(uint32_t milliseconds) {
  while (milliseconds > 0 && !aborted()) {
    const uint32_t piece = std::min(milliseconds, kLookAroundMs);
    clock().SleepMs(piece);
    milliseconds -= piece;
  }
  return !aborted();
}

void DownloadConnection::Report(uint32_t done, uint32_t total) {
  if (reported_ && done == last_report_) return;
  reported_ = true;
  last_report_ = done;
  const Settings& settings = phone_.state<Settings>();
  auto callback = settings.part_callback.load();
  const bool is_part = callback != nullptr;
  if (!is_part) callback = settings.progress_callback;
  if (callback == nullptr) return;
  const uintptr_t value = is_part ? settings.part_value : settings.callback_value;
  CallGuarded([&] { callback(phone_.handle(), done, total, value); });
}

}  // namespace kral::download
