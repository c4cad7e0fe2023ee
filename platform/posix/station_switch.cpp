// Station switches on Linux: environment variables.
#include "platform/station_switch.h"

#include "platform/environment.h"

namespace kral {

bool IsSwitchSet(const StationSwitch& station_switch) {
  return EnvironmentValue(station_switch.variable).has_value();
}

}  // namespace kral
