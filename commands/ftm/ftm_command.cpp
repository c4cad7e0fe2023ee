// Sends FTM commands with a payload of the caller; knows nothing of what the payload says.
#include "commands/ftm/ftm_command.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstring>

#include "frame/export_call.h"

namespace kral::ftm {
namespace {

bool IsComplete(const Exchange& exchange) {
  const bool payload_there = exchange.payload != nullptr || exchange.payload_size == 0;
  return payload_there && exchange.response != nullptr && exchange.response_size != nullptr &&
         *exchange.response_size > 0;
}

void AppendPayload(Diag_FTM& phone, const Exchange& exchange) {
  CDiagPacket& packet = phone.packet();
  const u16 before = packet.request_length();
  packet.AppendBlock({exchange.payload, exchange.payload_size});
  if (packet.request_length() != before + exchange.payload_size) {
    phone.log().WriteLine(kLogErr, "FTM payload of %d bytes does not fit the request, which is sent without it",
                          exchange.payload_size);
  }
}

void HandBack(Diag_FTM& phone, const Exchange& exchange) {
  const auto response = phone.packet().response();
  const auto body = response.subspan(std::min(response.size(), HeaderSize(phone)));
  const size_t size = std::min<size_t>(body.size(), *exchange.response_size);
  std::copy_n(body.begin(), size, exchange.response);
  *exchange.response_size = static_cast<u16>(size);
}

}  // namespace

bool SendCommand(Diag_FTM& phone, uint16_t mode_id, HeaderForm form, uint16_t command, const Exchange& exchange) {
  if (!IsComplete(exchange)) {
    phone.log().WriteLine(kLogErr, "FTM command %d is not sent: its payload or its response room is missing", command);
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the payload or the room for the response is missing"));
  }
  BeginCommand(phone, mode_id, form, command);
  AppendPayload(phone, exchange);
  if (!Transmit(phone)) return false;
  HandBack(phone, exchange);
  return true;
}

uint8_t ExportedCommand(KRAL_HANDLE handle, const Command& command, const uint8_t* payload, uint16_t payload_size,
                        uint8_t* response, uint16_t* response_size) {
  std::array<char, 64> function;
  std::snprintf(function.data(), function.size(), "KRAL_FTM_%s", command.name.data());
  const Exchange exchange{payload, payload_size, response, response_size};
  return ExportCall(handle, function.data())
      .Logged("( payload_size = %d, response_size = %d )", payload_size, response_size != nullptr ? *response_size : 0)
      .Run([&](Diag_FTM& phone) {
        return SendCommand(phone, static_cast<u16>(phone.state<Settings>().mode_id), HeaderForm::kPlain, command.id,
                           exchange);
      });
}

}  // namespace kral::ftm
