// Station switches on Windows: keys of the registry.
#include "platform/station_switch.h"

#include <windows.h>

namespace kral {

bool IsSwitchSet(const StationSwitch& station_switch) {
  HKEY key = nullptr;
  // The key handle is deliberately not closed.
  return ::RegOpenKeyExA(HKEY_LOCAL_MACHINE, station_switch.registry_key, 0, KEY_READ, &key) == ERROR_SUCCESS;
}

}  // namespace kral
