// What readers of the text log rely on: the category names and the callback record.
#ifndef KRAL_BASE_TEXT_LOG_FORMAT_H
#define KRAL_BASE_TEXT_LOG_FORMAT_H

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "base/log_flags.h"

namespace kral {

// By the position of the lowest set bit of a line's flag.
inline constexpr std::array<std::string_view, 18> kCategoryNames = {
    "LOG_IO",
    "LOG_FN",
    "LOG_RET",
    "LOG_ASYNC",
    "LOG_ERR",
    "LOG_IO_AHDLC",
    "LOG_FN_AHDLC",
    "LOG_RET_AHDLC",
    "LOG_INF_AHDLC",
    "LOG_C_HIGH_LEVEL_START",
    "LOG_IO_DEV",
    "LOG_FN_DEV",
    "LOG_RET_DEV",
    "LOG_INF_DEV",
    "LOG_C_HIGH_LEVEL_STOP",
    "LOG_NV_MANAGER_DEBUG",
    "INVALID LOG LEVEL",
    "INVALID LOG LEVEL",  // every higher position is clamped to this one
};

// A flag of 0 counts as bit 0.
constexpr std::string_view CategoryName(uint32_t flag) {
  const auto position = flag == 0 ? size_t{0} : static_cast<size_t>(std::countr_zero(flag));
  return kCategoryNames[position < kCategoryNames.size() ? position : kCategoryNames.size() - 1];
}
static_assert(CategoryName(kLogIo) == "LOG_IO");
static_assert(CategoryName(kLogErr) == "LOG_ERR");
static_assert(CategoryName(kLogInfAhdlc) == "LOG_INF_AHDLC");
static_assert(CategoryName(kLogHighLevelStart) == "LOG_C_HIGH_LEVEL_START");
static_assert(CategoryName(kLogInfDev) == "LOG_INF_DEV");
static_assert(CategoryName(kLogHighLevelStop) == "LOG_C_HIGH_LEVEL_STOP");
static_assert(CategoryName(kLogNvManagerDebug) == "LOG_NV_MANAGER_DEBUG");
static_assert(CategoryName(0x80000000) == "INVALID LOG LEVEL");

// Blanks in front of a line. The whole flag is compared: a combination of bits is never indented.
constexpr size_t Indentation(uint32_t flag) {
  switch (flag) {
    case kLogIoDev:
    case kLogFnDev:
    case kLogRetDev:
    case kLogInfDev:
      return 4;
    case kLogIoAhdlc:
    case kLogFnAhdlc:
    case kLogRetAhdlc:
    case kLogInfAhdlc:
      return 2;
    default:
      return 0;
  }
}

// Characters of one formatted line, indentation and terminator included; longer lines are cut.
inline constexpr size_t kLineCapacity = 12296;

namespace text_log_record {
inline constexpr size_t kSize = 1008;
inline constexpr size_t kFlag = 0;            // u16, low half of the flag
inline constexpr size_t kMilliseconds = 4;    // u32, since the start tick
inline constexpr size_t kText = 8;            // zero-terminated
inline constexpr size_t kTextCapacity = 999;  // the last byte of the record stays zero
static_assert(kText + kTextCapacity + 1 == kSize);
}  // namespace text_log_record

}  // namespace kral

#endif
