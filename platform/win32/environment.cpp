// The environment on Windows, through the C runtime, which keeps the system's copy in step.
#include "platform/environment.h"

#include <stdlib.h>

namespace kral {

std::optional<std::string> EnvironmentValue(const char* name) {
  const char* value = ::getenv(name);
  if (value == nullptr) return std::nullopt;
  return value;
}

void SetEnvironmentValue(const char* name, const std::optional<std::string>& value) {
  const std::string entry = std::string(name) + "=" + value.value_or("");
  ::_putenv(entry.c_str());  // an empty value unsets
}

}  // namespace kral
