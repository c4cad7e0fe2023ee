// Stream writes, and how much data one of them can carry through the framing.
#include "download/stream/image_write_cmd.h"

#include <algorithm>
#include <array>

#include "base/failure.h"
#include "base/little_endian.h"
#include "download/stream/stream_format.h"
#include "transport/line/hdlc_frame.h"

namespace kral::stream {
namespace {

static_assert(CImageWriteCmdFramed::kMostFramedData + kWriteHeaderSize == kMaximumPayload);

// A frame takes a payload for sure when its stuffed form has so many bytes: both bytes of the FCS may be escaped
// behind it, and no escape pair may begin at or behind kEscapePairLimit.
constexpr size_t kMostStuffed = kEscapePairLimit - 3;
static_assert(kMostStuffed >= kMaximumPayload);

constexpr unsigned kStatusNotSent = 3;  // in the log

constexpr bool IsEscaped(uint8_t byte) {
  return byte == kFrameFlag || byte == kFrameEscape;
}

std::array<uint8_t, kWriteHeaderSize> Header(uint32_t address) {
  std::array<uint8_t, kWriteHeaderSize> header{kWrite};
  StoreLe<uint32_t>(header, kAddressAt, address);
  return header;
}

size_t CountEscaped(std::span<const uint8_t> bytes) {
  return static_cast<size_t>(std::ranges::count_if(bytes, IsEscaped));
}

}  // namespace

bool CImageWriteCmdFramed::Send(uint32_t address, std::span<uint8_t> packet) {
  if (packet.size() > kWriteBufferSize) {
    connection_.log().WriteLine(kLogErr, "write command too long\n");
    return Fail(Failure(KRAL_ERROR_INTERNAL, "a write command of %zu bytes is too long", packet.size()));
  }
  std::ranges::copy(Header(address), packet.begin());
  if (connection_.WriteHDLCNoRead(packet, time_out_ms_)) return true;
  connection_.log().WriteLine(kLogErr, "WriteHDLCNoRead failed with status %u\n", kStatusNotSent);
  return false;
}

uint32_t CImageWriteCmdFramed::FittingSize(uint32_t address, std::span<const uint8_t> data) {
  const auto header = Header(address);
  const size_t room = kMostStuffed - header.size() - CountEscaped(header);
  size_t size = std::min<size_t>(data.size(), kMostFramedData);
  size_t stuffed = size + CountEscaped(data.first(size));
  while (stuffed > room) {
    --size;
    stuffed -= IsEscaped(data[size]) ? 2u : 1u;
  }
  return static_cast<uint32_t>(size);
}

}  // namespace kral::stream
