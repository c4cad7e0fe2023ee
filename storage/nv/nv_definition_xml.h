// Definition files and data-type dictionaries: what docs/nv.md tells of their elements.
#ifndef KRAL_STORAGE_NV_NV_DEFINITION_XML_H
#define KRAL_STORAGE_NV_NV_DEFINITION_XML_H

#include <string>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_definitions.h"
#include "storage/nv/nv_error.h"

namespace kral::nv {

// What a file holds, in its order.
struct NvDefinitionFile {
  std::vector<NvTypePtr> types;
  std::vector<NvItem> items;
};

enum class NvDefinitionKind { kDefinitions, kDictionary };  // root NvDefinition; root NvDataTypeDictionary

// Data types of `known` may be used. On a failure `problem` tells why, and `file` is as before.
NvError LoadDefinitionFile(const std::string& path, NvDefinitionKind kind, const NvDefinitions& known,
                           NvDefinitionFile& file, std::string& problem);
NvError ReadDefinitions(const XmlElement& root, NvDefinitionKind kind, const NvDefinitions& known,
                        NvDefinitionFile& file, std::string& problem);

// The other way: one element, on one line, that a definition file could hold.
std::string DefinitionText(const NvItem& item);
std::string DataTypeText(const NvDataType& type);

}  // namespace kral::nv

#endif
