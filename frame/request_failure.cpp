// Turns the outcomes of requests into the sentences and codes that callers get.
#include "frame/request_failure.h"

#include <algorithm>
#include <array>
#include <cstdio>

#include "frame/diag_ftm.h"
#include "platform/port_info.h"

namespace kral {
namespace {

struct Refusal {
  uint8_t code;
  const char* log_text;
  const char* reason;
};
constexpr Refusal kRefusals[] = {
    {refusal::kCommand, "DIAG_BAD_CMD_F (19) received, bad command", "it does not know the command"},
    {refusal::kParameter, "DIAG_BAD_PARM_F (20) received, bad parameter", "a parameter is wrong"},
    {refusal::kLength, "DIAG_BAD_LEN_F (21) received, bad request length", "the request has a wrong length"},
    {refusal::kMode, "DIAG_BAD_MODE_F (24) received, command is invalid for the current mode",
     "not in the present operating mode"},
};

const Refusal* FindRefusal(uint8_t code) {
  const auto* const found = std::ranges::find(kRefusals, code, &Refusal::code);
  return found == std::end(kRefusals) ? nullptr : found;
}

// "command 38"; "command 75/19/3" under the subsystem dispatch.
std::array<char, 24> CommandName(std::span<const uint8_t> request) {
  std::array<char, 24> name{};
  if (request.size() >= 4 && request[0] == kSubsystemDispatch) {
    std::snprintf(name.data(), name.size(), "command %d/%d/%d", request[0], request[1], request[2] | request[3] << 8);
  } else {
    std::snprintf(name.data(), name.size(), "command %d", request.empty() ? 0 : request[0]);
  }
  return name;
}

Failure Explain(Diag_FTM& phone, const Reply& reply, const char* command, uint32_t time_out_ms) {
  switch (reply.kind()) {
    case ReplyKind::kOther:
      if (const Refusal* const refusal = FindRefusal(reply.code())) {
        return Failure(KRAL_ERROR_REFUSED, "the handset refused %s with %d: %s", command, reply.code(), refusal->reason)
            .Status(KRAL_ERROR_STATUS_REFUSAL, reply.code());
      }
      return Failure(KRAL_ERROR_LINK, "%s was answered with a reply of %d", command, reply.code())
          .Status(KRAL_ERROR_STATUS_REPLY, reply.code());
    case ReplyKind::kGarbled:
      return Failure(KRAL_ERROR_LINK, "no undamaged answer to %s within %u ms: frames came with a wrong check", command,
                     time_out_ms);
    case ReplyKind::kGone:
    case ReplyKind::kGoneUnsent:
      return Failure(KRAL_ERROR_LOST, "the handset on COM%d went away during %s", phone.port(), command);
    case ReplyKind::kAborted:
      return Failure(KRAL_ERROR_ABORTED, "%s was aborted", command);
    case ReplyKind::kWriteFailed:
      return Failure(KRAL_ERROR_LINK, "%s could not be written to COM%d", command, phone.port());
    case ReplyKind::kNullPort:
      return Failure(KRAL_ERROR_NO_PORT, "%s was not sent: port %d is the null port", command, phone.port());
    case ReplyKind::kPortClosed:
      return PortFailure(phone);
    default:
      return Failure(KRAL_ERROR_NO_ANSWER, "no answer to %s within %u ms", command, time_out_ms);
  }
}

}  // namespace

Failure RequestFailure(Diag_FTM& phone, const Reply& reply, std::span<const uint8_t> request, uint32_t time_out_ms) {
  return Explain(phone, reply, CommandName(request).data(), time_out_ms).Command(request);
}

Failure PortFailure(Diag_FTM& phone) {
  const int port = phone.port();
  if (phone.server_mode()) return Failure(KRAL_ERROR_NO_PORT, "the phone server has no connection to port %d", port);
  if (phone.port_borrowed()) return Failure(KRAL_ERROR_ARGUMENT, "COM%d is held by a boot transfer", port);
  const CSerialPort& line = phone.transport().port();
  if (line.user_defined()) return Failure(KRAL_ERROR_NO_PORT, "the caller's transport is not connected");
  if (line.gone()) return Failure(KRAL_ERROR_LOST, "the device of COM%d went away", port);
  const DeviceResult& result = line.open_result();
  const auto system = static_cast<uint32_t>(result.system_code);
  switch (result.error) {
    case DeviceError::kNone:
      return Failure(KRAL_ERROR_ARGUMENT, "COM%d is closed", port);
    case DeviceError::kNoSuchPort:
      return Failure(KRAL_ERROR_NO_PORT, "there is no port COM%d", port).System(system);
    case DeviceError::kBusy:
      // Under another number of the same device.
      if (DescribeComPort(port).obstacle == PortObstacle::kInUseHere)
        return Failure(KRAL_ERROR_PORT_IN_USE, "the device of COM%d is open in this program already", port)
            .System(system);
      return Failure(KRAL_ERROR_PORT_IN_USE, "COM%d is in use by another program", port).System(system);
    case DeviceError::kNotPermitted:
      return Failure(KRAL_ERROR_PORT_IN_USE, "COM%d may not be opened by this user", port).System(system);
    default:
      return Failure(KRAL_ERROR_NO_PORT, "COM%d cannot be opened as a serial port", port).System(system);
  }
}

Failure BadReply(Diag_FTM& phone, const char* what) {
  const auto request = phone.packet().request();
  return Failure(KRAL_ERROR_LINK, "the reply to %s of %zu bytes %s", CommandName(request).data(),
                 phone.packet().response().size(), what)
      .Command(request);
}

const char* RefusalText(uint8_t code) {
  const Refusal* const refusal = FindRefusal(code);
  return refusal == nullptr ? nullptr : refusal->log_text;
}

}  // namespace kral
