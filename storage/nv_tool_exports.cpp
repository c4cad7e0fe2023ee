// Exports of the NV tool: name line, handle, operation, error code.
#include <algorithm>
#include <mutex>
#include <string>
#include <string_view>

#include "commands/outputs.h"
#include "frame/export_call.h"
#include "kral/nv_tool.h"
#include "storage/nv_definition_xml.h"
#include "storage/nv_tool.h"

using kral::Diag_FTM;
using kral::LogName;
using kral::Put;
using kral::nv::NvBytes;
using kral::nv::NvDefinitionKind;
using kral::nv::NvError;
using kral::nv::NvItem;
using kral::nv::NVTool_Manager;

namespace {

std::shared_ptr<kral::FamilyObject> MakeTool(Diag_FTM&, KRAL_HANDLE handle) {
  return std::make_shared<NVTool_Manager>(handle);
}

// Runs operation(tool, phone) under the request lock of the handset; no exception leaves it.
template <class Operation>
uint32_t OnTool(KRAL_HANDLE handle, const char* name, Operation&& operation) noexcept {
  LogName(handle, name);
  NvError error = NvError::kNoConnection;
  try {
    const auto phone = kral::Kral_ResourceManager::GetPhone(handle);
    const auto tool =
        kral::Kral_ResourceManager::GetFamily<NVTool_Manager>(handle, kral::FamilySlot::kNvManager, MakeTool);
    if (phone && tool) {
      const std::lock_guard lock(phone->request_lock());
      error = tool->is_moving() ? NvError::kUnknown : operation(*tool, *phone);
    }
  } catch (...) {
    error = NvError::kUnknown;
  }
  return static_cast<uint32_t>(error);
}

// An operation that cannot fail.
template <class Operation>
uint32_t OnToolAlways(KRAL_HANDLE handle, const char* name, Operation&& operation) noexcept {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    operation(tool, phone);
    return NvError::kNone;
  });
}

std::string Text(const char* text) {
  return text == nullptr ? "" : text;
}

// --- The item that an argument names
// ----------------------------------------------------------------------------------

struct AtIndex {
  uint32_t index;
};

NvError Find(NVTool_Manager& tool, AtIndex at, NvItem*& item) {
  item = tool.definitions().At(at.index);
  return item == nullptr ? NvError::kIndexOutOfBound : NvError::kNone;
}

NvError Find(NVTool_Manager& tool, uint16_t id, NvItem*& item) {
  item = tool.definitions().Find(id);
  return item == nullptr ? NvError::kNotDefined : NvError::kNone;
}

NvError Find(NVTool_Manager& tool, const char* path, NvItem*& item) {
  item = tool.definitions().Find(Text(path));
  return item == nullptr ? NvError::kNotDefined : NvError::kNone;
}

// Runs operation(tool, phone, item).
template <class Key, class Operation>
uint32_t OnItem(KRAL_HANDLE handle, const char* name, Key key, Operation&& operation) noexcept {
  return OnTool(handle, name, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    NvItem* item = nullptr;
    const NvError error = Find(tool, key, item);
    return error == NvError::kNone ? operation(tool, phone, *item) : error;
  });
}

// --- Texts handed out
// -------------------------------------------------------------------------------------------------

NvError Give(std::string_view result, char* text, uint32_t size) {
  if (text == nullptr || result.size() >= size) return NvError::kCannotGetValue;
  *std::copy(result.begin(), result.end(), text) = '\0';
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
                [&](NVTool_Manager&, Diag_FTM&, NvItem& item) { return target.Take(kral::nv::DefinitionText(item)); });
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
    const auto type = tool.definitions().FindType(Text(type_name));
    return type == nullptr ? NvError::kNotDefined : target.Take(kral::nv::DataTypeText(*type));
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

// --- Values
// -----------------------------------------------------------------------------------------------------------

template <class Key>
uint32_t GetBytes(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, uint8_t* data, uint32_t* size) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM&, NvItem& item) {
    const NvBytes* value = nullptr;
    if (const NvError error = tool.GetValue(item, element, value); error != NvError::kNone) return error;
    if (size == nullptr) return NvError::kCannotGetValue;
    const uint32_t room = data == nullptr ? 0 : *size;
    *size = static_cast<uint32_t>(value->size());
    if (value->size() > room) return NvError::kCannotGetValue;
    std::copy(value->begin(), value->end(), data);
    return NvError::kNone;
  });
}

