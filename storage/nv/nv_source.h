// Source files: the values of items as XML.
#ifndef KRAL_STORAGE_NV_NV_SOURCE_H
#define KRAL_STORAGE_NV_NV_SOURCE_H

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_definitions.h"
#include "storage/nv/nv_error.h"

namespace kral::nv {

// One item element. Numbered items have an id, file items a path.
struct NvSourceItem {
  std::optional<uint16_t> id;
  std::string path;
  std::string name;
  NvSlot slot;
  bool is_direct = false;  // decimal numbers member by member; otherwise bytes in hexadecimal
  std::string value;       // as written
};

// Preferred roaming lists by their number; bytes in hexadecimal. They are kept as they stand.
using NvRoamingLists = std::map<uint32_t, std::string>;

struct NvSource {
  std::vector<NvSourceItem> items;
  NvRoamingLists roaming_lists;
};

// What the elements say is checked, not the values. On a failure `problem` tells why.
NvError LoadSource(const std::string& path, NvSource& source, std::string& problem);
NvError ReadSource(const XmlElement& root, NvSource& source, std::string& problem);

std::string SourceText(const NvSource& source);
// The file is replaced in one step.
NvError SaveSource(const std::string& path, const NvSource& source);

}  // namespace kral::nv

#endif
