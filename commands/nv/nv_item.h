// NV items: the handset's numbered non-volatile settings, up to 128 bytes each. Every function is one request. The
// reply is the expected one when the handset told a status, which the caller has to look at.
#ifndef KRAL_COMMANDS_NV_NV_ITEM_H
#define KRAL_COMMANDS_NV_NV_ITEM_H

#include <cstddef>
#include <cstdint>
#include <span>

#include "base/failure.h"
#include "kral/nv.h"
#include "transport/engine/reply.h"

namespace kral {

class Diag_FTM;

namespace nv {

// The statuses that matter here, under the names of this side.
inline constexpr uint16_t kDone = KRAL_NV_STATUS_DONE;
inline constexpr uint16_t kNeverWritten = KRAL_NV_STATUS_NEVER_WRITTEN;
inline constexpr uint16_t kNoSuchItem = KRAL_NV_STATUS_UNKNOWN_ITEM;
inline constexpr uint16_t kReadOnly = KRAL_NV_STATUS_READ_ONLY;

inline constexpr uint16_t kEsnItem = 0;
inline constexpr size_t kDataSize = 128;

// Reads one item into `data`, whose present bytes, and the status, go out with the request. A reply shorter than the
// request cannot be used. A non-zero status leaves the data untouched.
Reply Read(Diag_FTM& phone, uint16_t item, std::span<uint8_t> data, uint16_t& status);
Reply ReadExtended(Diag_FTM& phone, uint16_t item, uint16_t context, std::span<uint8_t> data, uint16_t& status);

// Reads one element of an array item; the status goes out only.
Reply ReadElement(Diag_FTM& phone, uint16_t item, uint8_t index, std::span<uint8_t> data, uint16_t& status);

// Writes one item: always 128 data bytes, the given ones zero-filled or cut.
Reply Write(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t& status);
Reply WriteExtended(Diag_FTM& phone, uint16_t item, uint16_t context, std::span<const uint8_t> data, uint16_t& status);
// The element's index stands in front of its data, which are cut at 127 bytes.
Reply WriteElement(Diag_FTM& phone, uint16_t item, uint8_t index, std::span<const uint8_t> data, uint16_t& status);

// What to note where a status is a failure.
Failure Refusal(uint16_t item, uint16_t status);

}  // namespace nv
}  // namespace kral

#endif
