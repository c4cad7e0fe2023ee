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

// Under the request lock; false, with the failure noted, also when there is no phone object.
template <class Operation>
bool OnPhone(KRAL_HANDLE handle, Operation operation) {
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  if (!phone) return Fail(Failure(KRAL_ERROR_NO_PORT, "there is no phone server"));
  const std::lock_guard lock(phone->request_lock());
  return operation(*phone);
}

}  // namespace

KRAL_HANDLE Connect(const char* function, uint16_t port, OpenArguments arguments) {
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(port);
  if (handle == 0) return 0;
  arguments.handle = handle;
  // A failed open is deliberately not told: the caller learns of it from the liveness check, or from the failure that
  // is recorded under the new handle.
  ExportCall(handle, function).Unlogged().Run(OpenPort, arguments);
  return handle;
}

KRAL_HANDLE ConnectWithVerify(uint16_t port) {
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(port);
  if (handle == 0) return 0;
  // After a failed open the context keeps its use count: intended.
  return OnPhone(handle, [](Diag_FTM& phone) { return phone.OpenPort({}); }) ? handle : 0;
}

// The end is compared as it is: where the tick count wraps around before it, the attempts end early. Intended. Where it
// wraps in the last attempt the time that has passed ends them, or they would go on for another round of the count.
KRAL_HANDLE ConnectWithWait(uint16_t port, uint32_t wait_ms, Clock& clock) {
  const uint32_t start = clock.TickMs();
  const auto has_time = [&clock, start, wait_ms] {
    const uint32_t now = clock.TickMs();
    return now < start + wait_ms && now - start < wait_ms;
  };
  KRAL_HANDLE handle = 0;
  do {
    // Every attempt counts as a connect: the use count of the row grows by one each time.
    handle = Kral_ResourceManager::CreateContext(port);
    const bool answers =
        handle != 0 && OnPhone(handle, [](Diag_FTM& phone) { return phone.OpenPort({}) && phone.IsPhoneConnected(); });
    clock.SleepMs(kAttemptIntervalMs);
    if (answers) return handle;
  } while (has_time());
  const KeepFailure keep;
  if (handle != 0) Disconnect(handle);
  return 0;
}

void Disconnect(KRAL_HANDLE handle) {
  ExportCall(handle, "KRAL_DisconnectServer").Logged("()").Run(&Diag_FTM::ClosePort);
  Kral_ResourceManager::ReleaseContext(handle, false);
}

}  // namespace kral
