// Exports of the caller's own requests, the packet modes and the lines of the port.
#include <span>

#include "frame/export_call.h"
#include "frame/request_failure.h"
#include "kral/transport.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;

using kral::Fail;
using kral::Failure;
using kral::Reply;

using Request = std::span<const uint8_t>;

constexpr const char* kNoRequest = "the request is missing or empty";

bool IsThere(const uint8_t* request, uint16_t size) {
  return request != nullptr && size > 0;
}

// Through a phone server there is no framer to talk to.
bool IsRefused(Diag_FTM& phone, const char* name) {
  if (!phone.server_mode()) return false;
  phone.log().WriteLine(kral::kLogErr, "%s() : FAIL in ORBT mode", name);
  Fail(Failure(KRAL_ERROR_ARGUMENT, "%s is not possible through a phone server", name));
  return true;
}

// A missing response, or a missing count of its room, is no room.
std::span<uint8_t> Room(const uint16_t* response_size, uint8_t* response) {
  return {response, response_size != nullptr && response != nullptr ? *response_size : size_t{0}};
}

// Where nothing came the caller's size stays, as far as there is room.
bool HandBack(const Reply& reply, std::span<const uint8_t> room, uint16_t* response_size) {
  if (response_size != nullptr)
    *response_size = static_cast<uint16_t>(reply.came() ? reply.bytes().size() : room.size());
  return static_cast<bool>(reply);
}

bool SendSync(Diag_FTM& phone, Request request, uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  const auto room = Room(response_size, response);
  Reply reply = phone.Synchronise(time_out_ms);
  if (reply) reply = phone.SendSync(request, room, request[0], time_out_ms);
  return HandBack(reply, room, response_size);
}

bool SendASync(Diag_FTM& phone, Request request, uint32_t time_out_ms, uint8_t start_flag) {
  if (IsRefused(phone, "KRAL_SendASync")) return false;
  const Reply reply = phone.SendASync(request, time_out_ms, start_flag != 0);
  if (reply) phone.OweAnswer();
  return static_cast<bool>(reply);
}

bool SendRaw(Diag_FTM& phone, Request request, uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  // Success for a request that was not sent: callers that run through a server rely on it.
  if (IsRefused(phone, "KRAL_SendRAW")) return true;
  const auto room = Room(response_size, response);
  return HandBack(phone.SendRaw(request, room, time_out_ms), room, response_size);
}

bool SetStartFlag(Diag_FTM& phone, uint8_t start_flag) {
  if (IsRefused(phone, "KRAL_SetStartFlag")) return false;
  phone.log().WriteLine(kral::kLogRet, "START_FLAG = %s", start_flag != 0 ? "ON" : "OFF");
  // The former setting, not success: kept.
  return phone.transport().framer().SetStartFlag(start_flag) != 0;
}

constexpr uint32_t kLastPacketMode = 3;

Failure NotAgreed(Diag_FTM& phone, const Reply& reply, uint32_t mode) {
  using Transport = kral::CKralThreadInterface;
  if (mode == 0) return Failure(KRAL_ERROR_NO_ANSWER, "the handset did not agree to packet mode 0");
  if (reply.code() == Transport::kUnframedModeRequest[0]) {
    return Failure(KRAL_ERROR_REFUSED, "the handset did not agree to packet mode %u", mode)
        .Command(Transport::kUnframedModeRequest);
  }
  return kral::RequestFailure(phone, reply, Transport::kUnframedModeRequest, Transport::kUnframedModeMs);
}

bool SetPacketMode(Diag_FTM& phone, uint32_t mode) {
  if (IsRefused(phone, "KRAL_SetPacketMode")) return false;
  auto& transport = phone.transport();
  // A closed port fails here, before anything of a caller's transport is called that may be gone by now.
  if (transport.NeedsPhoneFor(mode) && !phone.IsPortOpen()) return Fail(kral::PortFailure(phone));
  if (mode > kLastPacketMode) {
    transport.SetPacketMode(mode);  // logs it
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the packet mode %u is not one of 0 to 3", mode));
  }
  const Reply reply = transport.SetPacketMode(mode);
  if (!reply) return Fail(NotAgreed(phone, reply, mode));
  phone.SetFramed(mode == 0);
  return true;
}

bool FlushReceiveBuffer(Diag_FTM& phone) {
  if (!phone.server_mode() && phone.transport().FlushRxBuffer()) return true;
  return Fail(kral::PortFailure(phone));
}

using SetLine = int32_t (kral::CSerialPort::*)(uint8_t state);

// Only a result of exactly 1 is a failure. A COM port therefore always reports success, and RTS on a caller's
// transport never: kept.
bool SetPortLine(Diag_FTM& phone, SetLine set_line, uint8_t state) {
  if (phone.server_mode() || !phone.transport().connected()) return Fail(kral::PortFailure(phone));
  if ((phone.transport().port().*set_line)(state) != 1) return true;
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "a caller's transport has no such line"));
}

