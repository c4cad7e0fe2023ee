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

using kral::LogFormatted;
using kral::LogName;
using kral::OnPhone;
using kral::OnPhoneAtOnce;
namespace table = kral::Kral_ResourceManager;

// Functions without a handle have no log to tell of an exception: it becomes the result of a failure.
template <class Result, class Function>
Result Guarded(Result failure, Function function) noexcept {
  try {
    return function();
  } catch (...) {
    return failure;
  }
}

template <class Function>
void Guarded(Function function) noexcept {
  try {
    function();
  } catch (...) {
  }
}

uint16_t Low16(uint32_t port) {
  return static_cast<uint16_t>(port);
}

KRAL_HANDLE ConnectWith(uint32_t port, const kral::OpenArguments& arguments) noexcept {
  return Guarded(KRAL_HANDLE{0}, [&] { return kral::Connect(Low16(port), arguments); });
}

bool IsReceiveMode(uint8_t mode) {
  return mode <= static_cast<uint8_t>(kral::ReceiveMode::kWakeOnData);
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
  Guarded([text] {
    const std::string version = kral::LibraryVersion();
    std::copy_n(version.c_str(), version.size() + 1, text);
  });
}

uint8_t KRAL_CALL KRAL_SetDefaultReceiveMode(uint8_t mode) {
  if (!IsReceiveMode(mode)) return 0;
  table::SetDefaultReceiveMode(static_cast<kral::ReceiveMode>(mode));
  return 1;
}

uint8_t KRAL_CALL KRAL_GetAllPortList(uint16_t* count, uint16_t* ports) {
  if (count == nullptr || (ports == nullptr && *count > 0)) return 0;
  return Guarded(uint8_t{0}, [&] { return uint8_t{table::AllPorts({ports, *count}, *count)}; });
}

uint8_t KRAL_CALL KRAL_GetAvailablePhonesPortList(uint16_t* count, uint16_t* ports, uint16_t ignore_count,
                                                  const uint16_t* ignore_list) {
  if (count == nullptr || (ports == nullptr && *count > 0)) return 0;
  const size_t ignored = ignore_list == nullptr ? 0 : ignore_count;
  return Guarded(uint8_t{0}, [&] {
    return uint8_t{table::AvailablePhonePorts({ports, *count}, *count, {ignore_list, ignored})};
  });
}

uint8_t KRAL_CALL KRAL_AddPortAliasEntry(uint16_t logical, uint16_t physical) {
  Guarded([&] { table::AddPortAlias(logical, physical); });
  return 1;
}

uint8_t KRAL_CALL KRAL_ClearPortAliasList(void) {
  table::ClearPortAliases();
  return 1;
}

uint8_t KRAL_CALL KRAL_GetComPortNumber(KRAL_HANDLE handle, uint16_t* port) {
  LogName(handle, "KRAL_GetComPortNumber");
  return port != nullptr && table::PortOf(handle, *port) ? 1 : 0;
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer(uint32_t port) {
  return ConnectWith(port, {});
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithHandShake(uint32_t port) {
  kral::OpenArguments arguments;
  arguments.handshake = true;
  return ConnectWith(port, arguments);
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithVerify(uint32_t port) {
  return Guarded(KRAL_HANDLE{0}, [=] { return kral::ConnectWithVerify(Low16(port)); });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_LogicalPort(uint32_t logical_port) {
  uint16_t physical = 0;
  return table::ResolvePortAlias(Low16(logical_port), physical) ? ConnectWith(physical, {}) : 0;
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServerWithWait(uint32_t port, uint32_t wait_ms) {
  return Guarded(KRAL_HANDLE{0}, [=] { return kral::ConnectWithWait(Low16(port), wait_ms); });
}

KRAL_HANDLE KRAL_CALL KRAL_ConnectServer_UserDefinedTransport(uint32_t port, uintptr_t transport, uintptr_t context,
                                                              KRAL_SEND_FUNCTION send, KRAL_RECEIVE_FUNCTION receive,
                                                              KRAL_FLUSH_FUNCTION flush) {
  KRAL_SetLibraryMode(0);
  kral::OpenArguments arguments;
  arguments.port = port;
  arguments.user = {transport, context, send, receive, flush};
  return ConnectWith(port, arguments);
}

void KRAL_CALL KRAL_DisconnectServer(KRAL_HANDLE handle) {
  Guarded([handle] { kral::Disconnect(handle); });
}

void KRAL_CALL KRAL_DisconnectAllServers(void) {
  Guarded([] { table::ReleaseAllContexts(); });
}

void KRAL_CALL KRAL_TerminateORBTServer(void) {
  Guarded([] { kral::TerminateProcessByName("ORBTServer.exe"); });
}

uint8_t KRAL_CALL KRAL_IsPhoneConnected(KRAL_HANDLE handle) {
  LogName(handle, "KRAL_IsPhoneConnected");
  return OnPhone(handle, [](kral::Diag_FTM& phone) { return phone.IsPhoneConnected(); });
}

uint8_t KRAL_CALL KRAL_SetReceiveMode(KRAL_HANDLE handle, uint8_t mode) {
  LogFormatted(handle, "KRAL_SetReceiveMode( iMode = %d )", mode);
  return OnPhoneAtOnce(handle, [mode](kral::Diag_FTM& phone) {
    return IsReceiveMode(mode) && phone.SetReceiveMode(static_cast<kral::ReceiveMode>(mode));
  });
}

uint8_t KRAL_CALL KRAL_SetData2DiagSearch(KRAL_HANDLE handle, uint8_t search) {
  LogFormatted(handle, "KRAL_SetData2DiagSearch( bSearch = %d )", search);
  return OnPhoneAtOnce(handle, [search](kral::Diag_FTM& phone) {
    phone.SetData2DiagSearch(search == 1);
    return true;
  });
}

}  // extern "C"
