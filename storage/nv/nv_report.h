// Reports on sets of items: the comparison of two backup files, and the list of current values.
#ifndef KRAL_STORAGE_NV_NV_REPORT_H
#define KRAL_STORAGE_NV_NV_REPORT_H

#include <cstddef>
#include <string>

#include "storage/nv/nv_definitions.h"
#include "storage/pkv/pkv_set.h"

namespace kral::nv {

struct NvComparison {
  size_t same = 0;
  size_t changed = 0;
  size_t only_first = 0;
  size_t only_second = 0;
};

// A page of HTML that needs nothing else: the counts, the differing items member by member, then the equal ones. Values
// are decoded by their definitions; of items without one the bytes are shown.
std::string ComparisonPage(const std::string& first_name, const pkv::PkvSet& first, const std::string& second_name,
                           const pkv::PkvSet& second, NvDefinitions& definitions, NvComparison& comparison);

// Current values, a line each: title, name, subscription, index, numbers; separated by tabs.
std::string QdfText(NvDefinitions& definitions);

}  // namespace kral::nv

#endif