bool SetWriteSizeLimit(Diag_FTM& phone, uint32_t bytes) {
  if (phone.server_mode()) return Fail(kral::PortFailure(phone));
  if (bytes == 0) return Fail(Failure(KRAL_ERROR_ARGUMENT, "a write size limit of 0 bytes"));
  phone.transport().port().SetWriteSizeLimit(bytes);
  return true;
}

Failure NoCallersTransport() {
  return Failure(KRAL_ERROR_ARGUMENT, "the connection does not go through functions of the caller");
}

bool NotifyReceived(Diag_FTM& phone) {
  return (!phone.server_mode() && phone.transport().NotifyReceived()) || Fail(NoCallersTransport());
}

bool SetReceiveWait(Diag_FTM& phone, uint32_t milliseconds) {
  if (phone.server_mode()) return Fail(NoCallersTransport());
  if (milliseconds > KRAL_LONGEST_RECEIVE_WAIT) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "a receive function that waits %u ms holds up a disconnect: at most %u ms",
                        milliseconds, static_cast<unsigned>(KRAL_LONGEST_RECEIVE_WAIT)));
  }
  phone.transport().SetCallersWait(milliseconds);
  return true;
}

bool SetResynchronise(Diag_FTM& phone, bool on) {
  phone.SetResynchronise(on);
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
  return ExportCall(handle, __func__)
      .Require(IsThere(request, request_size), kNoRequest)
      .Run(SendSync, Request(request, request_size), response_size, response, time_out_ms);
}

uint8_t KRAL_CALL KRAL_SendASync(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                                 uint32_t time_out_ms, uint8_t start_flag) {
  return ExportCall(handle, __func__)
      .Require(IsThere(request, request_size), kNoRequest)
      .Run(SendASync, Request(request, request_size), time_out_ms, start_flag);
}

uint8_t KRAL_CALL KRAL_SendRAW(KRAL_HANDLE handle, uint16_t request_size, const uint8_t* request,
                               uint16_t* response_size, uint8_t* response, uint32_t time_out_ms) {
  return ExportCall(handle, __func__)
      .Require(IsThere(request, request_size), kNoRequest)
      .Run(SendRaw, Request(request, request_size), response_size, response, time_out_ms);
}

uint8_t KRAL_CALL KRAL_SetStartFlag(KRAL_HANDLE handle, uint8_t start_flag) {
  return ExportCall(handle, __func__).Logged("(bStartFlag=%d )", start_flag).Answering().Run(SetStartFlag, start_flag);
}

uint8_t KRAL_CALL KRAL_SetPacketMode(KRAL_HANDLE handle, uint32_t mode) {
  return ExportCall(handle, __func__).Logged("( iPacketMode = %u )", mode).Run(SetPacketMode, mode);
}

uint8_t KRAL_CALL KRAL_FlushRxBuffer(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run(FlushReceiveBuffer);
}

uint8_t KRAL_CALL KRAL_ConfigureCallBacks(KRAL_HANDLE handle, KRAL_RAW_PACKET_CALLBACK callback, uintptr_t value) {
  return ExportCall(handle, __func__).RunAtOnce(SetRawPacketCallback, callback, value);
}

uint8_t KRAL_CALL KRAL_SetDTR_State(KRAL_HANDLE handle, uint8_t state) {
  return ExportCall(handle, __func__)
      .Logged("(bSetDTR_High=%d)", state)
      .Run(SetPortLine, SetLine{&kral::CSerialPort::SetDTR}, state);
}

uint8_t KRAL_CALL KRAL_SetRTS_State(KRAL_HANDLE handle, uint8_t state) {
  return ExportCall(handle, __func__)
      .Logged("(bSetRTS_High=%d)", state)
      .Run(SetPortLine, SetLine{&kral::CSerialPort::SetRTS}, state);
}

uint8_t KRAL_CALL KRAL_SetResynchronise(KRAL_HANDLE handle, uint8_t on) {
  return ExportCall(handle, __func__).Logged("( bOn = %d )", on).RunAtOnce(SetResynchronise, on == 1);
}

uint8_t KRAL_CALL KRAL_NotifyReceived(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Unlogged().RunAtOnce(NotifyReceived);
}

uint8_t KRAL_CALL KRAL_SetReceiveWait(KRAL_HANDLE handle, uint32_t milliseconds) {
  return ExportCall(handle, __func__).Logged("( iWait_ms = %u )", milliseconds).RunAtOnce(SetReceiveWait, milliseconds);
}

uint8_t KRAL_CALL KRAL_SetSendDataSerialWriteSizeLimit(KRAL_HANDLE handle, uint32_t bytes) {
  return ExportCall(handle, __func__).Logged("( iBytes = %u )", bytes).RunAtOnce(SetWriteSizeLimit, bytes);
}

}  // extern "C"
