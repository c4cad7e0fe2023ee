// Values of items as stations see them and as handsets and backup files keep them.
#ifndef KRAL_STORAGE_NV_NV_VALUE_H
#define KRAL_STORAGE_NV_NV_VALUE_H

#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "storage/nv/nv_definitions.h"

namespace kral::nv {

// --- As it is kept: compressed where the item says so; numbered items fill their data field --------------------------

// Nothing when it does not fit the data field (kDataSize, one less for an element) or the limit of files.
std::optional<NvBytes> ToStored(const NvItem& item, std::span<const uint8_t> value);
// Nothing when the bytes hold no value of the item's type. A generic file item takes any size, and its type follows.
std::optional<NvBytes> FromStored(NvItem& item, std::span<const uint8_t> stored);

// --- As text ---------------------------------------------------------------------------------------------------------

std::string ToHex(std::span<const uint8_t> bytes);  // "0A FF"
// Two digits a byte; blanks and commas between bytes do not matter.
std::optional<NvBytes> FromHex(std::string_view text);

// --- Made-up definitions ---------------------------------------------------------------------------------------------

NvItem GenericItem(uint16_t id, uint16_t highest_element = 0);
NvItem GenericFile(std::string path, size_t size);

}  // namespace kral::nv

#endif
