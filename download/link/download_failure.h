// What callers are told of downloads that fail for reasons of their own: files, the caller, the phone server. What a
// request came to has been noted where it was sent.
#ifndef KRAL_DOWNLOAD_LINK_DOWNLOAD_FAILURE_H
#define KRAL_DOWNLOAD_LINK_DOWNLOAD_FAILURE_H

#include <cstdint>
#include <string>

#include "base/failure.h"

namespace kral::download {

// Each notes the failure and gives the result, for `return`.
uint32_t Aborted();
uint32_t BadArgument(uint32_t result, const char* what);

// A file that was to be read and could not be opened, or is empty.
Failure NotOpened(const std::string& file);

}  // namespace kral::download

#endif
