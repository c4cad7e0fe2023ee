// Who a handset is, as PKV files keep it.
#ifndef KRAL_STORAGE_ITEMS_PHONE_IDENTITY_H
#define KRAL_STORAGE_ITEMS_PHONE_IDENTITY_H

#include "frame/diag_ftm.h"
#include "storage/pkv/phone_storage_file.h"

namespace kral::items {

// As far as the handset tells.
void AppendIdentity(Diag_FTM& phone, pkv::PkvProperties& properties);

}  // namespace kral::items

#endif
