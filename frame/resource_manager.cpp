// The handle table: rows, their handles, and their release. What the rows own is built in context_objects.cpp; listing
// and choosing ports is in port_enumeration.cpp.
#include "frame/resource_manager.h"

#include <algorithm>
#include <array>
#include <string>
#include <utility>

#include "base/failure.h"
#include "frame/diag_ftm.h"
#include "frame/library_state.h"

namespace kral {

LibraryState& Library() {
  static LibraryState& library = *new LibraryState;
  return library;
}

Context* FindContext(LibraryState& library, KRAL_HANDLE handle) {
  if (handle == 0) return nullptr;
  const auto found =
      std::ranges::find_if(library.contexts, [handle](const Context& context) { return context.handle == handle; });
  return found == library.contexts.end() ? nullptr : &*found;
}

namespace {

void DestroyFamily(ContextObjects& objects, FamilySlot first, FamilySlot last) {
  for (auto slot = static_cast<size_t>(first); slot <= static_cast<size_t>(last); ++slot) objects.family[slot].reset();
}

// The order matters to handsets and servers: families that hang handlers on the phone object go before it, the rest
// after the port is closed.
void DestroyInOrder(ContextObjects objects) {
  objects.mutex.reset();
  DestroyFamily(objects, FamilySlot::kWlan, FamilySlot::kRfHal);
  if (objects.phone) objects.phone->Retire();
  objects.phone.reset();
  objects.server.reset();
  objects.download.reset();
  DestroyFamily(objects, FamilySlot::kEfs, FamilySlot::kServerPort);
}

}  // namespace

namespace Kral_ResourceManager {

KRAL_HANDLE CreateContext(uint16_t port) {
  if (port == kAnyPort) {
    std::array<uint16_t, 1> found = {kAnyPort};
    uint16_t count = 0;
    if (!AvailablePhonePorts(found, count, {}) || count == 0 || found[0] == kAnyPort) {
      Fail(Failure(KRAL_ERROR_NO_PORT, "no handset answers on any port"));
      return 0;
    }
    port = found[0];
  }
  auto& library = Library();
  const MutexLock lock(library.mutex);
  auto& rows = library.contexts;
  const auto shared = std::ranges::find_if(rows, [port](const Context& row) { return row.in_use && row.port == port; });
  if (shared != rows.end()) {
    ++shared->use_count;
    return shared->handle;
  }
  const auto free = std::ranges::find_if(rows, [](const Context& row) { return !row.in_use; });
  if (free == rows.end()) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%zu connections are in use, and there can be no more", rows.size()));
    return 0;
  }
  const std::string name =
      "Kral_ResourceManager::CreateContext() - #" + std::to_string(static_cast<int32_t>(library.context_counter++));
  auto mutex = library.mutex_maker(name);
  if (!mutex) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "no named mutex for the connection could be made"));
    return 0;
  }
  // On Windows the value may have been another connection's.
  library.last_errors.Forget(mutex->value());
  free->in_use = true;
  free->handle = mutex->value();
  free->port = port;
  free->use_count = 1;
  free->objects = {};
  free->objects.mutex = std::move(mutex);
  return free->handle;
}

void ReleaseContext(KRAL_HANDLE handle, bool force) {
  ContextObjects doomed;
  {
    auto& library = Library();
    const MutexLock lock(library.mutex);
    Context* context = FindContext(library, handle);
    if (context == nullptr) return;
    --context->use_count;
    if (context->use_count >= 1 && !force) return;
    doomed = std::exchange(context->objects, {});
    context->in_use = false;
    context->handle = 0;
  }
  DestroyInOrder(std::move(doomed));
}

void ReleaseAllContexts() {
  auto& library = Library();
  std::array<KRAL_HANDLE, Kral_ResourceManager::kContextCount> handles{};
  {
    const MutexLock lock(library.mutex);
    std::ranges::transform(library.contexts, handles.begin(),
                           [](const Context& row) { return row.in_use ? row.handle : KRAL_HANDLE{0}; });
  }
  for (const KRAL_HANDLE handle : handles) ReleaseContext(handle, true);
  std::shared_ptr<OrbtServer> port_info;
  const MutexLock lock(library.mutex);
  port_info.swap(library.port_info);
}

bool PortOf(KRAL_HANDLE handle, uint16_t& port) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  const Context* context = FindContext(library, handle);
  if (context == nullptr) return false;
  port = context->port;
  return true;
}

bool server_mode() {
  return Library().server_mode;
}
void SetServerMode(bool on) {
  Library().server_mode = on;
}

uint8_t target_type() {
  return Library().target_type;
}
void SetTargetType(uint8_t type) {
  if (type <= kTargetApplication) Library().target_type = type;
}

ReceiveMode default_receive_mode() {
  return Library().default_receive_mode;
}
void SetDefaultReceiveMode(ReceiveMode mode) {
  Library().default_receive_mode = mode;
}

void SetDeviceOpener(DeviceOpener opener) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.device_opener = std::move(opener);
}

void SetPortLister(PortLister lister) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.port_lister = lister ? std::move(lister) : PortLister(ListComPorts);
}

void SetMutexMaker(MutexMaker maker) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.mutex_maker = maker ? std::move(maker) : MutexMaker(CreateNamedMutex);
}

}  // namespace Kral_ResourceManager
}  // namespace kral
