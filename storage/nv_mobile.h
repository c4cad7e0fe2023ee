// Items on the handset: one at a time, whatever their kind.
#ifndef KRAL_STORAGE_NV_MOBILE_H
#define KRAL_STORAGE_NV_MOBILE_H

#include <cstdint>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "frame/diag_ftm.h"
#include "storage/nv_definitions.h"

namespace kral::nv {

inline constexpr uint16_t kNeverWritten = 5;  // status of an item that the handset knows and has no value for

// What became of an item. The status is the handset's NV status; of a file kNeverWritten when it is not there, else 0.
struct NvAnswer {
  enum class Kind { kOk, kRefused, kNoAnswer } kind;
  uint16_t status = 0;

  bool done() const { return kind == Kind::kOk; }
};

// One walk over items: what it has found out about the handset, it does not ask again.
class NvMobile {
 public:
  // With `multi_sim` numbered items are those of the subscription; without, the plain requests serve.
  NvMobile(Diag_FTM& phone, bool multi_sim, uint16_t subscription)
      : phone_(phone), multi_sim_(multi_sim), subscription_(subscription) {}

  // Values as they are kept (storage/nv_value.h). A request that gets no answer is repeated once when the handset
  // still answers others.
  NvAnswer Read(const NvItem& item, uint16_t element, NvBytes& stored);
  NvAnswer Write(const NvItem& item, uint16_t element, std::span<const uint8_t> stored);

  // Paths and sizes of the files below the folders in which handsets keep item files. False when it does not answer.
  bool ListItemFiles(std::vector<std::pair<std::string, uint32_t>>& files);

 private:
  NvAnswer ReadOnce(const NvItem& item, uint16_t element, NvBytes& stored);
  NvAnswer WriteOnce(const NvItem& item, uint16_t element, std::span<const uint8_t> stored);
  NvAnswer ReadFile(const NvItem& item, NvBytes& stored);
  NvAnswer WriteFile(const NvItem& item, std::span<const uint8_t> stored);
  NvAnswer Judged(bool answered, uint16_t status) const;
  bool ListFolder(const std::string& folder, int depth, std::vector<std::pair<std::string, uint32_t>>& files);
  bool MakeParents(const std::string& path);

  Diag_FTM& phone_;
  const bool multi_sim_;
  const uint16_t subscription_;
  bool has_rf_dispatcher_ = true;  // until it refuses
};

}  // namespace kral::nv

#endif
