// The same rules as the de-framer's, but nothing is left out: what that one drops is told with the reason.
#include "transport/trace/traffic_splitter.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <utility>

#include "base/little_endian.h"
#include "transport/line/fcs16.h"
#include "transport/line/hdlc_frame.h"

namespace kral {
namespace {

namespace head {
constexpr size_t kKind = 0;
constexpr size_t kDirection = 1;
constexpr size_t kContent = 2;
constexpr size_t kLength = 4;
constexpr size_t kMicroseconds = 8;
constexpr size_t kCount = 16;
static_assert(kCount + 4 == TrafficPiece::kHeadSize);
}  // namespace head

// Longer runs without a flag are no frames of any protocol here.
constexpr size_t kLongestRun = sizeof(FrameBuffer);
constexpr size_t kSmallestFrame = 1 + kFcsSize;

// The 16-bit count is the sender's (BuildFrame): a frame whose FCS covers only a part is a good one.
bool HasGoodFcs(std::span<const uint8_t> frame) {
  const size_t size = frame.size() - kFcsSize;
  return ComputeFcs16(frame.data(), static_cast<uint16_t>(size * 8)) == *LoadLe<uint16_t>(frame, size);
}

}  // namespace

// The bytes and what a short write tells are never in one piece: the length stands for both.
std::array<uint8_t, TrafficPiece::kHeadSize> TrafficPiece::Head() const {
  std::array<uint8_t, kHeadSize> bytes_of_head{};
  const std::span<uint8_t> to(bytes_of_head);
  StoreLe(to, head::kKind, static_cast<uint8_t>(kind));
  StoreLe(to, head::kDirection, static_cast<uint8_t>(direction));
  StoreLe(to, head::kContent, static_cast<uint8_t>(content));
  StoreLe(to, head::kLength, kind == Kind::kBytes ? static_cast<uint32_t>(bytes.size()) : of);
  StoreLe(to, head::kMicroseconds, microseconds);
  StoreLe(to, head::kCount, count);
  return bytes_of_head;
}

bool TrafficPiece::Take(std::span<const uint8_t>& heads_and_bytes) {
  if (heads_and_bytes.size() < kHeadSize) return false;
  kind = static_cast<Kind>(heads_and_bytes[head::kKind]);
  direction = static_cast<PortDirection>(heads_and_bytes[head::kDirection]);
  content = static_cast<PortContent>(heads_and_bytes[head::kContent]);
  const uint32_t length = *LoadLe<uint32_t>(heads_and_bytes, head::kLength);
  of = kind == Kind::kBytes ? 0 : length;
  microseconds = *LoadLe<uint64_t>(heads_and_bytes, head::kMicroseconds);
  count = *LoadLe<uint32_t>(heads_and_bytes, head::kCount);
  heads_and_bytes = heads_and_bytes.subspan(kHeadSize);
  bytes = heads_and_bytes.first(kind == Kind::kBytes ? std::min<size_t>(length, heads_and_bytes.size()) : 0);
  heads_and_bytes = heads_and_bytes.subspan(bytes.size());
  return true;
}

// Flags side by side end nothing.
uint32_t TrafficPiece::CountLost(bool& in_frame) const {
  if (content != PortContent::kFrames) return 1;
  uint32_t ends = 0;
  for (const uint8_t byte : bytes) {
    if (byte == kFrameFlag && in_frame) ++ends;
    in_frame = byte != kFrameFlag;
  }
  return ends;
}

void TrafficSplitter::Reset() {
  sides_ = {};
  remark_.clear();
  cut_ = 0;
}

void TrafficSplitter::Take(const TrafficPiece& piece) {
  if (piece.kind != TrafficPiece::Kind::kBytes) return TakeEvent(piece);
  Side& side = At(piece.direction);
  if (side.content != piece.content) {
    Flush(side, piece, "an unfinished frame");
    side = {};
    side.content = piece.content;
  }
  if (piece.content == PortContent::kBytes) {
    Give(TrafficRecord::Kind::kBytes, piece, piece.bytes, "");
  } else {
    TakeFrames(side, piece);
  }
}

uint32_t TrafficSplitter::Lose(const TrafficPiece& piece) {
  if (piece.kind != TrafficPiece::Kind::kBytes) return 1;
  Side& side = At(piece.direction);
  bool in_frame = !side.wire.empty() || side.behind_gap;
  const uint32_t lost = piece.CountLost(in_frame);
  if (piece.content != PortContent::kFrames) return lost;
  side.wire.clear();
  side.escape = false;
  side.behind_gap = in_frame;
  side.counts_cut = true;
  Remark("frames are missing here: out of memory");
  return lost;
}

// All that a piece needs, before anything of it is taken.
void TrafficSplitter::MakeRoom(Side& side, size_t more) {
  const size_t needed = side.wire.size() + more;
  if (needed > side.wire.capacity()) side.wire.reserve(std::max(needed, 2 * side.wire.capacity()));
  frame_.reserve(side.wire.capacity());
}

// Gaps without a frame between them are one to the reader.
void TrafficSplitter::Remark(const char* text) {
  if (remark_.ends_with(text)) return;
  try {
    remark_.reserve(remark_.size() + std::strlen(text) + 2);
  } catch (const std::bad_alloc&) {
    return;  // what passed matters more than what is said of it
  }
  remark_.append(remark_.empty() ? "" : "; ").append(text);
}

void TrafficSplitter::TakeFrames(Side& side, const TrafficPiece& piece) {
  MakeRoom(side, piece.bytes.size());
  std::span<const uint8_t> left = piece.bytes;
  while (!left.empty()) {
    const auto flag = std::ranges::find(left, kFrameFlag);
    const auto run = left.first(static_cast<size_t>(flag - left.begin()));
    side.wire.insert(side.wire.end(), run.begin(), run.end());
    if (side.wire.size() > kLongestRun) Flush(side, piece, "noise: too long for a frame");
    if (flag == left.end()) break;
    EndFrame(side, piece);
    left = left.subspan(run.size() + 1);
  }
  if (side.wire.empty() || side.behind_gap) return;
  // A handset that starts up, or a line that idles low, sends zeros; and each write is whole.
  if (piece.direction == PortDirection::kSent) {
    Flush(side, piece, "no frame");
  } else if (std::ranges::all_of(side.wire, [](uint8_t byte) { return byte == 0; })) {
    Flush(side, piece, "noise: zeros");
  }
}

void TrafficSplitter::EndFrame(Side& side, const TrafficPiece& piece) {
  if (std::exchange(side.behind_gap, false)) {
    if (side.counts_cut) ++cut_;
    side.wire.clear();
    side.escape = false;
    return;
  }
  if (side.wire.empty()) return;
  frame_.clear();
  for (const uint8_t byte : side.wire) {
    if (byte == kFrameEscape) {
      side.escape = true;
    } else {
      frame_.push_back(std::exchange(side.escape, false) ? byte ^ kEscapeBit : byte);
    }
  }
  if (frame_.size() < kSmallestFrame) {
    Give(TrafficRecord::Kind::kNoise, piece, side.wire, "noise: too short for a frame");
  } else if (HasGoodFcs(frame_)) {
    Give(TrafficRecord::Kind::kFrame, piece, frame_, "");
  } else {
    Give(TrafficRecord::Kind::kBadFrame, piece, frame_, "bad frame: the FCS does not fit");
  }
  side.wire.clear();
}

void TrafficSplitter::Flush(Side& side, const TrafficPiece& piece, const char* comment) {
  if (!side.wire.empty() && !side.behind_gap) {
    TrafficPiece of_side = piece;
    of_side.direction = &side == sides_.data() ? PortDirection::kReceived : PortDirection::kSent;
    Give(TrafficRecord::Kind::kNoise, of_side, side.wire, comment);
  }
  side.wire.clear();
  side.escape = false;
}

void TrafficSplitter::TakeEvent(const TrafficPiece& piece) {
  Side& side = At(piece.direction);
  switch (piece.kind) {
    case TrafficPiece::Kind::kOpened:
      for (Side& each : sides_) {
        Flush(each, piece, "an unfinished frame");
        each.behind_gap = false;
      }
      Remark("the port was opened");
      break;
    case TrafficPiece::Kind::kGivenUp:
      Flush(side, piece, "an unfinished frame");
      break;
    case TrafficPiece::Kind::kShortWrite:
      Give(TrafficRecord::Kind::kBytes, piece, {},
           ("of what was sent last only " + std::to_string(piece.count) + " of " + std::to_string(piece.of) +
            " bytes were written")
               .c_str());
      break;
    case TrafficPiece::Kind::kGap:
      // The frame that had begun is one of those that ended in the gap.
      side.wire.clear();
      side.escape = false;
      side.behind_gap = piece.of != 0;
      side.counts_cut = true;
      Remark("frames are missing here: the disk is too slow");
      break;
    case TrafficPiece::Kind::kEarlier:
      side.behind_gap = piece.of != 0;
      side.counts_cut = false;
      Remark("earlier traffic is not kept");
      break;
    case TrafficPiece::Kind::kBytes:
      break;
  }
}

void TrafficSplitter::Finish(uint64_t microseconds) {
  TrafficPiece end;
  end.microseconds = microseconds;
  for (Side& side : sides_) Flush(side, end, "an unfinished frame");
}

void TrafficSplitter::Give(TrafficRecord::Kind kind, const TrafficPiece& piece, std::span<const uint8_t> bytes,
                           const char* comment) {
  if (*comment != '\0') Remark(comment);
  sink_({kind, piece.direction, piece.microseconds, bytes, std::exchange(remark_, {})});
}

}  // namespace kral
