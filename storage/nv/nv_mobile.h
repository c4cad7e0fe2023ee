// Items on the handset as the NV tool's sets need them: one at a time, whatever their kind.
#ifndef KRAL_STORAGE_NV_NV_MOBILE_H
#define KRAL_STORAGE_NV_NV_MOBILE_H

#include <cstdint>
#include <span>
#include <vector>

#include "commands/nv/nv_item.h"
#include "storage/items/phone_items.h"
#include "storage/nv/nv_definitions.h"

namespace kral::nv {

// What became of an item. The status is the handset's NV status; of a file kNeverWritten when it is not there, else 0.
// Unless it is done, why is noted.
struct NvAnswer {
  enum class Kind { kOk, kRefused, kNoAnswer } kind;
  uint16_t status = 0;

  bool done() const { return kind == Kind::kOk; }
};

// Of a file that nobody has seen yet, by the size of its value.
uint32_t ModeOfNewFile(size_t size);

// One walk over items: what it has found out about the handset, it does not ask again.
class NvMobile {
 public:
  NvMobile(Diag_FTM& phone, uint16_t subscription) : phone_(phone), subscription_(subscription), items_(phone) {}

  // Values as they are kept (storage/nv_value.h). What gets no answer in spite of several tries counts as refused as
  // long as the handset answers others.
  NvAnswer Read(NvItem& item, uint16_t element, NvBytes& stored);  // and the mode of a file
  NvAnswer Write(const NvItem& item, uint16_t element, std::span<const uint8_t> stored);

  // The files in the folders in which handsets keep item files. kRefused when they could not all be listed.
  items::PhoneItems::Answer ListItemFiles(std::vector<items::PhoneItems::FoundFile>& files);

 private:
  // No request names both an element and a subscription: of another than 0, arrays have no value and take none.
  bool CanName(const NvItem& item) const;
  NvAnswer ReadFile(NvItem& item, NvBytes& stored);
  NvAnswer WriteFile(const NvItem& item, std::span<const uint8_t> stored);
  pkv::PkvNvItem Numbered(const NvItem& item, uint16_t element) const;

  Diag_FTM& phone_;
  const uint16_t subscription_;
  items::PhoneItems items_;
  bool has_rf_dispatcher_ = true;  // until it refuses
};

}  // namespace kral::nv

#endif
