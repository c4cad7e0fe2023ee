// The packets of the streaming download protocol: codes, field offsets and limits. Integers are little-endian.
#ifndef KRAL_DOWNLOAD_STREAM_STREAM_FORMAT_H
#define KRAL_DOWNLOAD_STREAM_STREAM_FORMAT_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace kral::stream {

inline constexpr uint8_t kHello = 0x01;
inline constexpr uint8_t kHelloReply = 0x02;
inline constexpr uint8_t kWrite = 0x07;
inline constexpr uint8_t kWriteReply = 0x08;
inline constexpr uint8_t kNop = 0x09;
inline constexpr uint8_t kNopReply = 0x0A;
inline constexpr uint8_t kClose = 0x15;
inline constexpr uint8_t kCloseReply = 0x16;
inline constexpr uint8_t kSecurityMode = 0x17;
inline constexpr uint8_t kSecurityModeReply = 0x18;
inline constexpr uint8_t kPartitionTable = 0x19;
inline constexpr uint8_t kPartitionTableReply = 0x1A;
inline constexpr uint8_t kOpen = 0x1B;
inline constexpr uint8_t kOpenReply = 0x1C;

// Hello: code, magic, version, compatible version, feature bits.
inline constexpr std::string_view kHostMagic = "VRMO fast download protocol host";
inline constexpr std::string_view kTargetMagic = "VRMO fast download protocol targ";
inline constexpr size_t kMagicAt = 1;
inline constexpr uint8_t kVersion = 2;
inline constexpr uint8_t kCompatibleVersion = 2;
inline constexpr uint8_t kFeatures = 0x01;

// Its reply: code, magic, version, compatible version, block size u32, flash base u32, id length u8, id, window u16.
inline constexpr size_t kBlockSizeAt = 35;
inline constexpr size_t kIdLengthAt = 43;
inline constexpr size_t kIdAt = 44;
inline constexpr size_t kShortestHelloReply = 48;

inline constexpr std::array<uint8_t, 5> kNopRequest = {kNop, 'N', 'O', 'P', 0};

// Open: code, image type, header. Its reply, like that to a partition table: code, status.
inline constexpr size_t kStatusAt = 1;
inline constexpr size_t kStatusReplySize = 2;
inline constexpr uint8_t kStatusDone = 0;
inline constexpr uint32_t kLongestHeader = 512;
inline constexpr uint32_t kPartitionTableSize = 512;

// Write and its reply: code, address u32; in front of the data of a write.
inline constexpr size_t kAddressAt = 1;
inline constexpr size_t kWriteHeaderSize = 5;
inline constexpr size_t kWriteReplySize = 5;
inline constexpr uint32_t kMostWriteData = 65531;
inline constexpr size_t kWriteBufferSize = 65536;

static_assert(kHostMagic.size() == 32 && kTargetMagic.size() == 32);
static_assert(kWriteHeaderSize + kMostWriteData == kWriteBufferSize);

}  // namespace kral::stream

#endif
