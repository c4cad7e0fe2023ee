// The packets of the Kivrat boot transfer protocol: commands, field offsets, sizes. Every field is an unsigned 32-bit
// little-endian integer; the first is the command, the second the length of the whole packet.
#ifndef KRAL_DOWNLOAD_BOOT_KIVRAT_FORMAT_H
#define KRAL_DOWNLOAD_BOOT_KIVRAT_FORMAT_H

#include <cstddef>
#include <cstdint>

namespace kral::kivrat {

inline constexpr uint32_t kHello = 1;
inline constexpr uint32_t kHelloResponse = 2;
inline constexpr uint32_t kReadData = 3;
inline constexpr uint32_t kEndOfTransfer = 4;
inline constexpr uint32_t kDone = 5;
inline constexpr uint32_t kDoneResponse = 6;
inline constexpr uint32_t kCommandReady = 11;
inline constexpr uint32_t kSwitchMode = 12;
inline constexpr uint32_t kExecute = 13;
inline constexpr uint32_t kExecuteResponse = 14;
inline constexpr uint32_t kExecuteData = 15;

inline constexpr uint32_t kModeImageTransfer = 0;
inline constexpr uint32_t kModeCommand = 3;
inline constexpr uint32_t kReadChipIdentity = 2;  // the only client command in use

inline constexpr size_t kCommandAt = 0;
inline constexpr size_t kLengthAt = 4;
inline constexpr size_t kHeaderSize = 8;

// Hello, and its response, in which the maximum packet length has become a status.
inline constexpr size_t kVersionAt = 8;
inline constexpr size_t kStatusAt = 16;
inline constexpr size_t kModeAt = 20;
inline constexpr size_t kHelloSize = 48;

// Read data: image id, offset, length.
inline constexpr size_t kReadOffsetAt = 12;
inline constexpr size_t kReadLengthAt = 16;
inline constexpr size_t kReadDataSize = 20;

inline constexpr size_t kEndStatusAt = 12;  // behind an image id
inline constexpr size_t kDoneStatusAt = 8;
inline constexpr size_t kDoneResponseSize = 12;

// The data of an execute response come raw; the identity is the second word of them.
inline constexpr size_t kDataLengthAt = 12;  // behind the client command
inline constexpr size_t kExecuteResponseSize = 16;
inline constexpr size_t kMostIdentityData = 24;
inline constexpr size_t kIdentityAt = 4;

// The packet buffer of the image transfer: the longest packet, and the longest piece of an image.
inline constexpr size_t kPacketBuffer = size_t{128} << 10;

}  // namespace kral::kivrat

#endif
