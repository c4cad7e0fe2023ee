// Filters: which items a set is to move. Several that are loaded one after the other add up.
//
//   <NvFilter>
//     <NV>453</NV>
//     <NV_RANGE>1000-1999</NV_RANGE>
//     <NV_NAME_SUBSTRING_LIST>GSM,/rfnv/</NV_NAME_SUBSTRING_LIST>
//   </NvFilter>
#ifndef KRAL_STORAGE_NV_NV_FILTER_H
#define KRAL_STORAGE_NV_NV_FILTER_H

#include <cstdint>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_definitions.h"
#include "storage/nv/nv_error.h"

namespace kral::nv {

class NvFilter {
 public:
  bool is_empty() const { return ids_.empty() && parts_.empty(); }
  // An empty filter lets everything pass.
  bool Passes(const NvItem& item) const;

  // Adds what a file holds. On a failure nothing is added, and `problem` tells why.
  NvError Load(const std::string& path, std::string& problem);
  NvError Read(const XmlElement& root, std::string& problem);

 private:
  void Sort();

  std::vector<std::pair<uint16_t, uint16_t>> ids_;  // first and last, in rising order with gaps between
  std::vector<std::string> parts_;                  // of names and paths, in rising order; none begins with another
};

// Writes a filter that lets these items pass.
NvError SaveFilter(const std::string& path, std::span<const NvItem* const> items);

}  // namespace kral::nv

#endif
