// Exports of the log masks, the event mask, the message categories, and the tables of names.
#include <algorithm>
#include <cstring>
#include <string>

#include "base/outputs.h"
#include "commands/logs/log_mask.h"
#include "frame/export_call.h"
#include "kral/log.h"
#include "transport/collection/name_table.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::NameTable;
using kral::NameTableFault;
using kral::NameTableKind;
using kral::Put;
namespace diag = kral::diag;

static_assert(KRAL_EQUIPMENT_IDS == diag::kEquipmentIds);
static_assert(KRAL_TABLE_ALLOWED_EVENTS == static_cast<uint32_t>(NameTableKind::kAllowedEvents));

bool ReadRanges(Diag_FTM& phone, uint32_t* last_items) {
  const auto ranges = diag::GetLogRanges(phone);
  if (!ranges) return false;
  std::copy(ranges->begin(), ranges->end(), last_items);
  return true;
}

bool PutMask(const kral::BitMask& mask, uint16_t* size, uint8_t* bytes) {
  if (mask.bytes().size() > *size) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the mask of %zu bytes does not fit into %d", mask.bytes().size(), *size));
  }
  std::copy(mask.bytes().begin(), mask.bytes().end(), bytes);
  *size = static_cast<uint16_t>(mask.bytes().size());
  return true;
}

Failure NoRoom() {
  return Failure(KRAL_ERROR_ARGUMENT, "there is no buffer for the mask");
}

bool ReadLogMask(Diag_FTM& phone, uint8_t equipment_id, uint32_t* bits, uint16_t* size, uint8_t* bytes) {
  if (size == nullptr || bytes == nullptr) return Fail(NoRoom());
  if (equipment_id >= diag::kEquipmentIds) return Fail(diag::NoEquipmentId(equipment_id));
  const auto ranges = diag::GetLogRanges(phone);
  if (!ranges) return false;
  const auto mask = diag::GetLogMask(phone, equipment_id, (*ranges)[equipment_id], diag::OtherMask::kFailure);
  if (!mask || !PutMask(*mask, size, bytes)) return false;
  Put(bits, static_cast<uint32_t>(mask->bits()));
  return true;
}

bool ReadEventMask(Diag_FTM& phone, uint16_t* bits, uint16_t* size, uint8_t* bytes) {
  if (size == nullptr || bytes == nullptr) return Fail(NoRoom());
  const auto mask = diag::GetEventMask(phone);
  if (!mask || !PutMask(*mask, size, bytes)) return false;
  Put(bits, static_cast<uint16_t>(mask->bits()));
  return true;
}

bool LoadTable(Diag_FTM& phone, uint32_t table, const char* file_name) {
  if (table >= kral::kNameTableCount) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "the table %u is not one of 0 to %zu", table, kral::kNameTableCount - 1));
  }
  std::shared_ptr<const NameTable> loaded;
  if (file_name != nullptr) {
    NameTableFault fault;
    loaded = NameTable::Load(file_name, fault);
    if (!loaded) {
      phone.log().WriteLine(kral::kLogErr, "KRAL_LoadNameTable() -- %s: %s", file_name, fault.text.c_str());
      Failure failure(KRAL_ERROR_BAD_FILE, "the table %.150s cannot be read: %.80s", file_name, fault.text.c_str());
      failure.System(fault.system_error);
      return Fail(fault.line == 0 ? failure : failure.Line(fault.line));
    }
  }
  phone.names().Set(static_cast<NameTableKind>(table), std::move(loaded));
  return true;
}

bool PutText(const std::string& text, uint16_t size, char* output) {
  if (output == nullptr || size == 0) return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no room for the name"));
  const size_t length = std::min<size_t>(text.size(), size - 1U);
  std::memcpy(output, text.data(), length);
  output[length] = '\0';
  return true;
}

bool ReadName(Diag_FTM& phone, NameTableKind kind, uint16_t id, uint16_t size, char* output) {
  const auto table = phone.names().Get(kind);
  const std::string* const name = table->Find(id);
  if (name == nullptr) return Fail(Failure(KRAL_ERROR_ARGUMENT, "the table has no name for %d", id));
  return PutText(*name, size, output);
}

bool CountCategories(Diag_FTM& phone, uint32_t* count) {
  Put(count, static_cast<uint32_t>(phone.names().Get(NameTableKind::kMessageCategories)->rows().size()));
  return true;
}

bool ReadCategory(Diag_FTM& phone, uint32_t index, uint16_t* category, uint16_t size, char* name) {
  const auto table = phone.names().Get(NameTableKind::kMessageCategories);
  if (index >= table->rows().size()) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no category %u in a table of %zu", index, table->rows().size()));
  }
  if (!PutText(table->rows()[index].name, size, name)) return false;
  Put(category, table->rows()[index].id);
  return true;
}

bool EnableCategory(Diag_FTM& phone, uint16_t category, bool on) {
  if (phone.names().Allows(NameTableKind::kMessageCategories, category)) {
    return diag::EnableMessageCategory(phone, category, on);
  }
  phone.log().WriteLine(kral::kLogErr, "KRAL_ExtendedTextMessage_SetCategoryEnable() -- no category %d in the table",
                        category);
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "message category %d is not in the table of categories", category));
}

constexpr const char* kNoList = "there is no list";

bool IsList(const uint16_t* ids, uint16_t count) {
  return ids != nullptr || count == 0;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_DIAG_SetExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code,
                                               uint16_t last_item) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d, iLogCode = 0x%X, iLastItem = %d )", equipment_id, log_code, last_item)
      .Run(diag::SetOnlyLogCode, equipment_id, log_code, last_item);
}

