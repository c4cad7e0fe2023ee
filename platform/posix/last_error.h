// What the system said about the call that has just failed, in the terms of both platforms.
#ifndef KRAL_PLATFORM_POSIX_LAST_ERROR_H
#define KRAL_PLATFORM_POSIX_LAST_ERROR_H

#include <cerrno>
#include <system_error>

namespace kral {

inline std::error_code LastError() {
  return {errno, std::generic_category()};
}

}  // namespace kral

#endif
