// Frames, byte by byte, as a handset's small serial task has them: plain code that can be checked against RFC 1662.
#include "handset/line/frame_codec.h"

#include <array>

namespace kral::handset {
namespace {

constexpr size_t kCheckSize = 2;
constexpr uint8_t kStuffing = 0x20;

constexpr std::array<uint16_t, 256> MakeCheckTable() {
  std::array<uint16_t, 256> table{};
  for (uint32_t byte = 0; byte < 256; ++byte) {
    uint32_t remainder = byte;
    for (int bit = 0; bit < 8; ++bit) remainder = (remainder & 1) != 0 ? remainder >> 1 ^ 0x8408 : remainder >> 1;
    table[byte] = static_cast<uint16_t>(remainder);
  }
  return table;
}

constexpr auto kCheckTable = MakeCheckTable();
static_assert(kCheckTable[1] == 0x1189 && kCheckTable[2] == 0x2312 && kCheckTable[3] == 0x329B);

void Stuff(Bytes& wire, uint8_t byte) {
  if (byte == kFlag || byte == kEscape) {
    wire.push_back(kEscape);
    byte ^= kStuffing;
  }
  wire.push_back(byte);
}

Bytes Encode(ByteView payload, uint16_t check) {
  Bytes wire;
  wire.reserve(payload.size() + payload.size() / 16 + 8);
  for (const uint8_t byte : payload) Stuff(wire, byte);
  Stuff(wire, static_cast<uint8_t>(check));
  Stuff(wire, static_cast<uint8_t>(check >> 8));
  wire.push_back(kFlag);
  return wire;
}

}  // namespace

uint16_t FrameCheck(ByteView payload) {
  constexpr size_t kCountedBytes = 0x10000 / 8;
  uint16_t check = 0xFFFF;
  for (const uint8_t byte : payload.first(payload.size() % kCountedBytes)) {
    check = static_cast<uint16_t>(check >> 8 ^ kCheckTable[(check ^ byte) & 0xFF]);
  }
  return check ^ 0xFFFF;
}

Bytes EncodeFrame(ByteView payload) {
  return Encode(payload, FrameCheck(payload));
}

Bytes EncodeCorruptFrame(ByteView payload) {
  return Encode(payload, FrameCheck(payload) ^ 0x0101);
}

size_t FrameDecoder::Feed(ByteView bytes, std::optional<Bytes>& payload) {
  payload.reset();
  for (size_t i = 0; i < bytes.size(); ++i) {
    const uint8_t byte = bytes[i];
    if (byte == kFlag) {
      payload = CloseFrame();
      if (payload) return i + 1;
    } else if (byte == kEscape) {
      escaped_ = true;
    } else if (body_.size() == kLongestBody) {
      oversized_ = true;
    } else {
      body_.push_back(escaped_ ? byte ^ kStuffing : byte);
      escaped_ = false;
    }
  }
  return bytes.size();
}

void FrameDecoder::Reset() {
  body_.clear();
  escaped_ = false;
  oversized_ = false;
}

std::optional<Bytes> FrameDecoder::CloseFrame() {
  Bytes body;
  body.swap(body_);
  const bool intact =
      !escaped_ && !oversized_ && body.size() > kCheckSize &&
      GetU16(body, body.size() - kCheckSize) == FrameCheck(ByteView(body).first(body.size() - kCheckSize));
  if (!intact && !body.empty()) ++damaged_;  // an empty body is a leading or repeated flag
  Reset();
  if (!intact) return std::nullopt;
  body.pop_back();
  body.pop_back();
  return body;
}

}  // namespace kral::handset
