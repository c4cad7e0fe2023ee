// The NV requests and their replies. A reply ends with the status, except that of the batch write.
#ifndef KRAL_COMMANDS_NV_NV_FORMAT_H
#define KRAL_COMMANDS_NV_NV_FORMAT_H

#include "commands/nv/nv_item.h"
#include "commands/request.h"

namespace kral::nv {

inline constexpr u8 kSubsystem = 48;

// Where the data stand, in request and reply: what is in front of them the reply repeats.
inline constexpr u8 kItemData = 3;
inline constexpr u8 kElementData = 4;
inline constexpr u8 kExtendedData = 8;

// The caller's buffer and status go out with a read as they stand. A write has exactly 128 data bytes and,
// deliberately, no status behind them.
inline constexpr DiagRequest<u16, Bytes, u16> kReadItem{38, kItemData};
inline constexpr DiagRequest<u16, u8> kReadElement{38, kElementData};  // item, array index
inline constexpr DiagRequest<u16, Block<kDataSize>> kWriteItem{39, kItemData, kItemData + kDataSize};

// The same for one subscription (the context).
inline constexpr SubsystemRequest<u16, u16, u16, Bytes> kWriteBatch{kSubsystem, 0};  // items, payload size, zero
inline constexpr SubsystemRequest<u16, u16, Bytes, u16> kReadExtended{kSubsystem, 1, kExtendedData};
inline constexpr SubsystemRequest<u16, u16, Block<kDataSize>, u16> kWriteExtended{kSubsystem, 2, kExtendedData,
                                                                                  kExtendedData + kDataSize};
static_assert(AreSorted(kWriteBatch, kReadExtended, kWriteExtended));

namespace batch {
// A packet is full when its payload would reach this.
inline constexpr size_t kPayloadLimit = 1320;
inline constexpr size_t kItemHeader = 4;  // length u8, item u16, zero u8; in the reply the status u8 is the last

inline constexpr size_t kPayload = 10;

// The reply.
inline constexpr size_t kResultCount = 4;
inline constexpr size_t kTotalStatus = 8;
inline constexpr size_t kResults = 10;
inline constexpr size_t kResultItem = 1;
inline constexpr size_t kResultStatus = 3;
}  // namespace batch

}  // namespace kral::nv

#endif
