// NV items, their definitions and their values as lines of text and as JSON.
#ifndef KRAL_TOOLS_NV_NV_ITEM_OUTPUT_H
#define KRAL_TOOLS_NV_NV_ITEM_OUTPUT_H

#include <string>

#include "tools/kral/nv/nv_items.h"
#include "tools/kral/output.h"

namespace kral::tool {

// What was read. Array items have an element for each index that has a value.
std::string ValueText(const NvItem& item, const NvReading& reading);
Json ValueJson(const NvItem& item, const NvReading& reading);

std::string DefinitionText(const NvItem& item);
Json DefinitionJson(const NvItem& item);

// Id, path and name, as far as the item has them.
Json TitleJson(const NvItem& item);

}  // namespace kral::tool

#endif
