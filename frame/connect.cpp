// Connects handsets: a context for the port, its phone object, and the opening of the port in the order that each way
// of connecting asks for.
#include "frame/connect.h"

#include "frame/export_call.h"
#include "frame/resource_manager.h"

namespace kral {
namespace {

constexpr uint32_t kAttemptIntervalMs = 10;

bool OpenPort(Diag_FTM& phone, const OpenArguments& arguments) {
  return phone.OpenPort(arguments);
}

bool OpenAndAsk(Diag_FTM& phone) {
  return phone.OpenPort({}) && phone.IsPhoneConnected();
}

bool ClosePort(Diag_FTM& phone) {
  return phone.ClosePort();
}

}  // namespace

KRAL_HANDLE Connect(uint16_t port, OpenArguments arguments) {
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(port);
  arguments.handle = handle;
  // A failed open is deliberately not told: the caller learns of it from the liveness check.
  OnPhone(handle, OpenPort, arguments);
  return handle;
}

KRAL_HANDLE ConnectWithVerify(uint16_t port) {
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(port);
  // After a failed open the context keeps its use count: intended.
  return OnPhone(handle, OpenPort, OpenArguments{}) == 1 ? handle : 0;
}

// The end is compared as it is: where the tick count wraps around before it, the attempts end early. Intended.
KRAL_HANDLE ConnectWithWait(uint16_t port, uint32_t wait_ms) {
  Clock& clock = SystemClock();
  const uint32_t end = clock.TickMs() + wait_ms;
  KRAL_HANDLE handle = 0;
  do {
    // Every attempt counts as a connect: the use count of the row grows by one each time.
    handle = Kral_ResourceManager::CreateContext(port);
    const bool answers = OnPhone(handle, OpenAndAsk) == 1;
    clock.SleepMs(kAttemptIntervalMs);
    if (answers) return handle;
  } while (clock.TickMs() < end);
  if (handle != 0) Disconnect(handle);
  return 0;
}

void Disconnect(KRAL_HANDLE handle) {
  LogFormatted(handle, "KRAL_DisconnectServer()");
  OnPhone(handle, ClosePort);
  Kral_ResourceManager::ReleaseContext(handle, false);
}

}  // namespace kral
