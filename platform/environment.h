// Variables of this process's environment.
#ifndef KRAL_PLATFORM_ENVIRONMENT_H
#define KRAL_PLATFORM_ENVIRONMENT_H

#include <optional>
#include <string>

namespace kral {

// Nothing when it is unset.
std::optional<std::string> EnvironmentValue(const char* name);

// For programs of one thread: what other threads read meanwhile is not guarded. Nothing unsets it.
void SetEnvironmentValue(const char* name, const std::optional<std::string>& value);

}  // namespace kral

#endif
