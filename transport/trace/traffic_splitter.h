// Takes the bytes of a port apart again, behind the connection's back: frames, bad ones, and what belongs to none.
#ifndef KRAL_TRANSPORT_TRACE_TRAFFIC_SPLITTER_H
#define KRAL_TRANSPORT_TRACE_TRAFFIC_SPLITTER_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "transport/line/port_tap.h"

namespace kral {

// Some bytes as they passed, or what happened to the port between them.
struct TrafficPiece {
  enum class Kind : uint8_t {
    kBytes,
    kOpened,      // the port was opened, again
    kGivenUp,     // the rest of what has begun to come is not awaited
    kShortWrite,  // of the bytes sent last
    kGap,         // what follows was lost
    kEarlier,     // what was in front is not kept
  };
  static constexpr size_t kHeadSize = 20;

  Kind kind = Kind::kBytes;
  PortDirection direction = PortDirection::kReceived;
  PortContent content = PortContent::kFrames;
  uint64_t microseconds = 0;
  // kShortWrite: bytes written, of how many. kGap and kEarlier: frames that ended in it, and 1 when another had begun.
  uint32_t count = 0;
  uint32_t of = 0;
  std::span<const uint8_t> bytes = {};

  std::array<uint8_t, kHeadSize> Head() const;
  // Takes one from the front of such heads with their bytes, which it points to. False at the end.
  bool Take(std::span<const uint8_t>& heads_and_bytes);
  // What is lost with it: frames that end in it, or itself. `in_frame` tells, and is told, whether one has begun.
  uint32_t CountLost(bool& in_frame) const;
};

struct TrafficRecord {
  enum class Kind : uint8_t { kFrame, kBadFrame, kBytes, kNoise };

  Kind kind = Kind::kFrame;
  PortDirection direction = PortDirection::kReceived;
  uint64_t microseconds = 0;
  std::span<const uint8_t> bytes;  // of a frame without flags and escapes, its FCS at the end; otherwise as they passed
  std::string comment;
};

class TrafficSplitter {
 public:
  using Sink = std::function<void(const TrafficRecord& record)>;

  explicit TrafficSplitter(Sink sink) : sink_(std::move(sink)) {}

  // Throws when there is no memory for a piece. It is to be given to Lose then, which makes it a gap and counts what is
  // lost with it.
  void Take(const TrafficPiece& piece);
  uint32_t Lose(const TrafficPiece& piece);
  void Finish(uint64_t microseconds);  // what has begun and not ended
  void Reset();

  uint64_t cut() const { return cut_; }  // frames of which a gap has left only the end

 private:
  // One direction.
  struct Side {
    std::vector<uint8_t> wire;  // since the last flag
    PortContent content = PortContent::kFrames;
    bool escape = false;  // pending behind the last flag
    bool behind_gap = false;
    bool counts_cut = false;
  };

  void MakeRoom(Side& side, size_t more);
  void Remark(const char* text);
  Side& At(PortDirection direction) { return sides_[direction == PortDirection::kSent ? 1 : 0]; }
  void TakeFrames(Side& side, const TrafficPiece& piece);
  void EndFrame(Side& side, const TrafficPiece& piece);
  void Flush(Side& side, const TrafficPiece& piece, const char* comment);
  void TakeEvent(const TrafficPiece& piece);
  void Give(TrafficRecord::Kind kind, const TrafficPiece& piece, std::span<const uint8_t> bytes, const char* comment);

  Sink sink_;
  std::array<Side, 2> sides_;
  std::string remark_;  // goes with the next record
  std::vector<uint8_t> frame_;
  uint64_t cut_ = 0;
};

}  // namespace kral

#endif
