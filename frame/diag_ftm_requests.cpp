// Sends the requests of a phone object, over its transport or through the phone server; names refusals in the log.
#include <algorithm>
#include <string>
#include <vector>

#include "frame/diag_ftm.h"
#include "frame/orbt_server.h"
#include "frame/request_failure.h"

namespace kral {

Reply Diag_FTM::Send(CDiagPacket& packet, uint32_t time_out_ms, uint32_t delay_ms, const ReplyTest& is_own) {
  const auto request = packet.request();
  if (request.empty()) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "an empty request was to be sent"));
    return ReplyKind::kNotSent;
  }
  const Reply reply = SendSync(request, packet.response_area(), request[0], time_out_ms, delay_ms, is_own);
  packet.set_response_length(static_cast<uint16_t>(reply.bytes().size()));
  return reply;
}

Reply Diag_FTM::SendSync(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                         uint32_t time_out_ms, uint32_t delay_ms, const ReplyTest& is_own) {
  if (!IsPortOpen()) {
    log().WriteLine(kLogErr, "Error. Port %d is not open.", port());
    return Noted(ReplyKind::kPortClosed, request, time_out_ms);
  }
  const Reply reply = server_mode() ? SendThroughServer(request, room, expected_code, time_out_ms)
                                    : transport().SendSync(request, room, expected_code, time_out_ms, delay_ms, is_own);
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
  const Reply reply = IsPortOpen() ? transport().SendRaw(request, room, time_out_ms) : ReplyKind::kPortClosed;
  return Noted(reply, request, time_out_ms);
}

Reply Diag_FTM::SendASync(std::span<const uint8_t> request, uint32_t time_out_ms, bool start_flag) {
  const Reply reply = IsPortOpen() ? transport().SendASync(request, time_out_ms, start_flag) : ReplyKind::kPortClosed;
  return Noted(reply, request, time_out_ms);
}

Reply Diag_FTM::SendThroughServer(std::span<const uint8_t> request, std::span<uint8_t> room, uint8_t expected_code,
                                  uint32_t time_out_ms) {
  std::vector<uint8_t> reply;
  try {
    if (!server_->SendRequest(request, time_out_ms, reply) || reply.empty()) return ReplyKind::kNone;
  } catch (...) {
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
