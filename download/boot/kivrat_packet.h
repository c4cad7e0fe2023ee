// Reading and writing of boot transfer packets, shared by the hello exchange and the image transfer.
#ifndef KRAL_DOWNLOAD_BOOT_KIVRAT_PACKET_H
#define KRAL_DOWNLOAD_BOOT_KIVRAT_PACKET_H

#include <array>
#include <span>

#include "base/failure.h"
#include "base/little_endian.h"
#include "download/boot/kivrat_format.h"
#include "download/boot/raw_port.h"

namespace kral::kivrat {

// A field of a packet; one that the packet does not hold reads as 0.
inline uint32_t Field(std::span<const uint8_t> packet, size_t offset) {
  return LoadLe<uint32_t>(packet, offset).value_or(0);
}

// True for a whole packet of that kind, its length field included.
inline bool IsPacket(std::span<const uint8_t> packet, uint32_t command) {
  return Field(packet, kCommandAt) == command && Field(packet, kLengthAt) == packet.size();
}

// A packet that is none of that kind.
inline Failure OtherPacket(std::span<const uint8_t> packet, const char* wanted) {
  const uint32_t command = Field(packet, kCommandAt);
  return Failure(KRAL_ERROR_LINK, "the boot loader sent packet %u of %u bytes instead of %s", command,
                 Field(packet, kLengthAt), wanted)
      .Status(KRAL_ERROR_STATUS_LOADER, command);
}

// A packet of so many fields behind its header.
template <class... Fields>
bool WritePacket(RawPort& port, uint32_t command, Fields... fields) {
  constexpr size_t kSize = kHeaderSize + 4 * sizeof...(fields);
  std::array<uint8_t, kSize> packet{};
  StoreLe<uint32_t>(packet, kCommandAt, command);
  StoreLe<uint32_t>(packet, kLengthAt, kSize);
  size_t offset = kHeaderSize;
  ((StoreLe<uint32_t>(packet, offset, fields), offset += 4), ...);
  return port.Write(packet);
}

}  // namespace kral::kivrat

#endif
