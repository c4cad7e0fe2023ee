// Exports of the caller's own requests, the packet modes and the lines of the port.
#include <span>

#include "frame/export_call.h"
#include "kral/transport.h"

namespace {

using kral::Diag_FTM;
using kral::LogFormatted;
using kral::LogName;
using kral::OnPhone;
using kral::OnPhoneAtOnce;

using Request = std::span<const uint8_t>;

// Through a phone server there is no framer to talk to.
bool IsRefused(Diag_FTM& phone, const char* name) {
  if (!phone.server_mode()) return false;
  phone.log().WriteLine(kral::kLogErr, "%s() : FAIL in ORBT mode", name);
  return true;
}

// A missing response, or a missing count of its room, is no room.
uint16_t Room(const uint16_t* response_size, const uint8_t* response) {
  return response_size != nullptr && response != nullptr ? *response_size : uint16_t{0};
}

bool SendSync(Diag_FTM& phone, Request request, uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  uint16_t size = Room(response_size, response);
  const bool sent = phone.SendSync(request, response, size, request[0], time_out_ms);
  if (response_size != nullptr) *response_size = size;
  return sent;
}

bool SendASync(Diag_FTM& phone, Request request, uint32_t time_out_ms, uint8_t start_flag) {
  if (IsRefused(phone, "KRAL_SendASync")) return false;
  return phone.IsPortOpen() && phone.transport().SendASync(request, time_out_ms, start_flag != 0);
}

bool SendRaw(Diag_FTM& phone, Request request, uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  // Success for a request that was not sent: callers that run through a server rely on it.
  if (IsRefused(phone, "KRAL_SendRAW")) return true;
  if (!phone.IsPortOpen()) return false;
  uint16_t size = Room(response_size, response);
  const bool received = phone.transport().SendRaw(request, response, size, time_out_ms);
  if (response_size != nullptr) *response_size = size;
  return received;
}

bool SetStartFlag(Diag_FTM& phone, uint8_t start_flag) {
  if (IsRefused(phone, "KRAL_SetStartFlag")) return false;
  phone.log().WriteLine(kral::kLogRet, "START_FLAG = %s", start_flag != 0 ? "ON" : "OFF");
  // The former setting, not success: kept.
  return phone.transport().framer().SetStartFlag(start_flag) != 0;
}

bool SetPacketMode(Diag_FTM& phone, uint32_t mode) {
  if (IsRefused(phone, "KRAL_SetPacketMode")) return false;
  auto& transport = phone.transport();
  // A closed port fails here, before anything of a caller's transport is called that may be gone by now.
  if (transport.NeedsPhoneFor(mode) && !phone.IsPortOpen()) return false;
  if (!transport.SetPacketMode(mode)) return false;
  phone.SetFramed(mode == 0);
  return true;
}

bool FlushReceiveBuffer(Diag_FTM& phone) {
  return !phone.server_mode() && phone.transport().FlushRxBuffer();
}

using SetLine = int32_t (kral::CSerialPort::*)(uint8_t state);

// Only a result of exactly 1 is a failure. A COM port therefore always reports success, and RTS on a caller's
// transport never: kept.
bool SetPortLine(Diag_FTM& phone, SetLine set_line, uint8_t state) {
  if (phone.server_mode() || !phone.transport().connected()) return false;
  return (phone.transport().port().*set_line)(state) != 1;
}

bool SetWriteSizeLimit(Diag_FTM& phone, uint32_t bytes) {
  if (phone.server_mode() || bytes == 0) return false;
  phone.transport().port().SetWriteSizeLimit(bytes);
  return true;
}

bool SetRawPacketCallback(Diag_FTM& phone, KRAL_RAW_PACKET_CALLBACK callback, uintptr_t value) {
  phone.sorter().SetRawPacketCallback(callback, value);
  return true;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_SendSync(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  LogName(handle, "KRAL_SendSync");
  if (request == nullptr || request_size == 0) return 0;
  return OnPhone(handle, SendSync, Request(request, request_size), response_size, response, time_out_ms);
}

uint8_t KRAL_CALL KRAL_SendASync(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                 uint32_t time_out_ms, uint8_t start_flag) {
  LogName(handle, "KRAL_SendASync");
  if (request == nullptr || request_size == 0) return 0;
  return OnPhone(handle, SendASync, Request(request, request_size), time_out_ms, start_flag);
}

uint8_t KRAL_CALL KRAL_SendRAW(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                               uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  LogName(handle, "KRAL_SendRAW");
  if (request == nullptr || request_size == 0) return 0;
  return OnPhone(handle, SendRaw, Request(request, request_size), response_size, response, time_out_ms);
}

uint8_t KRAL_CALL KRAL_SetStartFlag(KRAL_HANDLE handle, uint8_t start_flag) {
  LogFormatted(handle, "KRAL_SetStartFlag(bStartFlag=%d )", start_flag);
  return OnPhone(handle, SetStartFlag, start_flag);
}

uint8_t KRAL_CALL KRAL_SetPacketMode(KRAL_HANDLE handle, uint32_t mode) {
  LogFormatted(handle, "KRAL_SetPacketMode( iPacketMode = %u )", mode);
  return OnPhone(handle, SetPacketMode, mode);
}

uint8_t KRAL_CALL KRAL_FlushRxBuffer(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_FlushRxBuffer");
  return OnPhone(handle, FlushReceiveBuffer);
}

uint8_t KRAL_CALL KRAL_ConfigureCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK callback, uintptr_t value) {
  LogName(handle, "KRAL_ConfigureCallBacks");
  return OnPhoneAtOnce(handle, SetRawPacketCallback, callback, value);
}

uint8_t KRAL_CALL KRAL_SetDTR_State(KRAL_HANDLE handle, uint8_t state) {
  LogFormatted(handle, "KRAL_SetDTR_State(bSetDTR_High=%d)", state);
  return OnPhone(handle, SetPortLine, SetLine{&kral::CSerialPort::SetDTR}, state);
}

uint8_t KRAL_CALL KRAL_SetRTS_State(KRAL_HANDLE handle, uint8_t state) {
  LogFormatted(handle, "KRAL_SetRTS_State(bSetRTS_High=%d)", state);
  return OnPhone(handle, SetPortLine, SetLine{&kral::CSerialPort::SetRTS}, state);
}

uint8_t KRAL_CALL KRAL_SetSendDataSerialWriteSizeLimit(KRAL_HANDLE handle, uint32_t bytes) {
  LogFormatted(handle, "KRAL_SetSendDataSerialWriteSizeLimit( iBytes = %u )", bytes);
  return OnPhoneAtOnce(handle, SetWriteSizeLimit, bytes);
}

}  // extern "C"
