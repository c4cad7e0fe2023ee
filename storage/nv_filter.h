// Filters: which items a set is to move. Several that are loaded one after the other add up.
//
//   <NvFilter>
//     <NV>453</NV>
//     <NV_RANGE>1000-1999</NV_RANGE>
//     <NV_NAME_SUBSTRING_LIST>GSM,/rfnv/</NV_NAME_SUBSTRING_LIST>
//   </NvFilter>
#ifndef KRAL_STORAGE_NV_FILTER_H
#define KRAL_STORAGE_NV_FILTER_H

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv_definitions.h"
#include "storage/nv_error.h"

namespace kral::nv {

class NvFilter {
 public:
  bool is_empty() const { return ranges_.empty() && parts_.empty(); }
  // An empty filter lets everything pass.
  bool Passes(const NvItem& item) const;

  // Adds what a file holds. On a failure nothing is added, and `problem` tells why.
  NvError Load(const std::string& path, std::string& problem);
  NvError Read(const XmlElement& root, std::string& problem);

  void AddItem(const NvItem& item);
  NvError Save(const std::string& path) const;

 private:
  std::vector<std::pair<uint16_t, uint16_t>> ranges_;  // of NV ids, first and last
  std::vector<std::string> parts_;                     // of names and paths
};

}  // namespace kral::nv

#endif