template <class Key>
uint32_t SetBytes(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, const uint8_t* data, uint32_t size) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM& phone, NvItem& item) {
    if (data == nullptr && size > 0) return NvError::kCannotSetValue;
    return tool.SetBytes(phone, item, element, {data, size});
  });
}

template <class Key>
uint32_t SetString(KRAL_HANDLE handle, const char* name, Key key, uint16_t element, const char* text) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM& phone, NvItem& item) {
    return tool.SetText(phone, item, element, Text(text));
  });
}

template <class Key>
uint32_t ClearValue(KRAL_HANDLE handle, const char* name, Key key) {
  return OnItem(handle, name, key, [](NVTool_Manager& tool, Diag_FTM&, NvItem& item) {
    tool.ClearValue(item);
    return NvError::kNone;
  });
}

template <class Key>
uint32_t WriteItem(KRAL_HANDLE handle, const char* name, Key key, uint16_t* status) {
  return OnItem(handle, name, key, [&](NVTool_Manager& tool, Diag_FTM& phone, NvItem& item) {
    uint16_t told = 0;
    const NvError error = tool.WriteItem(phone, item, told);
    if (error != NvError::kNoConnection && error != NvError::kNoValue) Put(status, told);
    return error;
  });
}

// An operation of the tool over one file of the PC.
uint32_t OnFile(KRAL_HANDLE handle, const char* name,
                NvError (NVTool_Manager::*operation)(Diag_FTM& phone, const std::string& file), const char* file) {
  return OnTool(handle, name,
                [&](NVTool_Manager& tool, Diag_FTM& phone) { return (tool.*operation)(phone, Text(file)); });
}

}  // namespace

extern "C" {

uint32_t KRAL_CALL KRAL_NV_GetErrorText(KRAL_HANDLE, uint32_t code, char* text, uint32_t size) {
  return static_cast<uint32_t>(Give(kral::nv::TextOf(code), text, size));
}

uint32_t KRAL_CALL KRAL_NV_ConfigureCallBack(KRAL_HANDLE handle, KRAL_NV_CALLBACK callback) {
  return OnToolAlways(handle, "KRAL_NV_ConfigureCallBack",
                      [&](NVTool_Manager& tool, Diag_FTM&) { tool.SetCallback(callback); });
}

// --- Definitions
// ------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadNVDefinitionFile(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, "KRAL_NV_LoadNVDefinitionFile", [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.LoadDefinitions(phone, Text(file), NvDefinitionKind::kDefinitions);
  });
}

uint32_t KRAL_CALL KRAL_NV_LoadNVDataTypeDictinary(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, "KRAL_NV_LoadNVDataTypeDictinary", [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.LoadDefinitions(phone, Text(file), NvDefinitionKind::kDictionary);
  });
}

uint32_t KRAL_CALL KRAL_NV_ClearNVDefinition(KRAL_HANDLE handle) {
  return OnToolAlways(handle, "KRAL_NV_ClearNVDefinition",
                      [](NVTool_Manager& tool, Diag_FTM&) { tool.ClearDefinitions(); });
}

uint32_t KRAL_CALL KRAL_NV_GetNumOfNVDefinition(KRAL_HANDLE handle, uint32_t* count) {
  return OnToolAlways(handle, "KRAL_NV_GetNumOfNVDefinition", [&](NVTool_Manager& tool, Diag_FTM&) {
    Put(count, static_cast<uint32_t>(tool.definitions().numbered_count()));
  });
}

