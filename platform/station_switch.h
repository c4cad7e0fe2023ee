// Switches that are set on a station, outside of any program: a registry key on Windows, an environment variable on
// Linux. What counts is that it is there; its content does not.
#ifndef KRAL_PLATFORM_STATION_SWITCH_H
#define KRAL_PLATFORM_STATION_SWITCH_H

namespace kral {

struct StationSwitch {
  const char* registry_key;  // below the local machine's root
  const char* variable;
};

bool IsSwitchSet(const StationSwitch& station_switch);

}  // namespace kral

#endif
