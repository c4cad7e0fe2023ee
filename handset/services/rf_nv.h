// RF NV items: the dispatcher 36 of factory test mode over the item files below /nv/item_files/rfnv.
//
//   0 read   item (u16)                    -> item, status (u16), size (u16), data
//   1 write  item (u16), size (u16), data  -> item, status (u16)
#ifndef KRAL_HANDSET_SERVICES_RF_NV_H
#define KRAL_HANDSET_SERVICES_RF_NV_H

#include <string>

#include "handset/services/efs_service.h"

namespace kral::handset {

inline constexpr uint16_t kRfNvModeId = 36;

std::string RfNvPath(uint16_t item);

// What stands in the reply behind the command id.
Bytes CarryOutRfNv(EfsService& efs, uint16_t command, ByteView payload);

}  // namespace kral::handset

#endif
