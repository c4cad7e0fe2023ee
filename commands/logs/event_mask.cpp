// The event mask, and the message levels: what else a handset sends unasked beside logs.
#include <algorithm>

#include "base/little_endian.h"
#include "commands/logs/log_mask.h"
#include "frame/diag_ftm.h"
#include "frame/request_failure.h"
#include "transport/collection/name_table.h"

namespace kral::diag {
namespace {

// The byte is 0 when the handset has done as asked.
bool IsAccepted(Diag_FTM& phone, const char* function) {
  uint8_t error = 0;
  if (!phone.packet().ResponseAt8(event_mask_reply::kError, error)) return Fail(BadReply(phone, "has no error byte"));
  if (error == 0) return true;
  phone.log().WriteLine(kLogErr, "%s() -- Error code %d fails", function, error);
  return Fail(Failure(KRAL_ERROR_REFUSED, "the handset refused the event mask with error %d", error)
                  .Status(KRAL_ERROR_STATUS_COMMAND, error)
                  .Command(phone.packet().request()));
}

bool SetEventMask(Diag_FTM& phone, const BitMask& mask) {
  return Send(phone, kSetEventMask, u8{0}, u16{0}, static_cast<u16>(mask.bits()), mask.bytes()) &&
         IsAccepted(phone, "DIAG_EVENT_MASK_SET_F");
}

bool AreAllowed(Diag_FTM& phone, Ids events) {
  bool allowed = true;
  for (const uint16_t event : events) {
    if (phone.names().Allows(NameTableKind::kAllowedEvents, event)) continue;
    phone.log().WriteLine(kLogErr, "KRAL_DIAG_SetEventMaskBits()--event ID 0x%X is not allowed", event);
    Fail(Failure(KRAL_ERROR_ARGUMENT, "event %d is not in the table of allowed events", event));
    allowed = false;
  }
  return allowed;
}

Failure OutOfRange(uint16_t event, const BitMask& mask) {
  if (mask.bits() == 0) return Failure(KRAL_ERROR_ARGUMENT, "event %d: the handset has no events", event);
  return Failure(KRAL_ERROR_ARGUMENT, "event %d is not one of the handset's, 0 to %zu", event, mask.bits() - 1);
}

bool SetListed(Diag_FTM& phone, BitMask& mask, Ids events, bool on) {
  for (const uint16_t event : events) {
    if (event >= mask.bits()) {
      phone.log().WriteLine(kLogErr, "KRAL_DIAG_SetEventMaskBits()--event ID 0x%X is outside the handset's range",
                            event);
      return Fail(OutOfRange(event, mask));
    }
    phone.log().WriteLine(kLogRet, "KRAL_DIAG_SetEventMaskBits() -- adding event code %d", event);
    mask.Set(event, on);
  }
  return true;
}

}  // namespace

std::optional<BitMask> GetEventMask(Diag_FTM& phone) {
  phone.log().WriteLine(kLogFn, "DIAG_EVENT_MASK_GET_F()");
  if (!Send(phone, kGetEventMask, u8{0}, u16{0}) || !IsAccepted(phone, "DIAG_EVENT_MASK_GET_F")) return std::nullopt;
  uint16_t bits = 0;
  if (!phone.packet().ResponseAt16(event_mask_reply::kBits, bits)) {
    Fail(BadReply(phone, "has no number of events"));
    return std::nullopt;
  }
  // One byte more than the mask has where the number divides by 8: this text alone counts so.
  phone.log().WriteLine(kLogRet, "DIAG_EVENT_MASK_GET_F() -- NUM_BITS = %d, Mask Size (bytes)= %d", bits, bits / 8 + 1);
  BitMask mask(bits);
  const auto response = phone.packet().response();
  if (response.size() < event_mask_reply::kMask + mask.bytes().size()) {
    Fail(BadReply(phone, "is too short for the mask that it announces"));
    return std::nullopt;
  }
  std::copy_n(response.begin() + event_mask_reply::kMask, mask.bytes().size(), mask.bytes().begin());
  return mask;
}

bool ControlEventReports(Diag_FTM& phone, Ids events, bool on, EventChange change) {
  phone.log().WriteLine(
      kLogFn,
      "KRAL_DIAG_EventReportControl( iMaskID_ListSize = %d, bMaskState = %d, bSetAllBitsOn = %d, bSetAllBitsOff = %d)",
      static_cast<int>(events.size()), on ? 1 : 0, change == EventChange::kAllOn ? 1 : 0,
      change == EventChange::kAllOff ? 1 : 0);
  if (!AreAllowed(phone, events)) return false;
  auto mask = GetEventMask(phone);
  if (!mask) {
    phone.log().WriteLine(kLogErr, "DIAG_SetEventMaskBits() -- failed to get event mask");
    return false;
  }
  if (change == EventChange::kListed) {
    if (!SetListed(phone, *mask, events, on)) return false;
  } else {
    std::fill(mask->bytes().begin(), mask->bytes().end(), change == EventChange::kAllOn ? 0xFF : 0x00);
  }
  if (!SetEventMask(phone, *mask)) return false;
  phone.sorter().SetCollection(true);  // whether events were switched on or off
  return true;
}

bool EnableMessageCategory(Diag_FTM& phone, uint16_t category, bool on) {
  const u32 levels = on ? kAllLevels : 0;
  if (!Send(phone, kSetMessageLevels, kSetLevels, category, category, u16{0}, levels)) return false;
  if (on) phone.sorter().SetCollection(true);
  return true;
}

}  // namespace kral::diag
