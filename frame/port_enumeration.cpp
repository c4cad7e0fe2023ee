// Lists the ports of the machine or of the phone server, finds those on which a handset answers, and keeps the port
// aliases.
#include <algorithm>
#include <cstdlib>
#include <string>

#include "base/at_exit.h"
#include "frame/diag_ftm.h"
#include "frame/library_state.h"
#include "frame/orbt_server.h"
#include "frame/resource_manager.h"
#include "platform/forced_unwind.h"

namespace kral {
namespace {

constexpr size_t kPortPrefixLength = 3;  // as in COM12

uint16_t PortNumber(const std::string& name) {
  return name.size() <= kPortPrefixLength ? uint16_t{0}
                                          : static_cast<uint16_t>(std::atoi(name.c_str() + kPortPrefixLength));
}

bool ListMachinePorts(std::vector<uint16_t>& ports) {
  Kral_ResourceManager::PortLister lister;
  {
    auto& library = Library();
    const MutexLock lock(library.mutex);
    lister = library.port_lister;
  }
  return lister(ports);
}

// The proxy that answers for ports rather than for a handset; made on first use, kept until all is disconnected.
std::shared_ptr<OrbtServer> PortInfoServer() {
  auto& library = Library();
  const MutexLock building(library.build_mutex);
  {
    const MutexLock lock(library.mutex);
    if (library.port_info) return library.port_info;
  }
  auto made = MakeServer("KRAL-PortInfo");
  const MutexLock lock(library.mutex);
  library.port_info = made;
  return made;
}

bool CopyServerPorts(std::vector<std::string> (OrbtServer::*list)(), std::span<uint16_t> ports, uint16_t& count) {
  count = 0;
  std::vector<std::string> names;
  try {
    const auto server = PortInfoServer();
    if (server) names = (*server.*list)();
  } catch (...) {
    PassForcedUnwind();
    return false;
  }
  const size_t copied = std::min(names.size(), ports.size());
  std::transform(names.begin(), names.begin() + static_cast<std::ptrdiff_t>(copied), ports.begin(), PortNumber);
  count = static_cast<uint16_t>(copied);
  return !names.empty();
}

// Opens the port, asks, and closes it again. The context lasts as long as the question.
bool AnswersOnPort(uint16_t port) {
  const KRAL_HANDLE handle = Kral_ResourceManager::CreateContext(port);
  const AtExit asked([handle] { Kral_ResourceManager::ReleaseContext(handle, false); });
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  if (!phone) return false;
  const std::lock_guard lock(phone->request_lock());
  if (!phone->OpenPort({})) return false;
  const bool answers = phone->IsPhoneConnected();
  phone->ClosePort();
  return answers;
}

}  // namespace

namespace Kral_ResourceManager {

bool AllPorts(std::span<uint16_t> ports, uint16_t& count) {
  if (server_mode()) return CopyServerPorts(&OrbtServer::AllPorts, ports, count);
  std::vector<uint16_t> listed;
  const bool succeeded = ListMachinePorts(listed);
  if (!succeeded) listed.clear();
  const size_t copied = std::min(listed.size(), ports.size());
  std::copy_n(listed.begin(), copied, ports.begin());
  count = static_cast<uint16_t>(copied);
  return succeeded;
}

bool AvailablePhonePorts(std::span<uint16_t> ports, uint16_t& count, std::span<const uint16_t> ignored) {
  if (server_mode()) return CopyServerPorts(&OrbtServer::PortsWithPhone, ports, count);
  // Each candidate is opened exclusively below, so every connection of the process is closed first.
  ReleaseAllContexts();
  std::vector<uint16_t> listed;
  if (!ListMachinePorts(listed)) return false;
  uint16_t found = 0;
  for (const uint16_t port : listed) {
    if (found >= ports.size()) break;
    if (port >= kNullPort) continue;  // no device: one would always answer, the other picks a port by coming here
    if (std::ranges::find(ignored, port) != ignored.end()) continue;
    if (AnswersOnPort(port)) ports[found++] = port;
  }
  count = found;
  return true;
}

void AddPortAlias(uint16_t logical, uint16_t physical) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.aliases.emplace_back(logical, physical);
}

void ClearPortAliases() {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  library.aliases.clear();
}

bool ResolvePortAlias(uint16_t logical, uint16_t& physical) {
  auto& library = Library();
  const MutexLock lock(library.mutex);
  const auto found =
      std::ranges::find_if(library.aliases, [logical](const auto& alias) { return alias.first == logical; });
  if (found == library.aliases.end()) return false;
  physical = found->second;
  return true;
}

}  // namespace Kral_ResourceManager
}  // namespace kral
