// Exports of the NV tool: error texts, definitions, values.
#include <algorithm>
#include <string>
#include <string_view>

#include "base/outputs.h"
#include "kral/nv_tool.h"
#include "storage/nv/nv_definition_xml.h"
#include "storage/nv/nv_tool_call.h"

using kral::Diag_FTM;
using kral::Put;
using kral::TextOrEmpty;
using namespace kral::nv;

namespace {

// --- Texts handed out ------------------------------------------------------------------------------------------------

NvError Give(std::string_view result, char* text, uint32_t size) {
  if (text == nullptr) return Told(NvError::kCannotGetValue, "there is no buffer for the text");
  if (result.size() >= size) {
    return Told(NvError::kCannotGetValue, "the text of " + std::to_string(result.size() + 1) +
                                              " bytes does not fit into " + std::to_string(size));
  }
  *std::ranges::copy(result, text).out = '\0';
  return NvError::kNone;
}

// Where a text goes: a caller's buffer, or only its length.
struct Buffer {
  char* text;
  uint32_t size;

  NvError Take(const std::string& result) const { return Give(result, text, size); }
};
struct Length {
  uint32_t* length;

  NvError Take(const std::string& result) const {
    Put(length, static_cast<uint32_t>(result.size() + 1));
    return NvError::kNone;
  }
};

template <class Key, class Target>
uint32_t GiveDefinition(KRAL_HANDLE handle, const char* name, Key key, Target target) {
  return OnItem(handle, name, key,
                [&](NVTool_Manager&, Diag_FTM&, NvItem& item) { return target.Take(DefinitionText(item)); });
}

template <class Target>
uint32_t GiveFieldNames(KRAL_HANDLE handle, const char* name, uint32_t index, Target target) {
  return OnItem(handle, name, AtIndex{index}, [&](NVTool_Manager&, Diag_FTM&, NvItem& item) {
    std::string names;
    for (const auto& member : item.type->forms()[0].members) names += (names.empty() ? "" : ",") + member.name;
    return target.Take(names);
  });
}

template <class Target>
uint32_t GiveType(KRAL_HANDLE handle, const char* name, const char* type_name, Target target) {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM&) {
    const auto type = tool.definitions().FindType(TextOrEmpty(type_name));
    if (type != nullptr) return target.Take(DataTypeText(*type));
    return Told(NvError::kNotDefined, "the data type " + std::string(TextOrEmpty(type_name)) + " is not defined");
  });
}

template <class Target>
uint32_t GiveFileNames(KRAL_HANDLE handle, const char* name, Target target) {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM&) { return target.Take(tool.FileNames()); });
}

template <class Key, class Target>
uint32_t GiveValue(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, Target target) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM&, NvItem& item) {
    const NvBytes* value = nullptr;
    const NvError error = tool.GetValue(item, element, value);
    return error == NvError::kNone ? target.Take(item.type->ToText(*value)) : error;
  });
}

// --- Values ----------------------------------------------------------------------------------------------------------

template <class Key>
uint32_t GetBytes(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, uint8_t* data, uint32_t* size) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM&, NvItem& item) {
    const NvBytes* value = nullptr;
    if (const NvError error = tool.GetValue(item, element, value); error != NvError::kNone) return error;
    if (size == nullptr) return Told(NvError::kCannotGetValue, "there is no size of the buffer");
    const uint32_t room = data == nullptr ? 0 : *size;
    *size = static_cast<uint32_t>(value->size());
    if (value->size() > room) {
      return Told(NvError::kCannotGetValue, item.Title() + ": the value of " + std::to_string(value->size()) +
                                                " bytes does not fit into " + std::to_string(room));
    }
    std::copy(value->begin(), value->end(), data);
    return NvError::kNone;
  });
}

template <class Key>
uint32_t SetBytes(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, const uint8_t* data, uint32_t size) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM& phone, NvItem& item) {
    if (data == nullptr && size > 0) return Told(NvError::kCannotSetValue, "there is no buffer with the value");
    return tool.SetBytes(phone, item, element, {data, size});
  });
}

template <class Key>
uint32_t SetString(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, const char* text) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM& phone, NvItem& item) {
    return tool.SetText(phone, item, element, TextOrEmpty(text));
  });
}

template <class Key>
uint32_t ClearValue(KRAL_HANDLE handle, const char* name, Key key) {
  return OnItem(handle, name, key, [](NVTool_Manager& tool, Diag_FTM&, NvItem& item) {
    tool.ClearValue(item);
    return NvError::kNone;
  });
}

}  // namespace

