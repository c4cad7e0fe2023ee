// The process-wide state of the library: the settings, the handle table, the port aliases. Shared by the files of the
// resource manager only.
#ifndef KRAL_FRAME_LIBRARY_STATE_H
#define KRAL_FRAME_LIBRARY_STATE_H

#include <array>
#include <atomic>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "base/mutex.h"
#include "frame/last_error.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "platform/named_mutex.h"
#include "platform/port_list.h"

namespace kral {

// What a row owns. Moved out of the row, under the lock, before it is destroyed, outside it.
struct ContextObjects {
  std::unique_ptr<NamedMutex> mutex;
  std::shared_ptr<Diag_FTM> phone;
  std::shared_ptr<OrbtServer> server;
  std::shared_ptr<SoftwareDownload> download;
  std::array<std::shared_ptr<FamilyObject>, static_cast<size_t>(FamilySlot::kCount)> family;
};

struct Context {
  bool in_use = false;
  KRAL_HANDLE handle = 0;
  uint16_t port = 0;
  int32_t use_count = 0;
  ContextObjects objects;
};

struct LibraryState {
  std::atomic<bool> server_mode{false};
  std::atomic<uint8_t> target_type{0};
  std::atomic<ReceiveMode> default_receive_mode{ReceiveMode::kAsWritten};
  LastErrors last_errors;

  // For the length of a scan: never held while a port is opened, an object is built or destroyed, or a callback runs.
  Mutex mutex;
  uint32_t context_counter KRAL_GUARDED_BY(mutex) = 0;  // numbers the named mutexes; never starts again
  std::array<Context, Kral_ResourceManager::kContextCount> contexts KRAL_GUARDED_BY(mutex);
  std::shared_ptr<OrbtServer> port_info KRAL_GUARDED_BY(mutex);
  std::vector<std::pair<uint16_t, uint16_t>> aliases KRAL_GUARDED_BY(mutex);  // logical, physical
  DeviceOpener device_opener KRAL_GUARDED_BY(mutex);                          // empty: the COM ports of the machine
  Kral_ResourceManager::PortLister port_lister KRAL_GUARDED_BY(mutex) = ListComPorts;
  Kral_ResourceManager::MutexMaker mutex_maker KRAL_GUARDED_BY(mutex) = CreateNamedMutex;
  ServerFactory server_factory KRAL_GUARDED_BY(mutex);

  // Held while a phone object or a server proxy is built, so that two threads do not build it twice. Taken before
  // `mutex`; the builders send no requests, so it is never held across one.
  Mutex build_mutex;
};

// Never destroyed: the process may exit with connections open, and joining their threads while the library is being
// unloaded would hang it.
LibraryState& Library();

// The first row with the handle, in use or not (a free row has handle 0); null for 0.
Context* FindContext(LibraryState& library, KRAL_HANDLE handle) KRAL_REQUIRES(library.mutex);

// The proxy of that name, or null: no server, or it failed to start.
std::shared_ptr<OrbtServer> MakeServer(const char* name);

}  // namespace kral

#endif
