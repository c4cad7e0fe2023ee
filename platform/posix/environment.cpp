// The environment on Linux.
#include "platform/environment.h"

#include <stdlib.h>

namespace kral {

std::optional<std::string> EnvironmentValue(const char* name) {
  const char* value = ::getenv(name);
  if (value == nullptr) return std::nullopt;
  return value;
}

void SetEnvironmentValue(const char* name, const std::optional<std::string>& value) {
  if (value) {
    ::setenv(name, value->c_str(), 1);
  } else {
    ::unsetenv(name);
  }
}

}  // namespace kral
