// Who takes packets: the dispatcher from the de-framer, the sorter and others from the dispatcher.
#ifndef KRAL_TRANSPORT_LINE_PACKET_LISTENER_H
#define KRAL_TRANSPORT_LINE_PACKET_LISTENER_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace kral {

inline constexpr size_t kMaximumPacket = 4096;  // FCS bytes included

using Packet = std::vector<uint8_t>;

class PacketListener {
 public:
  virtual ~PacketListener() = default;
  // One whole packet, its two FCS bytes included; the bytes are valid during the call only.
  virtual void OnPacket(std::span<const uint8_t> packet) = 0;
  // The same for a packet that nobody else needs any more: a listener that keeps packets keeps this one uncopied.
  virtual void TakePacket(Packet packet) { OnPacket(packet); }
  // Whether its calls take moments only, and run nobody else's code: then they may come on the thread that receives.
  virtual bool IsPrompt() const { return false; }
  // Follows the last of some packets that came together: a listener need not wake anybody sooner.
  virtual void OnBatchEnd() {}
};

}  // namespace kral

#endif
