// NV items: the handset's numbered non-volatile settings, up to 128 bytes each.
#ifndef KRAL_COMMANDS_NV_ITEM_H
#define KRAL_COMMANDS_NV_ITEM_H

#include <cstdint>
#include <span>

namespace kral {

class Diag_FTM;

namespace nv {

inline constexpr uint16_t kDone = 0;  // NV status: success
inline constexpr uint16_t kEsnItem = 0;

// Reads one item into `data`, whose present bytes, and the status, go out with the request. False when no reply
// came or one shorter than the request. True with a non-zero status leaves the data untouched.
bool Read(Diag_FTM& phone, uint16_t item, std::span<uint8_t> data, uint16_t& status);

}  // namespace nv
}  // namespace kral

#endif
