// The handset's own async-HDLC codec. It shares nothing with the library's, so that a shared mistake cannot cancel
// itself.
#ifndef KRAL_HANDSET_LINE_FRAME_CODEC_H
#define KRAL_HANDSET_LINE_FRAME_CODEC_H

#include <optional>

#include "handset/line/bytes.h"

namespace kral::handset {

inline constexpr uint8_t kFlag = 0x7E;
inline constexpr uint8_t kEscape = 0x7D;

// The frame check sequence of RFC 1662 over a whole payload, except that the handset counts bits in 16 bits: of
// 8,192 bytes and more it checks the first (size mod 8,192) only.
uint16_t FrameCheck(ByteView payload);

// Payload, check, stuffing, closing flag; no leading flag.
Bytes EncodeFrame(ByteView payload);

// The same with a check that cannot be right.
Bytes EncodeCorruptFrame(ByteView payload);

// Splits what the host sends into payloads; a frame that is damaged, too short or endless costs only itself.
class FrameDecoder {
 public:
  static constexpr size_t kLongestBody = 0x10000;

  // Reads up to the end of the next intact frame or of the bytes. Gives the number of bytes read; `payload` is set
  // when a frame was completed.
  size_t Feed(ByteView bytes, std::optional<Bytes>& payload);

  void Reset();
  uint64_t damaged() const { return damaged_; }

 private:
  std::optional<Bytes> CloseFrame();

  Bytes body_;
  bool escaped_ = false;
  bool oversized_ = false;
  uint64_t damaged_ = 0;
};

}  // namespace kral::handset

#endif
