// The two values of a compared item side by side: what differs is marked, what is equal over a long way is folded.
#ifndef KRAL_STORAGE_NV_NV_REPORT_CELLS_H
#define KRAL_STORAGE_NV_NV_REPORT_CELLS_H

#include <span>
#include <string>
#include <utility>
#include <vector>

#include "storage/nv/nv_value.h"

namespace kral::nv {

// Name and numbers of each; a single one without name for bytes that have no definition.
using ReportMembers = std::vector<std::pair<std::string, std::string>>;

// A side that is not there is empty, and nothing of the other is marked then.
struct ReportSide {
  bool is_there = false;
  std::span<const uint8_t> bytes;
  ReportMembers members;  // empty: the bytes are shown
};

// HTML of one side, as compared with the other.
std::string ReportCell(const ReportSide& side, const ReportSide& other);

// "level: 1,2 to 1,3", "3 of 128 bytes, from 0x10 on"; empty for equal ones.
std::string ReportDifference(const ReportSide& first, const ReportSide& second);

}  // namespace kral::nv

#endif
