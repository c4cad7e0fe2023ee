// Exports of the library settings, the port lists, connecting and disconnecting.
#include <algorithm>
#include <span>

#include "frame/connect.h"
#include "frame/export_call.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "frame/version.h"
#include "kral/connection.h"
#include "platform/process.h"

namespace {

using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::UnknownHandle;
namespace table = kral::Kral_ResourceManager;

constexpr const char* kNoOutput = "there is no room for the output";

// Functions without a handle have no log to tell of an exception: it becomes the record of a failure.
template <class Operation>
uint8_t Without(const char* function, Operation operation) {
  return ExportCall(function).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t { return operation() ? 1 : 0; });
}

template <class Operation>
void Do(const char* function, Operation operation) {
  Without(function, [&] {
    operation();
    return true;
  });
}

bool IsRoom(const uint16_t* count, const uint16_t* ports) {
  return count != nullptr && (ports != nullptr || *count == 0);
}

bool CannotList() {
  return Fail(Failure(KRAL_ERROR_INTERNAL, "the system does not list its ports"));
}

uint16_t Low16(uint32_t port) {
  return static_cast<uint16_t>(port);
}

KRAL_HANDLE ConnectWith(const char* function, uint32_t port, const kral::OpenArguments& arguments) {
  return ExportCall(function).Connecting([&] { return kral::Connect(function, Low16(port), arguments); });
}

bool IsReceiveMode(uint8_t mode) {
  return mode <= static_cast<uint8_t>(kral::ReceiveMode::kWakeOnData);
}

bool BadReceiveMode(uint8_t mode) {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "the receive mode %d is neither 0 nor 1", mode));
}

}  // namespace

extern "C" {

void KRAL_CALL KRAL_SetLibraryMode(uint8_t mode) {
  table::SetServerMode(mode == 1);
}

void KRAL_CALL KRAL_SetTargetType(uint8_t type) {
  table::SetTargetType(type);
}

void KRAL_CALL KRAL_GetLibraryVersion(char* text) {
  if (text == nullptr) return;
  Do(__func__, [text] {
    const std::string version = kral::LibraryVersion();
    std::copy_n(version.c_str(), version.size() + 1, text);
  });
}

uint32_t KRAL_CALL KRAL_GetLibraryVersionNumber(void) {
  return (kral::kVersionMajor << 16) + (kral::kVersionMinor << 8) + kral::kVersionPatch;
}

uint8_t KRAL_CALL KRAL_SetDefaultReceiveMode(uint8_t mode) {
  return Without(__func__, [mode] {
    if (!IsReceiveMode(mode)) return BadReceiveMode(mode);
    table::SetDefaultReceiveMode(static_cast<kral::ReceiveMode>(mode));
    return true;
  });
}

uint8_t KRAL_CALL KRAL_GetAllPortList(uint16_t* count, uint16_t* ports) {
  return ExportCall(__func__).Require(IsRoom(count, ports), kNoOutput).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    return table::AllPorts({ports, *count}, *count) || CannotList();
  });
}

uint8_t KRAL_CALL KRAL_GetAvailablePhonesPortList(uint16_t* count, uint16_t* ports, uint16_t ignore_count,
                                                  const uint16_t* ignore_list) {
  const size_t ignored = ignore_list == nullptr ? 0 : ignore_count;
  return ExportCall(__func__).Require(IsRoom(count, ports), kNoOutput).Alone(uint8_t{0}, uint8_t{1}, [&]() -> uint8_t {
    return table::AvailablePhonePorts({ports, *count}, *count, {ignore_list, ignored}) || CannotList();
  });
}

uint8_t KRAL_CALL KRAL_AddPortAliasEntry(uint16_t logical, uint16_t physical) {
  Do(__func__, [&] { table::AddPortAlias(logical, physical); });
  return 1;
}

uint8_t KRAL_CALL KRAL_ClearPortAliasList(void) {
  table::ClearPortAliases();
  return 1;
}

uint8_t KRAL_CALL KRAL_GetComPortNumber(KRAL_HANDLE handle, uint16_t* port) {
  return ExportCall(handle, __func__)
      .Require(port != nullptr, kNoOutput)
      .Alone(uint8_t{0}, uint8_t{1}, [=]() -> uint8_t {
        if (table::PortOf(handle, *port)) return 1;
        Fail(UnknownHandle(handle));
        return 0;
      });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer(uint32_t port) {
  return ConnectWith(__func__, port, {});
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithHandShake(uint32_t port) {
  kral::OpenArguments arguments;
  arguments.handshake = true;
  return ConnectWith(__func__, port, arguments);
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithVerify(uint32_t port) {
  return ExportCall(__func__).Connecting([=] { return kral::ConnectWithVerify(Low16(port)); });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_LogicalPort(uint32_t logical_port) {
  return ExportCall(__func__).Connecting([=]() -> KRAL_HANDLE {
    uint16_t physical = 0;
    if (table::ResolvePortAlias(Low16(logical_port), physical))
      return kral::Connect("KRAL_ConnectServer_LogicalPort", physical, {});
    Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no alias for the logical port %u", logical_port));
    return 0;
  });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithWait(uint32_t port, uint32_t wait_ms) {
  return ExportCall(__func__).Connecting([=] { return kral::ConnectWithWait(Low16(port), wait_ms); });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_UserDefinedTransport(uint32_t port, uintptr_t transport, uintptr_t context,
                                                              KRAL_SEND_FUNCTION send, KRAL_RECEIVE_FUNCTION receive,
                                                              KRAL_FLUSH_FUNCTION flush) {
  KRAL_SetLibraryMode(0);
  kral::OpenArguments arguments;
  arguments.port = port;
  arguments.user = {transport, context, send, receive, flush};
  return ConnectWith(__func__, port, arguments);
}

void KRAL_CALL KRAL_DisconnectServer(KRAL_HANDLE handle) {
  Do(__func__, [handle] { kral::Disconnect(handle); });
}

void KRAL_CALL KRAL_DisconnectAllServers(void) {
  Do(__func__, [] { table::ReleaseAllContexts(); });
}

void KRAL_CALL KRAL_TerminateORBTServer(void) {
  Do(__func__, [] { kral::TerminateProcessByName("ORBTServer.exe"); });
}

uint8_t KRAL_CALL KRAL_IsPhoneConnected(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run([](kral::Diag_FTM& phone) { return phone.IsPhoneConnected(); });
}

uint8_t KRAL_CALL KRAL_SetReceiveMode(KRAL_HANDLE handle, uint8_t mode) {
  return ExportCall(handle, __func__).Logged("( iMode = %d )", mode).RunAtOnce([mode](kral::Diag_FTM& phone) {
    if (!IsReceiveMode(mode)) return BadReceiveMode(mode);
    return phone.SetReceiveMode(static_cast<kral::ReceiveMode>(mode)) ||
           Fail(Failure(KRAL_ERROR_ARGUMENT, "through a phone server nothing is received here"));
  });
}

uint8_t KRAL_CALL KRAL_SetData2DiagSearch(KRAL_HANDLE handle, uint8_t search) {
  return ExportCall(handle, __func__).Logged("( bSearch = %d )", search).RunAtOnce([search](kral::Diag_FTM& phone) {
    phone.SetData2DiagSearch(search == 1);
    return true;
  });
}

}  // extern "C"