uint8_t KRAL_CALL KRAL_DIAG_AddExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d, iLogCode = 0x%X )", equipment_id, log_code)
      .Run(diag::ModifyLogCodes, equipment_id, diag::Ids(&log_code, 1), true);
}

uint8_t KRAL_CALL KRAL_DIAG_AddExtendedLogCodes(KRAL_HANDLE handle, uint8_t equipment_id, const uint16_t* log_codes,
                                                uint16_t count) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d, iLogCodeListSize = %d )", equipment_id, count)
      .Require(IsList(log_codes, count), kNoList)
      .Run(diag::ModifyLogCodes, equipment_id, diag::Ids(log_codes, count), true);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearExtendedLogCode(KRAL_HANDLE handle, uint8_t equipment_id, uint16_t log_code) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d, iLogCode = 0x%X )", equipment_id, log_code)
      .Run(diag::ModifyLogCodes, equipment_id, diag::Ids(&log_code, 1), false);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearExtendedLogCodes(KRAL_HANDLE handle, uint8_t equipment_id, const uint16_t* log_codes,
                                                  uint16_t count) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d, iLogCodeListSize = %d )", equipment_id, count)
      .Require(IsList(log_codes, count), kNoList)
      .Run(diag::ModifyLogCodes, equipment_id, diag::Ids(log_codes, count), false);
}

uint8_t KRAL_CALL KRAL_DIAG_ClearAllLogCodes(KRAL_HANDLE handle, uint8_t equipment_id) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d )", equipment_id)
      .Run(diag::ClearAllLogCodes, equipment_id);
}

uint8_t KRAL_CALL KRAL_DIAG_GetLogRanges(KRAL_HANDLE handle, uint32_t* last_items) {
  return ExportCall(handle, __func__)
      .Require(last_items != nullptr, "there is no room for the ranges")
      .Run(ReadRanges, last_items);
}

uint8_t KRAL_CALL KRAL_DIAG_GetLogMask(KRAL_HANDLE handle, uint8_t equipment_id, uint32_t* bits, uint16_t* size,
                                       uint8_t* mask) {
  return ExportCall(handle, __func__)
      .Logged("( iEquipmentID = %d )", equipment_id)
      .Run(ReadLogMask, equipment_id, bits, size, mask);
}

uint8_t KRAL_CALL KRAL_DIAG_SetEventMaskBit(KRAL_HANDLE handle, uint16_t event_id, uint8_t state) {
  return ExportCall(handle, __func__)
      .Logged("( iMaskID = %d, bMaskState = %d )", event_id, state)
      .Run(diag::ControlEventReports, diag::Ids(&event_id, 1), state == 1, diag::EventChange::kListed);
}

uint8_t KRAL_CALL KRAL_DIAG_SetEventMaskBits(KRAL_HANDLE handle, const uint16_t* event_ids, uint16_t count,
                                             uint8_t state) {
  return ExportCall(handle, __func__)
      .Logged("( iMaskID_ListSize = %d, bMaskState = %d )", count, state)
      .Require(IsList(event_ids, count), kNoList)
      .Run(diag::ControlEventReports, diag::Ids(event_ids, count), state == 1, diag::EventChange::kListed);
}

uint8_t KRAL_CALL KRAL_DIAG_SetEntireEventMaskState(KRAL_HANDLE handle, uint8_t state) {
  return ExportCall(handle, __func__)
      .Logged("( bMaskState = %d )", state)
      .Run(diag::ControlEventReports, diag::Ids(), state == 1,
           state == 1 ? diag::EventChange::kAllOn : diag::EventChange::kAllOff);
}

uint8_t KRAL_CALL KRAL_DIAG_GetEventMask(KRAL_HANDLE handle, uint16_t* bits, uint16_t* size, uint8_t* mask) {
  return ExportCall(handle, __func__).Run(ReadEventMask, bits, size, mask);
}

uint8_t KRAL_CALL KRAL_LoadNameTable(KRAL_HANDLE handle, uint32_t table, const char* file_name) {
  return ExportCall(handle, __func__).Logged("( iTable = %u )", table).RunAtOnce(LoadTable, table, file_name);
}

uint8_t KRAL_CALL KRAL_GetEventText(KRAL_HANDLE handle, uint16_t event_id, uint16_t size, char* text) {
  return ExportCall(handle, __func__).RunAtOnce(ReadName, NameTableKind::kEventTexts, event_id, size, text);
}

uint8_t KRAL_CALL KRAL_GetLogCodeText(KRAL_HANDLE handle, uint16_t log_code, uint16_t size, char* text) {
  return ExportCall(handle, __func__).RunAtOnce(ReadName, NameTableKind::kLogNames, log_code, size, text);
}

uint8_t KRAL_CALL KRAL_ExtendedTextMessage_GetCategoryListSize(KRAL_HANDLE handle, uint32_t* count) {
  return ExportCall(handle, __func__).RunAtOnce(CountCategories, count);
}

uint8_t KRAL_CALL KRAL_ExtendedTextMessage_GetCategoryListItem(KRAL_HANDLE handle, uint32_t index, uint16_t* category,
                                                               uint16_t size, char* name) {
  return ExportCall(handle, __func__)
      .Logged("( iIndex = %u )", index)
      .RunAtOnce(ReadCategory, index, category, size, name);
}

uint8_t KRAL_CALL KRAL_ExtendedTextMessage_SetCategoryEnable(KRAL_HANDLE handle, uint16_t category, uint8_t enable) {
  return ExportCall(handle, __func__)
      .Logged("( iCategory = %d, bEnable = %d )", category, enable)
      .Run(EnableCategory, category, enable == 1);
}

}  // extern "C"
