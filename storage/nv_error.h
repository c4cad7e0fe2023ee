// The error codes of the NV tool, in the order of their texts.
#ifndef KRAL_STORAGE_NV_ERROR_H
#define KRAL_STORAGE_NV_ERROR_H

#include <cstdint>

namespace kral::nv {

enum class NvError : uint32_t {
  kNone = 0,
  kNoXmlParser = 1,
  kCannotLoadSource = 2,
  kCannotSaveSource = 3,
  kCannotLoadDefinition = 4,
  kBadSource = 5,
  kBadDefinition = 6,
  kCannotOpenPkv = 7,
  kIndexOutOfBound = 8,
  kNotDefined = 9,
  kNoValue = 10,
  kCannotSetValue = 11,
  kCannotGetValue = 12,
  kRedefined = 13,
  kCannotOpenSource = 14,
  kCannotOpenQdf = 15,
  kNoConnection = 16,
  kCannotOpenReport = 17,
  kNoPkvStorage = 18,
  kCannotOpenFilter = 19,
  kBadPkvItem = 20,
  kBadSourceItem = 21,
  kCannotReadFileItem = 22,
  kCannotWriteFileItem = 23,
  kUnknown = 0xFFFFFFFF,  // no text of its own
};

const char* TextOf(uint32_t code);

}  // namespace kral::nv

#endif
