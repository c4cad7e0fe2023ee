// The bytes of defined requests and replies, the handset's way.
#ifndef KRAL_HANDSET_SERVICES_DEFINED_CODEC_H
#define KRAL_HANDSET_SERVICES_DEFINED_CODEC_H

#include <optional>

#include "handset/services/defined_service.h"

namespace kral::handset {

// What a request sets, by path without the family; or why it is refused.
std::optional<DefinedValues> TakeDefined(const std::vector<DefinedField>& fields, ByteView bytes, Refusal& refusal);

// A reply of these values, and of defaults where there are none.
Bytes MakeDefined(const std::vector<DefinedField>& fields, const DefinedValues& values);

}  // namespace kral::handset

#endif