extern "C" {

uint32_t KRAL_CALL KRAL_NV_GetErrorText(KRAL_HANDLE handle, uint32_t code, char* text, uint32_t size) {
  return static_cast<uint32_t>(kral::ExportCall(handle, __func__).Alone(NvError::kUnknown, NvError::kNone, [&] {
    return Give(TextOf(code), text, size);
  }));
}

uint32_t KRAL_CALL KRAL_NV_ConfigureCallBack(KRAL_HANDLE handle, KRAL_NV_CALLBACK callback) {
  return OnToolAlways(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) { tool.SetCallback(callback); });
}

// --- Definitions -----------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadNVDefinitionFile(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.LoadDefinitions(phone, TextOrEmpty(file), NvDefinitionKind::kDefinitions);
  });
}

uint32_t KRAL_CALL KRAL_NV_LoadNVDataTypeDictinary(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.LoadDefinitions(phone, TextOrEmpty(file), NvDefinitionKind::kDictionary);
  });
}

uint32_t KRAL_CALL KRAL_NV_ClearNVDefinition(KRAL_HANDLE handle) {
  return OnToolAlways(handle, __func__, [](NVTool_Manager& tool, Diag_FTM&) { tool.ClearDefinitions(); });
}

uint32_t KRAL_CALL KRAL_NV_GetNumOfNVDefinition(KRAL_HANDLE handle, uint32_t* count) {
  return OnToolAlways(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) {
    Put(count, static_cast<uint32_t>(tool.definitions().numbered_count()));
  });
}

uint32_t KRAL_CALL KRAL_NV_GetNumOfNVEfsDefinition(KRAL_HANDLE handle, uint32_t* count) {
  return OnToolAlways(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) {
    Put(count, static_cast<uint32_t>(tool.definitions().file_count()));
  });
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndex(KRAL_HANDLE handle, uint32_t index, char* text, uint32_t size) {
  return GiveDefinition(handle, __func__, AtIndex{index}, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndexStringLength(KRAL_HANDLE handle, uint32_t index, uint32_t* length) {
  return GiveDefinition(handle, __func__, AtIndex{index}, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                        uint32_t size) {
  return GiveDefinition(handle, __func__, efs_file, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                    uint32_t* length) {
  return GiveDefinition(handle, __func__, efs_file, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNames(KRAL_HANDLE handle, uint32_t index, char* text, uint32_t size) {
  return GiveFieldNames(handle, __func__, index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNamesStringLength(KRAL_HANDLE handle, uint32_t index, uint32_t* length) {
  return GiveFieldNames(handle, __func__, index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinition(KRAL_HANDLE handle, const char* type_name, char* text,
                                                   uint32_t size) {
  return GiveType(handle, __func__, type_name, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinitionStringLength(KRAL_HANDLE handle, const char* type_name,
                                                               uint32_t* length) {
  return GiveType(handle, __func__, type_name, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenames(KRAL_HANDLE handle, char* text, uint32_t size) {
  return GiveFileNames(handle, __func__, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenamesStringLength(KRAL_HANDLE handle, uint32_t* length) {
  return GiveFileNames(handle, __func__, Length{length});
}

// --- Values ----------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                       uint8_t* data, uint32_t* size) {
  return GetBytes(handle, __func__, AtIndex{index}, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                      uint8_t* data, uint32_t* size) {
  return GetBytes(handle, __func__, item, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                       const uint8_t* data, uint32_t size) {
  return SetBytes(handle, __func__, AtIndex{index}, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                      const uint8_t* data, uint32_t size) {
  return SetBytes(handle, __func__, item, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index, char* text,
                                                   uint32_t size) {
  return GiveValue(handle, __func__, AtIndex{index}, array_index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndexStringLength(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                               uint32_t* length) {
  return GiveValue(handle, __func__, AtIndex{index}, array_index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index, char* text,
                                                  uint32_t size) {
  return GiveValue(handle, __func__, item, array_index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVIDStringLength(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                              uint32_t* length) {
  return GiveValue(handle, __func__, item, array_index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                         uint32_t size) {
  return GiveValue(handle, __func__, efs_file, 0, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                     uint32_t* length) {
  return GiveValue(handle, __func__, efs_file, 0, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                   const char* text) {
  return SetString(handle, __func__, AtIndex{index}, array_index, text);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                  const char* text) {
  return SetString(handle, __func__, item, array_index, text);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file, const char* text) {
  return SetString(handle, __func__, efs_file, 0, text);
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValueByIndex(KRAL_HANDLE handle, uint32_t index) {
  return ClearValue(handle, __func__, AtIndex{index});
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValueByNVID(KRAL_HANDLE handle, uint16_t item) {
  return ClearValue(handle, __func__, item);
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValues(KRAL_HANDLE handle) {
  return OnToolAlways(handle, __func__, [](NVTool_Manager& tool, Diag_FTM&) { tool.ClearValues(); });
}

}  // extern "C"
