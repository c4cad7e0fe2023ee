// Builds what a context row owns, on first use. Nothing is built under the table lock, so a row may be released
// meanwhile: what was built for it is then thrown away.
#include <functional>
#include <type_traits>
#include <utility>

#include "frame/diag_ftm.h"
#include "frame/library_state.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "platform/com_port_opener.h"
#include "platform/forced_unwind.h"

namespace kral {
namespace {

constexpr uint32_t kServerConnectWaitMs = 200;

bool IsServerModeOnly(FamilySlot slot) {
  return slot == FamilySlot::kEfs || slot == FamilySlot::kServerPort;
}

// The pointer of the row with that handle that a projection chooses; null for an unknown handle.
template <class Choose>
auto Owned(KRAL_HANDLE handle, Choose choose) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  Context* const context = FindContext(library, handle);
  using Pointer = std::remove_reference_t<std::invoke_result_t<Choose, ContextObjects&>>;
  return context == nullptr ? Pointer() : std::invoke(choose, context->objects);
}

// False when the row is gone.
template <class Choose, class T>
bool Own(KRAL_HANDLE handle, Choose choose, const std::shared_ptr<T>& object) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  Context* const context = FindContext(library, handle);
  if (context == nullptr) return false;
  std::invoke(choose, context->objects) = object;
  return true;
}

// The projection of a slot.
struct FamilyIn {
  FamilySlot slot;
  std::shared_ptr<FamilyObject>& operator()(ContextObjects& objects) const {
    return objects.family[static_cast<size_t>(slot)];
  }
};

// The row's proxy, connected to its port when it is new.
std::shared_ptr<OrbtServer> GetServer(KRAL_HANDLE handle, uint16_t port) {
  if (auto server = Owned(handle, &ContextObjects::server)) return server;
  auto server = MakeServer("KRAL");
  if (!server) return nullptr;
  server->ConnectToPort(port, kServerConnectWaitMs);
  return Own(handle, &ContextObjects::server, server) ? server : nullptr;
}

std::shared_ptr<Diag_FTM> MakePhone(KRAL_HANDLE handle, uint16_t port) {
  std::shared_ptr<Diag_FTM> phone;
  if (Kral_ResourceManager::server_mode()) {
    auto server = GetServer(handle, port);
    if (!server) return nullptr;
    phone = std::make_shared<Diag_FTM>(std::move(server), port);
  } else {
    DeviceOpener opener;
    {
      auto& library = Library();
      const MutexLock lock(library.mutex);
      opener = library.device_opener;
    }
    const ComPortOpener com_ports;
    if (!opener) opener = com_ports;
    phone = std::make_shared<Diag_FTM>(port, SystemClock(), std::move(opener));
    phone->state<ComPortOpener>() = com_ports;
    phone->SetReceiveMode(Kral_ResourceManager::default_receive_mode());
  }
  phone->SetTargetType(Kral_ResourceManager::target_type());
  phone->SetHandle(handle);
  return phone;
}

// A pointer to the family object that keeps the phone object alive as well.
std::shared_ptr<FamilyObject> Joined(std::shared_ptr<Diag_FTM> phone, std::shared_ptr<FamilyObject> object) {
  if (!object) return nullptr;
  FamilyObject* const address = object.get();
  // The object goes first.
  using Both = std::pair<std::shared_ptr<Diag_FTM>, std::shared_ptr<FamilyObject>>;
  return {std::make_shared<Both>(std::move(phone), std::move(object)), address};
}

}  // namespace

std::shared_ptr<OrbtServer> MakeServer(const char* name) {
  const ServerFactory factory = CurrentServerFactory();
  return factory.make_server ? std::shared_ptr<OrbtServer>(factory.make_server(name)) : nullptr;
}

namespace Kral_ResourceManager {

std::shared_ptr<Diag_FTM> GetPhone(KRAL_HANDLE handle) try {
  if (auto phone = Owned(handle, &ContextObjects::phone)) return phone;
  uint16_t port = 0;
  if (!PortOf(handle, port)) return nullptr;
  const MutexLock building(Library().build_mutex);
  if (auto phone = Owned(handle, &ContextObjects::phone)) return phone;
  auto phone = MakePhone(handle, port);
  return phone && Own(handle, &ContextObjects::phone, phone) ? phone : nullptr;
} catch (...) {
  PassForcedUnwind();
  return nullptr;
}

std::shared_ptr<FamilyObject> GetFamilyObject(KRAL_HANDLE handle, FamilySlot slot, const FamilyMaker& make) {
  const auto phone = GetPhone(handle);
  if (!phone || (IsServerModeOnly(slot) && !phone->server_mode())) return nullptr;
  if (auto object = Owned(handle, FamilyIn{slot})) return Joined(phone, std::move(object));
  if (!make) return nullptr;
  // The request lock rather than one of the table: a maker may send requests, and an operation that holds the request
  // lock may ask for a family object.
  const std::lock_guard building(phone->request_lock());
  if (auto object = Owned(handle, FamilyIn{slot})) return Joined(phone, std::move(object));
  std::shared_ptr<FamilyObject> object;
  try {
    object = make(*phone, handle);
    if (!object || !Own(handle, FamilyIn{slot}, object)) return nullptr;
  } catch (...) {
    PassForcedUnwind();
    return nullptr;
  }
  return Joined(phone, std::move(object));
}

std::shared_ptr<SoftwareDownload> GetSoftwareDownload(KRAL_HANDLE handle) try {
  const auto phone = GetPhone(handle);
  if (!phone || !phone->server_mode()) return nullptr;
  const MutexLock building(Library().build_mutex);
  if (auto download = Owned(handle, &ContextObjects::download)) return download;
  const ServerFactory factory = CurrentServerFactory();
  if (!factory.make_software_download) return nullptr;
  std::shared_ptr<SoftwareDownload> download =
      factory.make_software_download("KRAL-SW Download", *phone->server_port());
  return download && Own(handle, &ContextObjects::download, download) ? download : nullptr;
} catch (...) {
  PassForcedUnwind();
  return nullptr;
}

}  // namespace Kral_ResourceManager
}  // namespace kral