uint32_t KRAL_CALL KRAL_NV_GetNumOfNVEfsDefinition(KRAL_HANDLE handle, uint32_t* count) {
  return OnToolAlways(handle, "KRAL_NV_GetNumOfNVEfsDefinition", [&](NVTool_Manager& tool, Diag_FTM&) {
    Put(count, static_cast<uint32_t>(tool.definitions().file_count()));
  });
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndex(KRAL_HANDLE handle, uint32_t index, char* text, uint32_t size) {
  return GiveDefinition(handle, "KRAL_NV_GetNVDefinitionByIndex", AtIndex{index}, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByIndexStringLength(KRAL_HANDLE handle, uint32_t index, uint32_t* length) {
  return GiveDefinition(handle, "KRAL_NV_GetNVDefinitionByIndexStringLength", AtIndex{index}, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                        uint32_t size) {
  return GiveDefinition(handle, "KRAL_NV_GetNVDefinitionByEfsFilename", efs_file, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                    uint32_t* length) {
  return GiveDefinition(handle, "KRAL_NV_GetNVDefinitionByEfsFilenameStringLength", efs_file, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNames(KRAL_HANDLE handle, uint32_t index, char* text, uint32_t size) {
  return GiveFieldNames(handle, "KRAL_NV_GetNVDefinitionFieldNames", index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDefinitionFieldNamesStringLength(KRAL_HANDLE handle, uint32_t index, uint32_t* length) {
  return GiveFieldNames(handle, "KRAL_NV_GetNVDefinitionFieldNamesStringLength", index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinition(KRAL_HANDLE handle, const char* type_name, char* text,
                                                   uint32_t size) {
  return GiveType(handle, "KRAL_NV_GetNVDataTypeDefinition", type_name, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVDataTypeDefinitionStringLength(KRAL_HANDLE handle, const char* type_name,
                                                               uint32_t* length) {
  return GiveType(handle, "KRAL_NV_GetNVDataTypeDefinitionStringLength", type_name, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenames(KRAL_HANDLE handle, char* text, uint32_t size) {
  return GiveFileNames(handle, "KRAL_NV_GetNVEfsFilenames", Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVEfsFilenamesStringLength(KRAL_HANDLE handle, uint32_t* length) {
  return GiveFileNames(handle, "KRAL_NV_GetNVEfsFilenamesStringLength", Length{length});
}

// --- Values
// -----------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                       uint8_t* data, uint32_t* size) {
  return GetBytes(handle, "KRAL_NV_GetNVValueByteStreamByIndex", AtIndex{index}, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                      uint8_t* data, uint32_t* size) {
  return GetBytes(handle, "KRAL_NV_GetNVValueByteStreamByNVID", item, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                       const uint8_t* data, uint32_t size) {
  return SetBytes(handle, "KRAL_NV_SetNVValueByteStreamByIndex", AtIndex{index}, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueByteStreamByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                      const uint8_t* data, uint32_t size) {
  return SetBytes(handle, "KRAL_NV_SetNVValueByteStreamByNVID", item, array_index, data, size);
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index, char* text,
                                                   uint32_t size) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByIndex", AtIndex{index}, array_index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByIndexStringLength(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                               uint32_t* length) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByIndexStringLength", AtIndex{index}, array_index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index, char* text,
                                                  uint32_t size) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByNVID", item, array_index, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByNVIDStringLength(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                              uint32_t* length) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByNVIDStringLength", item, array_index, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file, char* text,
                                                         uint32_t size) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByEfsFilename", efs_file, 0, Buffer{text, size});
}

uint32_t KRAL_CALL KRAL_NV_GetNVValueStringByEfsFilenameStringLength(KRAL_HANDLE handle, const char* efs_file,
                                                                     uint32_t* length) {
  return GiveValue(handle, "KRAL_NV_GetNVValueStringByEfsFilenameStringLength", efs_file, 0, Length{length});
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t array_index,
                                                   const char* text) {
  return SetString(handle, "KRAL_NV_SetNVValueStringByIndex", AtIndex{index}, array_index, text);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t array_index,
                                                  const char* text) {
  return SetString(handle, "KRAL_NV_SetNVValueStringByNVID", item, array_index, text);
}

uint32_t KRAL_CALL KRAL_NV_SetNVValueStringByEfsFilename(KRAL_HANDLE handle, const char* efs_file, const char* text) {
  return SetString(handle, "KRAL_NV_SetNVValueStringByEfsFilename", efs_file, 0, text);
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValueByIndex(KRAL_HANDLE handle, uint32_t index) {
  return ClearValue(handle, "KRAL_NV_ClearNVValueByIndex", AtIndex{index});
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValueByNVID(KRAL_HANDLE handle, uint16_t item) {
  return ClearValue(handle, "KRAL_NV_ClearNVValueByNVID", item);
}

uint32_t KRAL_CALL KRAL_NV_ClearNVValues(KRAL_HANDLE handle) {
  return OnToolAlways(handle, "KRAL_NV_ClearNVValues", [](NVTool_Manager& tool, Diag_FTM&) { tool.ClearValues(); });
}

// --- Sets
// -------------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromMobile(KRAL_HANDLE handle) {
  return OnTool(handle, "KRAL_NV_LoadNVsFromMobile",
                [](NVTool_Manager& tool, Diag_FTM& phone) { return tool.LoadFromMobile(phone); });
}

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromPKV(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_LoadNVsFromPKV", &NVTool_Manager::LoadFromPkv, file);
}

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromSource(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_LoadNVsFromSource", &NVTool_Manager::LoadFromSource, file);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToMobile(KRAL_HANDLE handle) {
  return OnTool(handle, "KRAL_NV_WriteNVsToMobile",
                [](NVTool_Manager& tool, Diag_FTM& phone) { return tool.WriteToMobile(phone); });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToPKV(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_WriteNVsToPKV", &NVTool_Manager::WriteToPkv, file);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToSource(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_WriteNVsToSource", &NVTool_Manager::WriteToSource, file);
}

// --- Single items
// -----------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status) {
  return OnTool(handle, "KRAL_NV_ReadNVItemFromMobileByNVID", [&](NVTool_Manager& tool, Diag_FTM& phone) {
    uint16_t told = 0;
    const NvError error = tool.ReadItem(phone, item, told);
    if (error != NvError::kNoConnection) Put(status, told);
    return error;
  });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status) {
  return WriteItem(handle, "KRAL_NV_WriteNVItemToMobileByNVID", item, status);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t* status) {
  return WriteItem(handle, "KRAL_NV_WriteNVItemToMobileByIndex", AtIndex{index}, status);
}

uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file) {
  return OnTool(handle, "KRAL_NV_ReadNVItemFromMobileByEfsFilename",
                [&](NVTool_Manager& tool, Diag_FTM& phone) { return tool.ReadItem(phone, Text(efs_file)); });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file) {
  return WriteItem(handle, "KRAL_NV_WriteNVItemToMobileByEfsFilename", efs_file, nullptr);
}

// --- Filters
// ----------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadReadFilter(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_LoadReadFilter", &NVTool_Manager::LoadReadFilter, file);
}

uint32_t KRAL_CALL KRAL_NV_LoadWriteFilter(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, "KRAL_NV_LoadWriteFilter", &NVTool_Manager::LoadWriteFilter, file);
}

uint32_t KRAL_CALL KRAL_NV_ClearReadFilters(KRAL_HANDLE handle) {
  return OnToolAlways(handle, "KRAL_NV_ClearReadFilters",
                      [](NVTool_Manager& tool, Diag_FTM& phone) { tool.ClearReadFilters(phone); });
}

uint32_t KRAL_CALL KRAL_NV_ClearWriteFilters(KRAL_HANDLE handle) {
  return OnToolAlways(handle, "KRAL_NV_ClearWriteFilters",
                      [](NVTool_Manager& tool, Diag_FTM& phone) { tool.ClearWriteFilters(phone); });
}

uint32_t KRAL_CALL KRAL_NV_CreateNVFilter(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, "KRAL_NV_CreateNVFilter",
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.CreateFilter(Text(file), true); });
}

uint32_t KRAL_CALL KRAL_NV_CreateComplementNVFilter(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, "KRAL_NV_CreateComplementNVFilter",
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.CreateFilter(Text(file), false); });
}

// --- Reports
// ----------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_PKV_Diff(KRAL_HANDLE handle, const char* first_pkv, const char* second_pkv,
                                    const char* html_file) {
  return OnTool(handle, "KRAL_NV_PKV_Diff", [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.ComparePkv(phone, Text(first_pkv), Text(second_pkv), Text(html_file));
  });
}

uint32_t KRAL_CALL KRAL_NV_GenerateQDF(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, "KRAL_NV_GenerateQDF",
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.GenerateQdf(Text(file)); });
}

// --- Subscriptions
// ----------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_SetTargetSupportMultiSIM(KRAL_HANDLE handle, uint8_t supported) {
  return OnToolAlways(handle, "KRAL_NV_SetTargetSupportMultiSIM",
                      [&](NVTool_Manager& tool, Diag_FTM&) { tool.SetMultiSim(supported != 0); });
}

uint32_t KRAL_CALL KRAL_NV_GetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t* subscription) {
  return OnToolAlways(handle, "KRAL_NV_GetCurrentSubscriptionIndex",
                      [&](NVTool_Manager& tool, Diag_FTM&) { Put(subscription, tool.subscription()); });
}

uint32_t KRAL_CALL KRAL_NV_SetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t subscription) {
  return OnTool(handle, "KRAL_NV_SetCurrentSubscriptionIndex",
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.SetSubscription(subscription); });
}

}  // extern "C"
