// Answers the RF NV dispatcher; where the values are kept is the file system's affair.
#include "handset/services/rf_nv.h"

#include <array>
#include <cstdio>

#include "handset/services/nv_store.h"

namespace kral::handset {
namespace {

constexpr uint16_t kReadCommand = 0;
constexpr uint16_t kWriteCommand = 1;

Bytes Status(ByteView payload, NvStatus status) {
  return ByteWriter().U16(GetU16(payload, 0)).U16(static_cast<uint32_t>(status)).Take();
}

}  // namespace

std::string RfNvPath(uint16_t item) {
  std::array<char, 40> path{};
  std::snprintf(path.data(), path.size(), "/nv/item_files/rfnv/%08u", item);
  return path.data();
}

Bytes CarryOutRfNv(EfsService& efs, uint16_t command, ByteView payload) {
  const std::string path = RfNvPath(GetU16(payload, 0));
  switch (command) {
    case kReadCommand:
      if (const auto data = efs.File(path)) {
        return ByteWriter()
            .Raw(Status(payload, NvStatus::kDone))
            .U16(static_cast<uint32_t>(data->size()))
            .Raw(*data)
            .Take();
      }
      return Status(payload, NvStatus::kInactive);
    case kWriteCommand:
      if (payload.size() < 4 || payload.size() - 4 != GetU16(payload, 2)) return Status(payload, NvStatus::kFailed);
      efs.AddItemFile(path, payload.subspan(4));
      return Status(payload, NvStatus::kDone);
    default:
      return Status(payload, NvStatus::kBadItem);
  }
}

}  // namespace kral::handset
