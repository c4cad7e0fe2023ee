// The handset's own software, as far as it matters to a host: an image at the beginning of the flash that holds "VHSW"
// and, terminated, the software revision. It runs after the next restart.
#ifndef KRAL_HANDSET_LOADERS_SOFTWARE_IMAGE_H
#define KRAL_HANDSET_LOADERS_SOFTWARE_IMAGE_H

#include <optional>
#include <string>
#include <string_view>

#include "handset/loaders/flash_memory.h"

namespace kral::handset {

std::optional<std::string> SoftwareRevision(const FlashMemory& flash);

// An image of that size with that revision; the bytes behind them differ from each other.
Bytes MakeSoftware(std::string_view revision, size_t size);

}  // namespace kral::handset

#endif
