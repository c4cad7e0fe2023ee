// Bytes to packets for the modes that speak in frames.
#include "handset/line/framed_mode.h"

#include <algorithm>

namespace kral::handset {

size_t FramedMode::OnBytes(ByteView bytes, Wire& wire) {
  size_t taken = 0;
  while (taken < bytes.size()) {
    std::optional<Bytes> packet;
    taken += decoder_.Feed(bytes.subspan(taken), packet);
    if (!packet) continue;
    {
      const std::lock_guard lock(packets_mutex_);
      const auto kept = ByteView(*packet).first(std::min(packet->size(), kKeptBytes));
      if (keep_) packets_.emplace_back(kept.begin(), kept.end());
    }
    if (!OnPacket(*packet, wire)) break;
  }
  return taken;
}

std::vector<Bytes> FramedMode::packets() const {
  const std::lock_guard lock(packets_mutex_);
  return packets_;
}

void FramedMode::KeepPackets(bool keep) {
  const std::lock_guard lock(packets_mutex_);
  keep_ = keep;
  packets_.clear();
}

}  // namespace kral::handset
