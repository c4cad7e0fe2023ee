// The receiving side of async-HDLC framing: splits the byte stream into packets, keeping a partial one across chunks.
#ifndef KRAL_TRANSPORT_LINE_HDLC_DEFRAMER_H
#define KRAL_TRANSPORT_LINE_HDLC_DEFRAMER_H

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "transport/line/packet_listener.h"

namespace kral {

class DataLogFileHandler;

// Fed by the receive thread only; the counters may be read from any thread.
class HdlcDeframer {
 public:
  HdlcDeframer(PacketListener& sink, DataLogFileHandler& log) : sink_(sink), log_(log) {}

  void Feed(std::span<const uint8_t> chunk);
  void DropPartial();  // forgets the unfinished packet

  // Lost traffic is known: frames dropped for a bad FCS, and for being oversized.
  uint64_t bad_fcs() const { return bad_fcs_.load(std::memory_order_relaxed); }
  uint64_t oversized() const { return oversized_.load(std::memory_order_relaxed); }

 private:
  static constexpr size_t kMaximumLength = 4094;

  const uint8_t* Unstuff(const uint8_t* in, const uint8_t* end);
  void FinishPacket(std::span<const uint8_t> packet);
  void DeliverChecked(std::span<const uint8_t> packet);
  void DropOverrun();
  void EraseZeroTail();

  PacketListener& sink_;
  DataLogFileHandler& log_;
  std::array<uint8_t, 4096> packet_{};
  size_t length_ = 0;
  bool escape_pending_ = false;
  std::atomic<uint64_t> bad_fcs_{0};
  std::atomic<uint64_t> oversized_{0};
};

}  // namespace kral

#endif
