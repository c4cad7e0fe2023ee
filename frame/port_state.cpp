// Translates what the transport knows of its port into the states that callers are told; exports them.
#include "frame/port_state.h"

#include "frame/diag_ftm.h"
#include "frame/export_call.h"
#include "kral/connection.h"

namespace kral {
namespace {

int32_t StateAfter(DeviceError error) {
  switch (error) {
    case DeviceError::kNone:
      return KRAL_PORT_CLOSED;
    case DeviceError::kNoSuchPort:
      return KRAL_PORT_NOT_FOUND;
    case DeviceError::kBusy:
      return KRAL_PORT_BUSY;
    case DeviceError::kNotPermitted:
      return KRAL_PORT_NOT_PERMITTED;
    default:
      return KRAL_PORT_FAILED;
  }
}

}  // namespace

int32_t PortState(Diag_FTM& phone) {
  if (phone.server_mode()) return phone.connected() ? KRAL_PORT_OPEN : KRAL_PORT_CLOSED;
  CKralThreadInterface& transport = phone.transport();
  if (transport.null_port()) return KRAL_PORT_OPEN;
  CSerialPort& port = transport.port();
  if (port.gone()) return KRAL_PORT_GONE;
  if (transport.connected() || phone.port_borrowed()) return KRAL_PORT_OPEN;
  if (port.user_defined()) return KRAL_PORT_CLOSED;
  return StateAfter(port.open_result().error);
}

}  // namespace kral

extern "C" {

uint8_t KRAL_CALL KRAL_GetPortState(KRAL_HANDLE handle, int32_t* state) {
  return kral::ExportCall(handle, __func__)
      .Require(state != nullptr, "there is no room for the state")
      .Run([state](kral::Diag_FTM& phone) {
        *state = kral::PortState(phone);
        return true;
      });
}

}  // extern "C"
