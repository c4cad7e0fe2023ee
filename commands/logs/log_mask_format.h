// The requests that choose what a handset sends unasked: log configuration, event mask, message levels.
#ifndef KRAL_COMMANDS_LOGS_LOG_MASK_FORMAT_H
#define KRAL_COMMANDS_LOGS_LOG_MASK_FORMAT_H

#include <algorithm>
#include <cstddef>

#include "base/little_endian.h"
#include "commands/request.h"

namespace kral::diag {

inline constexpr std::size_t kEquipmentIds = 16;

namespace log_config_reply {
inline constexpr std::size_t kHeader = 8;                  // as in the request
inline constexpr std::size_t kStatus = 4;                  // some handsets; 0: done
inline constexpr std::size_t kRanges = 4 * kEquipmentIds;  // at the end: the number of items of each equipment id
inline constexpr std::size_t kMaskHeader = 8;  // equipment id and bits, in front of the mask, which ends the reply
}  // namespace log_config_reply

// 115, three zero bytes, the operation (u32).
struct LogConfigHeader {
  u32 operation;

  constexpr u32 key() const { return operation; }
  void Begin(Diag_FTM& phone) const {
    phone.packet().Reset();
    phone.packet().Append32(115);
    phone.packet().Append32(operation);
  }
  // A reply of more than a status repeats the equipment id as well, with or without a status in front of it.
  Reply Transmit(Diag_FTM& phone, u32 time_out_ms) const {
    const auto request = phone.packet().request();
    return phone.Send(phone.packet(), time_out_ms, 0, [request](std::span<const u8> reply) {
      constexpr size_t kHead = log_config_reply::kHeader;
      if (reply.size() < kHead) return true;
      if (!std::ranges::equal(reply.first(kHead), request.first(kHead))) return false;
      const auto equipment_id = LoadLe<u32>(request, kHead);
      return !equipment_id || reply.size() < kHead + 3 * sizeof(u32) || LoadLe<u32>(reply, kHead) == equipment_id ||
             LoadLe<u32>(reply, kHead + sizeof(u32)) == equipment_id;
    });
  }
};

template <class... Fields>
using LogConfigRequest = Request<LogConfigHeader, Fields...>;

inline constexpr LogConfigRequest<> kRetrieveLogRanges{1};
inline constexpr LogConfigRequest<u32, u32, Bytes> kSetLogMask{3};  // equipment id, bits, mask
inline constexpr LogConfigRequest<u32> kGetLogMask{4};              // equipment id
static_assert(AreSorted(kRetrieveLogRanges, kSetLogMask, kGetLogMask));

// 125: operation 4, first and last category, zero, then the levels of each category, one bit each.
inline constexpr DiagRequest<u8, u16, u16, u16, u32> kSetMessageLevels{125};
inline constexpr DiagRequest<u8, u16> kGetEventMask{129};              // zero, zero
inline constexpr DiagRequest<u8, u16, u16, Bytes> kSetEventMask{130};  // zero, zero, bits, mask
static_assert(AreSorted(kSetMessageLevels, kGetEventMask, kSetEventMask));

inline constexpr u32 kItemsPerEquipmentId = 4096;

// Nothing longer comes back in a reply.
inline constexpr std::size_t kLongestMask = 4096 - 2 - log_config_reply::kHeader - log_config_reply::kMaskHeader;

namespace event_mask_reply {
inline constexpr std::size_t kError = 1;  // u8; 0: done
inline constexpr std::size_t kBits = 4;   // u16
inline constexpr std::size_t kMask = 6;
}  // namespace event_mask_reply

inline constexpr u8 kSetLevels = 4;
inline constexpr u32 kAllLevels = 0xFFFFFFFF;

}  // namespace kral::diag

#endif
