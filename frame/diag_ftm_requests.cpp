// Sends the requests of a phone object, over its transport or through the phone server; names refusals in the log.
#include <algorithm>
#include <array>
#include <utility>
#include <vector>

#include "base/little_endian.h"
#include "frame/diag_ftm.h"
#include "frame/orbt_server.h"
#include "frame/request_failure.h"
#include "platform/forced_unwind.h"

namespace kral {
namespace {

constexpr std::array<uint8_t, 1> kLoopbackRequest{kLoopback};

// Of a request whose reply was another one the own reply may still be on its way, too.
bool MayComeLater(const Reply& reply) {
  return !reply && !reply.not_sent() && reply.refusal() == 0 && reply.kind() != ReplyKind::kGone;
}

}  // namespace

// See Diag_FTM::Call.
template <class SendOnce>
Reply Diag_FTM::OverOpenPort(SendOnce send) {
  const bool may_be_another = std::exchange(at_calls_begin_, false);
  // Where the device has gone between two requests of a call, another one may be there already. One that goes in this
  // moment is not opened afresh either: the request is not sent, then.
  const bool goes_on = calls_ > 0 && !may_be_another && !server_mode();
  const bool is_open = goes_on && transport().connected();
  if (goes_on && !is_open && device_gone()) return ReplyKind::kGone;
  if (!is_open && !IsPortOpen()) return ReplyKind::kPortClosed;
  Reply reply = send();
  if (reply.kind() == ReplyKind::kGoneUnsent && may_be_another && IsPortOpen()) reply = send();
  return reply.kind() == ReplyKind::kGoneUnsent ? ReplyKind::kGone : reply;
}

Reply Diag_FTM::Send(CDiagPacket& packet, uint32_t time_out_ms, uint32_t delay_ms, const ReplyTest& is_own) {
  const auto request = packet.request();
  if (request.empty()) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "an empty request was to be sent"));
    return ReplyKind::kNotSent;
  }
  Reply reply = Synchronise(time_out_ms);
  if (reply) reply = SendSync(request, packet.response_area(), request[0], time_out_ms, delay_ms, is_own);
  packet.set_response_length(static_cast<uint16_t>(reply.bytes().size()));
  return reply;
}

Reply Diag_FTM::SendSync(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                         uint32_t time_out_ms, uint32_t delay_ms, const ReplyTest& is_own) {
  const Reply reply = OverOpenPort([&] {
    return server_mode() ? SendThroughServer(request, room, expected_code, time_out_ms)
                         : transport().SendSync(request, room, expected_code, time_out_ms, delay_ms, is_own);
  });
  if (reply.kind() == ReplyKind::kPortClosed) log().WriteLine(kLogErr, "Error. Port %d is not open.", port());
  if (MayComeLater(reply)) OweAnswer();
  if (const char* const refusal = RefusalText(reply.refusal())) log().WriteLine(kLogErr, "ERROR:\t%s", refusal);
  return Noted(reply, request, time_out_ms);
}

Reply Diag_FTM::AwaitNext(CDiagPacket& packet, uint32_t time_out_ms, const ReplyTest& is_own) {
  const Reply reply =
      server_mode() ? Reply() : transport().AwaitNext(packet.response_area(), packet.request()[0], time_out_ms, is_own);
  packet.set_response_length(static_cast<uint16_t>(reply.bytes().size()));
  return Noted(reply, packet.request(), time_out_ms);
}

Reply Diag_FTM::SendRaw(std::span<const uint8_t> request, std::span<uint8_t> room, uint32_t time_out_ms) {
  const Reply reply = OverOpenPort([&] { return transport().SendRaw(request, room, time_out_ms); });
  if (MayComeLater(reply)) OweAnswer();
  return Noted(reply, request, time_out_ms);
}

Reply Diag_FTM::SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag) {
  const Reply reply = OverOpenPort([&] { return transport().SendASync(request, time_out_ms, start_flag); });
  return Noted(reply, request, time_out_ms);
}

