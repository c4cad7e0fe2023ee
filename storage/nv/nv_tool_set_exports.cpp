// Exports of the NV tool: sets, single items, filters, reports, subscriptions.
#include <string>

#include "base/outputs.h"
#include "kral/nv_tool.h"
#include "storage/nv/nv_tool_call.h"

using kral::Diag_FTM;
using kral::Put;
using kral::TextOrEmpty;
using namespace kral::nv;

namespace {

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
                [&](NVTool_Manager& tool, Diag_FTM& phone) { return (tool.*operation)(phone, TextOrEmpty(file)); });
}

}  // namespace

extern "C" {

// --- Sets ------------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromMobile(KRAL_HANDLE handle) {
  return OnTool(handle, __func__, [](NVTool_Manager& tool, Diag_FTM& phone) { return tool.LoadFromMobile(phone); });
}

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromPKV(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::LoadFromPkv, file);
}

uint32_t KRAL_CALL KRAL_NV_LoadNVsFromSource(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::LoadFromSource, file);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToMobile(KRAL_HANDLE handle) {
  return OnTool(handle, __func__, [](NVTool_Manager& tool, Diag_FTM& phone) { return tool.WriteToMobile(phone); });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToPKV(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::WriteToPkv, file);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVsToSource(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::WriteToSource, file);
}

// --- Single items ----------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    uint16_t told = 0;
    const NvError error = tool.ReadItem(phone, item, told);
    if (error != NvError::kNoConnection) Put(status, told);
    return error;
  });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByNVID(KRAL_HANDLE handle, uint16_t item, uint16_t* status) {
  return WriteItem(handle, __func__, item, status);
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByIndex(KRAL_HANDLE handle, uint32_t index, uint16_t* status) {
  return WriteItem(handle, __func__, AtIndex{index}, status);
}

uint32_t KRAL_CALL KRAL_NV_ReadNVItemFromMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file) {
  return OnTool(handle, __func__,
                [&](NVTool_Manager& tool, Diag_FTM& phone) { return tool.ReadItem(phone, TextOrEmpty(efs_file)); });
}

uint32_t KRAL_CALL KRAL_NV_WriteNVItemToMobileByEfsFilename(KRAL_HANDLE handle, const char* efs_file) {
  return WriteItem(handle, __func__, efs_file, nullptr);
}

// --- Filters ---------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_LoadReadFilter(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::LoadReadFilter, file);
}

uint32_t KRAL_CALL KRAL_NV_LoadWriteFilter(KRAL_HANDLE handle, const char* file) {
  return OnFile(handle, __func__, &NVTool_Manager::LoadWriteFilter, file);
}

uint32_t KRAL_CALL KRAL_NV_ClearReadFilters(KRAL_HANDLE handle) {
  return OnToolAlways(handle, __func__, [](NVTool_Manager& tool, Diag_FTM& phone) { tool.ClearReadFilters(phone); });
}

uint32_t KRAL_CALL KRAL_NV_ClearWriteFilters(KRAL_HANDLE handle) {
  return OnToolAlways(handle, __func__, [](NVTool_Manager& tool, Diag_FTM& phone) { tool.ClearWriteFilters(phone); });
}

uint32_t KRAL_CALL KRAL_NV_CreateNVFilter(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, __func__,
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.CreateFilter(TextOrEmpty(file), true); });
}

uint32_t KRAL_CALL KRAL_NV_CreateComplementNVFilter(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, __func__,
                [&](NVTool_Manager& tool, Diag_FTM&) { return tool.CreateFilter(TextOrEmpty(file), false); });
}

// --- Reports ---------------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_PKV_Diff(KRAL_HANDLE handle, const char* first_pkv, const char* second_pkv,
                                    const char* html_file) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM& phone) {
    return tool.ComparePkv(phone, TextOrEmpty(first_pkv), TextOrEmpty(second_pkv), TextOrEmpty(html_file));
  });
}

uint32_t KRAL_CALL KRAL_NV_GenerateQDF(KRAL_HANDLE handle, const char* file) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) { return tool.GenerateQdf(TextOrEmpty(file)); });
}

// --- Subscriptions ---------------------------------------------------------------------------------------------------

uint32_t KRAL_CALL KRAL_NV_SetTargetSupportMultiSIM(KRAL_HANDLE handle, uint8_t supported) {
  return OnToolAlways(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) { tool.SetMultiSim(supported != 0); });
}

uint32_t KRAL_CALL KRAL_NV_GetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t* subscription) {
  return OnToolAlways(handle, __func__,
                      [&](NVTool_Manager& tool, Diag_FTM&) { Put(subscription, tool.subscription()); });
}

uint32_t KRAL_CALL KRAL_NV_SetCurrentSubscriptionIndex(KRAL_HANDLE handle, uint16_t subscription) {
  return OnTool(handle, __func__, [&](NVTool_Manager& tool, Diag_FTM&) { return tool.SetSubscription(subscription); });
}

}  // extern "C"
