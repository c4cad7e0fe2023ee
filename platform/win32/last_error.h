// What the system said about the call that has just failed, in the terms of both platforms.
#ifndef KRAL_PLATFORM_WIN32_LAST_ERROR_H
#define KRAL_PLATFORM_WIN32_LAST_ERROR_H

#include <system_error>

namespace kral {

std::error_code LastError();

}  // namespace kral

#endif
