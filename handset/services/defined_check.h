// Whether a reply can hold what it is told to.
#ifndef KRAL_HANDSET_SERVICES_DEFINED_CHECK_H
#define KRAL_HANDSET_SERVICES_DEFINED_CHECK_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "handset/services/defined_service.h"

namespace kral::handset {

// The value as replies keep it: for words of an enumeration their numbers, whole numbers in decimal. Nothing where the
// path leads to no field; std::invalid_argument, with the reason, for what the field cannot hold.
std::optional<std::string> CheckedValue(const std::vector<DefinedField>& fields, std::string_view path,
                                        const std::string& value);

}  // namespace kral::handset

#endif
