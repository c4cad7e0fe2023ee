// The error codes of the NV tool, in the order of their texts.
#ifndef KRAL_STORAGE_NV_NV_ERROR_H
#define KRAL_STORAGE_NV_NV_ERROR_H

#include <cstdint>

#include "base/failure.h"
#include "kral/nv_tool.h"

namespace kral::nv {

enum class NvError : uint32_t {
  kNone = KRAL_NV_ERROR_NONE,
  kNoXmlParser = KRAL_NV_ERROR_NO_XML_PARSER,
  kCannotLoadSource = KRAL_NV_ERROR_CANNOT_LOAD_SOURCE,
  kCannotSaveSource = KRAL_NV_ERROR_CANNOT_SAVE_SOURCE,
  kCannotLoadDefinition = KRAL_NV_ERROR_CANNOT_LOAD_DEFINITION,
  kBadSource = KRAL_NV_ERROR_BAD_SOURCE,
  kBadDefinition = KRAL_NV_ERROR_BAD_DEFINITION,
  kCannotOpenPkv = KRAL_NV_ERROR_CANNOT_OPEN_PKV,
  kIndexOutOfBound = KRAL_NV_ERROR_INDEX_OUT_OF_BOUND,
  kNotDefined = KRAL_NV_ERROR_NOT_DEFINED,
  kNoValue = KRAL_NV_ERROR_NO_VALUE,
  kCannotSetValue = KRAL_NV_ERROR_CANNOT_SET_VALUE,
  kCannotGetValue = KRAL_NV_ERROR_CANNOT_GET_VALUE,
  kRedefined = KRAL_NV_ERROR_REDEFINED,
  kCannotOpenSource = KRAL_NV_ERROR_CANNOT_OPEN_SOURCE,
  kCannotOpenQdf = KRAL_NV_ERROR_CANNOT_OPEN_QDF,
  kNoConnection = KRAL_NV_ERROR_NO_CONNECTION,
  kCannotOpenReport = KRAL_NV_ERROR_CANNOT_OPEN_REPORT,
  kNoPkvStorage = KRAL_NV_ERROR_NO_PKV_STORAGE,
  kCannotOpenFilter = KRAL_NV_ERROR_CANNOT_OPEN_FILTER,
  kBadPkvItem = KRAL_NV_ERROR_BAD_PKV_ITEM,
  kBadSourceItem = KRAL_NV_ERROR_BAD_SOURCE_ITEM,
  kCannotReadFileItem = KRAL_NV_ERROR_CANNOT_READ_FILE_ITEM,
  kCannotWriteFileItem = KRAL_NV_ERROR_CANNOT_WRITE_FILE_ITEM,
  kUnknown = KRAL_NV_ERROR_UNKNOWN,  // no text of its own
};

const char* TextOf(uint32_t code);

// The failure of which only the code is known.
Failure ToolFailure(NvError error);
// The same where more is known: `what` names it.
Failure ToolFailure(NvError error, const std::string& what);
// Notes it, and gives the code again.
NvError Told(NvError error, const std::string& what);
// A file that cannot be written, and what the system says.
NvError NotWritten(NvError error, const std::string& file, const std::error_code& system);

}  // namespace kral::nv

#endif
