// A named, system-visible marker of a port in use, whose value is the handle given to callers. Never waited on.
#ifndef KRAL_PLATFORM_NAMED_MUTEX_H
#define KRAL_PLATFORM_NAMED_MUTEX_H

#include <cstdint>
#include <memory>
#include <string>

namespace kral {

class NamedMutex {
 public:
  virtual ~NamedMutex() = default;     // releases and closes it
  virtual uint32_t value() const = 0;  // unique among the live ones of this process, never 0
};

// Creates the mutex owned by the calling thread; null when the system refuses.
std::unique_ptr<NamedMutex> CreateNamedMutex(const std::string& name);

}  // namespace kral

#endif
