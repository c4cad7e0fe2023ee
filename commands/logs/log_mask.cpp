// Log masks: one per equipment id, read, changed and written back. Collecting what then comes is the sorter's.
#include "commands/logs/log_mask.h"

#include <algorithm>

#include "base/little_endian.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"
#include "transport/collection/name_table.h"

namespace kral::diag {
namespace {

template <class Row, class... Fields>
Reply Configure(Diag_FTM& phone, const Row& row, uint32_t first_word, size_t data_size, const Fields&... fields) {
  phone.log().WriteLine(
      kLogFn, "KRAL_DIAG_SetExtendedLogMask( iOperation = 0x%X, piOperationData[0] = 0x%X, iOperationDataSize=%d)",
      row.header.operation, first_word, static_cast<int>(data_size));
  return Send(phone, row, fields...);
}

// A reply has a status in front of its data or has none; only its length tells which. A refusal may come without the
// data. It is noted.
bool IsDone(std::span<const uint8_t> response, size_t data_size) {
  constexpr size_t kStatusAt = log_config_reply::kHeader;
  constexpr size_t kStatusAlone = kStatusAt + log_config_reply::kStatus;
  if (response.size() != kStatusAlone && response.size() != kStatusAlone + data_size) return true;
  const uint32_t status = *LoadLe<uint32_t>(response, kStatusAt);
  return status == 0 || Fail(Failure(KRAL_ERROR_REFUSED, "the handset refused the log configuration: status %u", status)
                                 .Status(KRAL_ERROR_STATUS_COMMAND, status));
}

bool SetLogMask(Diag_FTM& phone, uint8_t equipment_id, const BitMask& mask) {
  const size_t data_size = log_config_reply::kMaskHeader + mask.bytes().size();
  return Configure(phone, kSetLogMask, equipment_id, data_size, u32{equipment_id}, static_cast<u32>(mask.bits()),
                   mask.bytes()) &&
         IsDone(phone.packet().response(), data_size);  // it repeats what was set
}

bool IsMaskPossible(uint32_t items) {
  return BitMask::BytesFor(items) <= kLongestMask;
}

// The place of a code in the mask; nothing for one that lies outside.
std::optional<size_t> ItemOf(uint8_t equipment_id, uint16_t code, uint32_t items) {
  const uint32_t first = equipment_id * kItemsPerEquipmentId;
  if (code < first || code - first >= items) return std::nullopt;
  return code - first;
}

bool AreAllowed(Diag_FTM& phone, Ids codes, const char* function) {
  bool allowed = true;
  for (const uint16_t code : codes) {
    if (phone.names().Allows(NameTableKind::kAllowedLogs, code)) continue;
    phone.log().WriteLine(kLogErr, "%s()--log code 0x%X is not allowed", function, code);
    Fail(Failure(KRAL_ERROR_ARGUMENT, "log code 0x%04X is not in the table of allowed logs", code));
    allowed = false;
  }
  return allowed;
}

Failure OutOfRange(uint8_t equipment_id, uint16_t code, uint32_t items) {
  if (items == 0) {
    return Failure(KRAL_ERROR_ARGUMENT, "log code 0x%04X: the handset has no logs of equipment id %d", code,
                   equipment_id);
  }
  const uint32_t first = equipment_id * kItemsPerEquipmentId;
  return Failure(KRAL_ERROR_ARGUMENT, "log code 0x%04X is not one of equipment id %d, 0x%04X to 0x%04X", code,
                 equipment_id, first, first + items - 1);
}

Failure TooManyItems(uint8_t equipment_id, uint32_t items) {
  return Failure(KRAL_ERROR_LINK, "the handset tells %u logs of equipment id %d, more than a mask can have", items,
                 equipment_id);
}

// Codes that the handset has no bit for must not end up in another's.
bool AreInRange(Diag_FTM& phone, uint8_t equipment_id, Ids codes, uint32_t items, const char* function) {
  const auto outside = std::ranges::find_if(codes, [=](uint16_t code) { return !ItemOf(equipment_id, code, items); });
  if (outside == codes.end()) return true;
  phone.log().WriteLine(kLogErr, "%s()--log code 0x%X is outside the range of equipment ID %d", function, *outside,
                        equipment_id);
  return Fail(OutOfRange(equipment_id, *outside, items));
}

std::optional<uint32_t> GetItems(Diag_FTM& phone, uint8_t equipment_id) {
  if (equipment_id >= kEquipmentIds) Fail(NoEquipmentId(equipment_id));
  const auto ranges = equipment_id < kEquipmentIds ? GetLogRanges(phone) : std::nullopt;
  if (!ranges) return std::nullopt;
  const uint32_t items = (*ranges)[equipment_id];
  if (IsMaskPossible(items)) return items;
  Fail(TooManyItems(equipment_id, items));
  return std::nullopt;
}

struct Asked {
  uint32_t equipment_id;
  uint32_t items;
};

struct ToldMask {
  uint32_t equipment_id;
  uint32_t items;
  std::span<const uint8_t> bytes;
};

// The mask ends the reply exactly, behind its header; in front of that there may be a status. Anywhere else, or with
// more or fewer bytes than it announces, nothing tells a header from mask bytes that look like one.
// What is wrong has been noted.
std::optional<ToldMask> FindMask(Diag_FTM& phone, const Asked& asked) {
  const auto response = phone.packet().response();
  for (const size_t at : {log_config_reply::kHeader, log_config_reply::kHeader + log_config_reply::kStatus}) {
    if (at + log_config_reply::kMaskHeader > response.size()) break;
    const auto tail = response.subspan(at);
    const ToldMask told{*LoadLe<uint32_t>(tail), *LoadLe<uint32_t>(tail, sizeof(uint32_t)),
                        tail.subspan(log_config_reply::kMaskHeader)};
    if (told.equipment_id < kEquipmentIds && BitMask::BytesFor(told.items) == told.bytes.size()) {
      return IsDone(response, tail.size()) ? std::optional(told) : std::nullopt;
    }
    // The header that was to come, with a mask that does not fit. (A status and an equipment id are no such header.)
    const bool is_header = told.equipment_id == asked.equipment_id && told.items == asked.items;
    if (is_header && asked.items >= kEquipmentIds) break;
  }
  Fail(BadReply(phone, "holds no mask of the length that it tells"));
  return std::nullopt;
}

}  // namespace

Failure NoEquipmentId(uint8_t equipment_id) {
  return Failure(KRAL_ERROR_ARGUMENT, "the equipment id %d is not one of 0 to %zu", equipment_id, kEquipmentIds - 1);
}

std::optional<std::array<uint32_t, kEquipmentIds>> GetLogRanges(Diag_FTM& phone) {
  if (!Configure(phone, kRetrieveLogRanges, 0, 0)) return std::nullopt;
  const auto response = phone.packet().response();
  if (response.size() < log_config_reply::kHeader + log_config_reply::kRanges) {
    Fail(BadReply(phone, "is too short for the ranges"));
    return std::nullopt;
  }
  if (!IsDone(response, log_config_reply::kRanges)) return std::nullopt;
  const auto tail = response.last(log_config_reply::kRanges);
  std::array<uint32_t, kEquipmentIds> ranges{};
  for (size_t i = 0; i < ranges.size(); ++i) ranges[i] = *LoadLe<uint32_t>(tail, i * sizeof(uint32_t));
  return ranges;
}

std::optional<BitMask> GetLogMask(Diag_FTM& phone, uint8_t equipment_id, uint32_t items, OtherMask other) {
  if (!IsMaskPossible(items)) {
    Fail(TooManyItems(equipment_id, items));
    return std::nullopt;
  }
  if (!Configure(phone, kGetLogMask, equipment_id, sizeof(u32), u32{equipment_id})) return std::nullopt;
  const auto told = FindMask(phone, {equipment_id, items});
  if (!told) return std::nullopt;
  BitMask mask(items);
  if (told->equipment_id != equipment_id) {
    phone.log().WriteLine(kLogErr, "DIAG_ModifyExtendedLogCodes: Error fetching current log mask");
    if (other == OtherMask::kNothingOn) return mask;
    Fail(BadReply(phone, "holds the mask of another equipment id"));
    return std::nullopt;
  }
  if (told->items != items) {
    Fail(BadReply(phone, "holds a mask of another length than the ranges tell"));
    return std::nullopt;
  }
  std::ranges::copy(told->bytes, mask.bytes().begin());
  return mask;
}

bool ModifyLogCodes(Diag_FTM& phone, uint8_t equipment_id, Ids codes, bool activate) {
  auto& log = phone.log();
  log.WriteLine(kLogFn, "DIAG_ModifyExtendedLogCodes( iEquipmentID = %d,iLogCodeListSize = %d, bActivateLogs = %d)",
                equipment_id, static_cast<int>(codes.size()), activate ? 1 : 0);
  if (!AreAllowed(phone, codes, "DIAG_ModifyExtendedLogCodes")) return false;
  const auto items = GetItems(phone, equipment_id);
  if (!items) {
    log.WriteLine(kLogErr, "DIAG_ModifyExtendedLogCodes() -- failed to get log range");
    return false;
  }
  if (!AreInRange(phone, equipment_id, codes, *items, "DIAG_ModifyExtendedLogCodes")) return false;
  // Without the current mask nothing is written: an empty one in its place would switch the other codes off.
  auto mask = GetLogMask(phone, equipment_id, *items, OtherMask::kNothingOn);
  if (!mask) {
    log.WriteLine(kLogErr, "DIAG_ModifyExtendedLogCodes() -- failed to get the current log mask");
    return false;
  }
  bool needed = false;
  for (const uint16_t code : codes) {
    log.WriteLine(kLogRet, "DIAG_ModifyExtendedLogCodes() -- modifying log code 0x%X, bActivateLogs = %d", code,
                  activate ? 1 : 0);
    const size_t item = *ItemOf(equipment_id, code, *items);
    needed = needed || mask->Test(item) != activate;
    mask->Set(item, activate);
  }
  if (needed && !SetLogMask(phone, equipment_id, *mask)) return false;
  if (activate) phone.sorter().SetCollection(true);
  return true;
}

bool SetOnlyLogCode(Diag_FTM& phone, uint8_t equipment_id, uint16_t code, uint16_t items) {
  constexpr const char* kName = "KRAL_DIAG_SetExtendedLogCode";
  const Ids codes(&code, 1);
  if (!AreAllowed(phone, codes, kName) || !AreInRange(phone, equipment_id, codes, items, kName)) return false;
  if (!IsMaskPossible(items)) {
    phone.log().WriteLine(kLogErr, "%s()--a mask of %d items does not fit into a request", kName, items);
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "a mask of %d logs does not fit into a request", items));
  }
  BitMask mask(items);
  mask.Set(*ItemOf(equipment_id, code, items), true);
  if (!SetLogMask(phone, equipment_id, mask)) return false;
  phone.sorter().SetCollection(true);
  return true;
}

bool ClearAllLogCodes(Diag_FTM& phone, uint8_t equipment_id) {
  if (equipment_id >= kEquipmentIds) return Fail(NoEquipmentId(equipment_id));
  const auto items = GetItems(phone, equipment_id);
  // Only told, with another function's name: the handset is then sent a mask without bits. Kept.
  if (!items) phone.log().WriteLine(kLogErr, "KRAL_DIAG_AddExtendedLogCodes() -- failed to get log range");
  return SetLogMask(phone, equipment_id, BitMask(items.value_or(0)));
}

}  // namespace kral::diag
