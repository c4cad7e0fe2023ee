// What the requests of the handset's file system have in common on the wire.
#ifndef KRAL_HANDSET_SERVICES_EFS_WIRE_H
#define KRAL_HANDSET_SERVICES_EFS_WIRE_H

#include <algorithm>
#include <optional>
#include <string>

#include "handset/services/efs_tree.h"

namespace kral::handset::efs {

inline constexpr uint8_t kSubsystem = 19;
inline constexpr size_t kHeaderSize = 4;

inline uint32_t Number(EfsError error) {
  return static_cast<uint32_t>(error);
}

// Every reply repeats the header of its request.
inline ByteWriter Reply(ByteView request) {
  ByteWriter writer;
  writer.Raw(request.first(kHeaderSize));
  return writer;
}

inline Bytes ErrorReply(ByteView request, EfsError error) {
  return Reply(request).U32(Number(error)).Take();
}

// Nothing when the text has no end within the request.
inline std::optional<std::string> TextAt(ByteView request, size_t offset) {
  if (offset >= request.size()) return std::nullopt;
  const ByteView rest = request.subspan(offset);
  const auto end = std::ranges::find(rest, uint8_t{0});
  if (end == rest.end()) return std::nullopt;
  return std::string(rest.begin(), end);
}

}  // namespace kral::handset::efs

#endif
