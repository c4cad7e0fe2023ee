// Which logs, events and messages a handset sends: masks read from it, changed, and written back. The operations of
// the exported functions (include/kral/log.h).
#ifndef KRAL_COMMANDS_LOGS_LOG_MASK_H
#define KRAL_COMMANDS_LOGS_LOG_MASK_H

#include <array>
#include <cstdint>
#include <optional>
#include <span>

#include "base/failure.h"
#include "commands/logs/bit_mask.h"
#include "commands/logs/log_mask_format.h"

namespace kral {

class Diag_FTM;

namespace diag {

using Ids = std::span<const uint16_t>;

// --- Logs (log_mask.cpp) --------------------------------------------------------------------------------------------
// The number of items of each equipment id.
std::optional<std::array<uint32_t, kEquipmentIds>> GetLogRanges(Diag_FTM& phone);
// What a reply that tells another equipment id's mask counts as.
enum class OtherMask : uint8_t { kFailure, kNothingOn };
// The mask as the handset has it, `items` long; nothing when it cannot be had.
std::optional<BitMask> GetLogMask(Diag_FTM& phone, uint8_t equipment_id, uint32_t items, OtherMask other);

Failure NoEquipmentId(uint8_t equipment_id);

bool ModifyLogCodes(Diag_FTM& phone, uint8_t equipment_id, Ids codes, bool activate);
bool SetOnlyLogCode(Diag_FTM& phone, uint8_t equipment_id, uint16_t code, uint16_t items);
bool ClearAllLogCodes(Diag_FTM& phone, uint8_t equipment_id);

// --- Events (event_mask.cpp) ----------------------------------------------------------------------------------------
enum class EventChange : uint8_t { kListed, kAllOn, kAllOff };

std::optional<BitMask> GetEventMask(Diag_FTM& phone);
bool ControlEventReports(Diag_FTM& phone, Ids events, bool on, EventChange change);

// --- Messages (event_mask.cpp) --------------------------------------------------------------------------------------
bool EnableMessageCategory(Diag_FTM& phone, uint16_t category, bool on);

}  // namespace diag
}  // namespace kral

#endif
