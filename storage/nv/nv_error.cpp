// The texts of the NV tool's error codes, as they stand in stations' reports.
#include "storage/nv/nv_error.h"

#include <array>

namespace kral::nv {
namespace {

constexpr std::array kTexts = {
    "ERROR_FREE",
    // "MSMXL6": kept, as is every wording here.
    "MSXML_FAILED_TO_INSTANTIATE:Check MSMXL6 is installed on target machine",
    "MSXML_FAILED_TO_LOAD_SRC:Check SRC file exists and is well formatted",
    "MSXML_FAILED_TO_SAVE_SRC:Check target path exists",
    "MSXML_FAILED_TO_LOAD_DEF:Check DEF file exists and is well formatted",
    "SOURCE_XML_VALIDATION_FAILED:Fail to validate source xml",
    "DEF_XML_VALIDATION_FAILED:Fail to validate definition xml",
    "FAILED_TO_OPEN_PKV:Check PKV exists or path is valid",
    "INDEX_OUT_OF_BOUND",
    "NV_ITEM_NOT_DEFINED",
    "NV_ITEM_NO_VALUE",
    "NV_ITEM_FAILED_TO_SET_VALUE",
    "NV_ITEM_FAILED_TO_GET_VALUE",
    "A NV Item has been defined by a previous load.  The NV item definition is overwritten",
    "Failed to open source file",
    "Failed to open a file for writing QDF",
    "Failed to connect to mobile to read/write NVs",
    "Failed to open HTML file to write. Check file path",
    "Failed to open a PKV file because VARN can't get a valid storage from PKV",
    "Failed to open a filter file to read/write",
    "Failed to read an item from PKV file",
    "Failed to read an item from Source file",
    "Failed to read single RFNV or EFS item from mobile",
    "Failed to write single RFNV or EFS item to mobile",
};
static_assert(kTexts.size() == static_cast<uint32_t>(NvError::kCannotWriteFileItem) + 1);

uint32_t ClassOf(NvError error) {
  switch (error) {
    case NvError::kIndexOutOfBound:
    case NvError::kNotDefined:
    case NvError::kNoValue:
    case NvError::kCannotSetValue:
    case NvError::kCannotGetValue:
      return KRAL_ERROR_ARGUMENT;
    case NvError::kNoConnection:
      return KRAL_ERROR_NO_ANSWER;
    case NvError::kCannotReadFileItem:
    case NvError::kCannotWriteFileItem:
      return KRAL_ERROR_REFUSED;
    case NvError::kNoXmlParser:
    case NvError::kUnknown:
      return KRAL_ERROR_INTERNAL;
    default:
      return KRAL_ERROR_BAD_FILE;
  }
}

}  // namespace

const char* TextOf(uint32_t code) {
  return code < kTexts.size() ? kTexts[code] : "UNKNOWN";
}

Failure ToolFailure(NvError error) {
  const auto code = static_cast<uint32_t>(error);
  return Failure(ClassOf(error), "NV tool: %s", TextOf(code)).Status(KRAL_ERROR_STATUS_RESULT, code);
}

Failure ToolFailure(NvError error, const std::string& what) {
  return Failure(ClassOf(error), "%s", what.c_str()).Status(KRAL_ERROR_STATUS_RESULT, static_cast<uint32_t>(error));
}

NvError Told(NvError error, const std::string& what) {
  Fail(ToolFailure(error, what));
  return error;
}

NvError NotWritten(NvError error, const std::string& file, const std::error_code& system) {
  Fail(FileFailure(file, "cannot be written")
           .System(system)
           .Status(KRAL_ERROR_STATUS_RESULT, static_cast<uint32_t>(error)));
  return error;
}

}  // namespace kral::nv
