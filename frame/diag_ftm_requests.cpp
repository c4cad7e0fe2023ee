// Sends the requests of a phone object, over its transport or through the phone server, and names refusals in the log.
#include <algorithm>
#include <vector>

#include "frame/diag_ftm.h"
#include "frame/orbt_server.h"

namespace kral {
namespace {

struct Refusal {
  uint8_t code;
  const char* text;
};
constexpr Refusal kRefusals[] = {
    {19, "DIAG_BAD_CMD_F (19) received, bad command"},
    {20, "DIAG_BAD_PARM_F (20) received, bad parameter"},
    {21, "DIAG_BAD_LEN_F (21) received, bad request length"},
    {24, "DIAG_BAD_MODE_F (24) received, command is invalid for the current mode"},
};

}  // namespace

bool Diag_FTM::Send(CDiagPacket& packet, uint32_t time_out_ms, uint32_t delay_ms) {
  const auto request = packet.request();
  if (request.empty()) return false;
  uint16_t size = CDiagPacket::kCapacity;
  const bool sent = SendSync(request, packet.response_area().data(), size, request[0], time_out_ms, delay_ms);
  packet.set_response_length(size);
  return sent;
}

bool Diag_FTM::SendSync(std::span<const uint8_t> request, uint8_t* response, uint16_t& response_size,
                        uint8_t expected_code, uint32_t time_out_ms, uint32_t delay_ms) {
  if (!IsPortOpen()) {
    log().WriteLine(kLogErr, "Error. Port %d is not open.", port());
    return false;
  }
  const uint16_t room = response == nullptr ? uint16_t{0} : response_size;
  const uint8_t before = room > 0 ? response[0] : uint8_t{0};
  response_size = room;
  const bool succeeded =
      server_mode() ? SendThroughServer(request, {response, room}, response_size, expected_code, time_out_ms)
                    : transport().SendSync(request, response, response_size, expected_code, time_out_ms, delay_ms);
  // After a time-out the buffer still holds what the caller left there, which is nobody's refusal.
  const bool answered = room > 0 && (response_size != room || response[0] != before);
  if (!succeeded && answered) LogRefusal(response[0]);
  return succeeded;
}

bool Diag_FTM::SendThroughServer(std::span<const uint8_t> request, std::span<uint8_t> response, uint16_t& response_size,
                                 uint8_t expected_code, uint32_t time_out_ms) {
  std::vector<uint8_t> reply;
  try {
    if (!server_->SendRequest(request, time_out_ms, reply) || reply.empty()) return false;
  } catch (...) {
    log().WriteLine(kLogErr, "ORBT server exception caught while sending a request in Diag_FTM::SendSync().");
    return false;
  }
  const size_t taken = std::min(reply.size(), response.size());
  std::copy_n(reply.begin(), taken, response.begin());
  response_size = static_cast<uint16_t>(taken);
  if (reply[0] == expected_code) return true;
  log().WriteLine(kLogErr, "SEND SYNC Failed: expected %d received %d", expected_code, reply[0]);
  return false;
}

void Diag_FTM::LogRefusal(uint8_t code) {
  const auto* refusal =
      std::find_if(std::begin(kRefusals), std::end(kRefusals), [code](const Refusal& r) { return r.code == code; });
  if (refusal != std::end(kRefusals)) log().WriteLine(kLogErr, "ERROR:\t%s", refusal->text);
}

}  // namespace kral