Reply Diag_FTM::Synchronise(uint32_t time_out_ms) {
  if (!answer_owed_ || !(resynchronise_ || resynchronising_ > 0) || server_mode() || !framed_) {
    return ReplyKind::kExpected;
  }
  std::array<uint8_t, 6> loopback{kLoopbackRequest[0], 'S'};  // the liveness check's has other content
  StoreLe(loopback, 2, ++loopbacks_);
  const ReplyTest is_own = [&](std::span<const uint8_t> reply) {
    return std::equal(loopback.begin(), loopback.end(), reply.begin(), reply.end());
  };
  std::array<uint8_t, kMaximumPacket> room;
  const uint32_t start = clock_.TickMs();
  Reply reply = OverOpenPort([&] { return transport().SendSync(loopback, room, loopback[0], time_out_ms, 0, is_own); });
  if (reply.kind() == ReplyKind::kPortClosed) return Noted(reply, kLoopbackRequest, time_out_ms);
  while (reply.kind() == ReplyKind::kOther) {
    // A handset that does not know the loopback refuses it, and repeats it: that tells as well.
    if (reply.refusal() != 0 && reply.bytes().size() > loopback.size() &&
        std::equal(loopback.begin(), loopback.end(), reply.bytes().begin() + 1)) {
      reply = {ReplyKind::kExpected, reply.code(), reply.bytes()};
      break;
    }
    const uint32_t elapsed = clock_.TickMs() - start;
    if (elapsed >= time_out_ms) break;  // of a handset that never stops talking
    reply = transport().AwaitNext(room, loopback[0], time_out_ms - elapsed, is_own);
  }
  if (reply) {
    answer_owed_ = false;
    return ReplyKind::kExpected;
  }
  if (reply.kind() == ReplyKind::kAborted) return Noted(reply, loopback, time_out_ms);
  const KeepFailure keep;  // the request whose answer is owed, rather than a loopback that nobody asked for
  Noted(reply, loopback, time_out_ms);
  // What went wrong is the loopback's. Of the request itself nothing has been sent, and nothing has come.
  const bool is_the_lines = reply.kind() == ReplyKind::kGone || reply.not_sent();
  return is_the_lines ? reply.kind() : ReplyKind::kNotSent;
}

void Diag_FTM::OweAnswer() {
  answer_owed_ = true;
  owed_since_ = clock_.TickMs();
}

bool Diag_FTM::MayGetLateAnswer() const {
  constexpr uint32_t kLatestMs = 10000;
  return answer_owed_ && clock_.TickMs() - owed_since_ < kLatestMs;
}

Reply Diag_FTM::SendThroughServer(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                                  uint32_t time_out_ms) {
  std::vector<uint8_t> reply;
  try {
    if (!server_->SendRequest(request, time_out_ms, reply) || reply.empty()) return ReplyKind::kNone;
  } catch (...) {
    PassForcedUnwind();
    log().WriteLine(kLogErr, "ORBT server exception caught while sending a request in Diag_FTM::SendSync().");
    return ReplyKind::kWriteFailed;
  }
  const size_t taken = std::min(reply.size(), room.size());
  std::copy_n(reply.begin(), taken, room.begin());
  if (reply[0] == expected_code) return {ReplyKind::kExpected, reply[0], room.first(taken)};
  log().WriteLine(kLogErr, "SEND SYNC Failed: expected %d received %d", expected_code, reply[0]);
  return {ReplyKind::kOther, reply[0], room.first(taken)};
}

// The one place where an outcome becomes a failure that callers can ask for.
Reply Diag_FTM::Noted(Reply reply, std::span<const uint8_t> request, uint32_t time_out_ms) {
  if (!reply) Fail(RequestFailure(*this, reply, request, time_out_ms));
  return reply;
}

}  // namespace kral
