// Who takes packets: the dispatcher from the de-framer, the sorter and others from the dispatcher.
#ifndef KRAL_TRANSPORT_PACKET_LISTENER_H
#define KRAL_TRANSPORT_PACKET_LISTENER_H

#include <cstdint>
#include <span>

namespace kral {

class PacketListener {
 public:
  virtual ~PacketListener() = default;
  // One whole packet, its two FCS bytes included; the bytes are valid during the call only.
  virtual void OnPacket(std::span<const uint8_t> packet) = 0;
};

}  // namespace kral

#endif
