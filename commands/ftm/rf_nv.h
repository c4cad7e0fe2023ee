// RF NV items: calibration values numbered beside the plain items, of any size. They are kept as item files, and a
// handset in factory test mode hands them out through its RF NV dispatcher.
//
//   command 0, read:   item u16                       reply: item u16, status u16, size u16, data
//   command 1, write:  item u16, size u16, data       reply: item u16, status u16
#ifndef KRAL_COMMANDS_FTM_RF_NV_H
#define KRAL_COMMANDS_FTM_RF_NV_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace kral {

class Diag_FTM;

namespace nv {

inline constexpr size_t kRfDataSize = 4000;  // what a request and its reply have room for

// True when the handset answered; the data count only with status 0. False without traffic under command code 59, which
// has no dispatchers, and while requests are queued.
bool ReadRf(Diag_FTM& phone, uint16_t item, std::vector<uint8_t>& data, uint16_t& status);
bool WriteRf(Diag_FTM& phone, uint16_t item, std::span<const uint8_t> data, uint16_t& status);

}  // namespace nv
}  // namespace kral

#endif
