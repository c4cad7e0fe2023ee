// The handle table: hands out handles, maps them to their contexts, builds the per-handset objects on first use and
// tears them down with the last release. Also the library-wide settings.
#ifndef KRAL_FRAME_RESOURCE_MANAGER_H
#define KRAL_FRAME_RESOURCE_MANAGER_H

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "kral/types.h"
#include "platform/named_mutex.h"
#include "transport/engine/kral_thread_interface.h"

namespace kral {

class Diag_FTM;
class OrbtServer;
class SoftwareDownload;

// An object of a command family owned by a context row: an NV tool, an EFS client, a download session. Objects of the
// slots behind the phone object are destroyed after it, so their destructors must not use it.
class FamilyObject {
 public:
  virtual ~FamilyObject() = default;
};

// The slots of a row, in the order of destruction around the phone object (see resource_manager.cpp). For: families
// that are not here yet. Kept, so that their order is settled before they come; kEfs and kNvManager are in use.
enum class FamilySlot {
  kWlan,
  kGps,
  kGnssSoc,
  kRfHal,
  // the phone object, the server proxy and the software download object go here
  kEfs,
  kCalibrationData,
  kNvManager,
  kScratch,
  kVentrims,
  kKivrat,
  kPelvor,
  kImageConversion,
  kServerPort,
  kCount
};

namespace Kral_ResourceManager {

// Appends the machine's COM ports; false when they cannot be listed.
using PortLister = std::function<bool(std::vector<uint16_t>& ports)>;
using MutexMaker = std::function<std::unique_ptr<NamedMutex>(const std::string& name)>;

inline constexpr uint16_t kAnyPort = 65535;
inline constexpr size_t kContextCount = 50;

KRAL_HANDLE CreateContext(uint16_t port);  // 0 on failure
void ReleaseContext(KRAL_HANDLE handle, bool force);
void ReleaseAllContexts();

// The phone object, made on the first call; null for an unknown handle. The pointer keeps it alive while a request
// runs, even when another thread disconnects.
std::shared_ptr<Diag_FTM> GetPhone(KRAL_HANDLE handle);
bool PortOf(KRAL_HANDLE handle, uint16_t& port);

// The family object of a slot, made by `make` on the first call, under the handset's request lock; null when there is
// no phone object, when `make` gives null or throws, and, for the server-mode slots, in direct mode. An empty `make`
// only looks and never waits. The pointer keeps the phone object alive too. One that is there is never told to be
// missing: a lack of memory for the pointer is thrown.
using FamilyMaker = std::function<std::shared_ptr<FamilyObject>(Diag_FTM& phone, KRAL_HANDLE handle)>;
std::shared_ptr<FamilyObject> GetFamilyObject(KRAL_HANDLE handle, FamilySlot slot, const FamilyMaker& make);

template <class T>
std::shared_ptr<T> GetFamily(KRAL_HANDLE handle, FamilySlot slot, const FamilyMaker& make) {
  return std::static_pointer_cast<T>(GetFamilyObject(handle, slot, make));
}

std::shared_ptr<SoftwareDownload> GetSoftwareDownload(KRAL_HANDLE handle);  // server mode only

bool server_mode();
void SetServerMode(bool on);
uint8_t target_type();
void SetTargetType(uint8_t type);  // above 1: ignored
ReceiveMode default_receive_mode();
void SetDefaultReceiveMode(ReceiveMode mode);

void AddPortAlias(uint16_t logical, uint16_t physical);
void ClearPortAliases();
bool ResolvePortAlias(uint16_t logical, uint16_t& physical);  // the first match wins

bool AllPorts(std::span<uint16_t> ports, uint16_t& count);
bool AvailablePhonePorts(std::span<uint16_t> ports, uint16_t& count, std::span<const uint16_t> ignored);

// How phone objects open devices, how the machine's ports are listed and how rows get their mutex; tests install
// fakes, an empty function puts the real one back.
void SetDeviceOpener(DeviceOpener opener);
void SetPortLister(PortLister lister);
void SetMutexMaker(MutexMaker maker);

}  // namespace Kral_ResourceManager
}  // namespace kral

#endif
