// Makes packets of the chunks read from a port, by the packet mode: framed, unframed, or length-prefixed.
#ifndef KRAL_TRANSPORT_LINE_CHUNK_SPLITTER_H
#define KRAL_TRANSPORT_LINE_CHUNK_SPLITTER_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "kral/transport.h"
#include "transport/line/hdlc_deframer.h"
#include "transport/line/packet_listener.h"

namespace kral {

class DataLogFileHandler;

enum class PacketMode : uint32_t {
  kFramed = KRAL_PACKET_MODE_FRAMED,
  kUnframed1 = KRAL_PACKET_MODE_UNFRAMED,
  kUnframed2 = KRAL_PACKET_MODE_UNFRAMED_2,
  kLengthPrefixed = KRAL_PACKET_MODE_LENGTH,
};

// Fed by the receive thread; the settings may be made on any thread and count from the next chunk on.
class ChunkSplitter {
 public:
  ChunkSplitter(PacketListener& sink, DataLogFileHandler& log) : sink_(sink), log_(log), deframer_(sink, log) {}

  // A change of mode drops the partial packet. Entering the length-prefixed mode takes the packet limit from the
  // next header.
  void SetMode(PacketMode mode) { mode_ = mode; }
  PacketMode mode() const { return mode_; }
  // In the unframed modes: packets end with "OK" and "ERROR" instead of with the chunk.
  void SetAtReplyMode(bool on) { at_reply_mode_ = on; }
  // With the next chunk, before it is looked at.
  void DropPartialPacket() { flush_pending_ = true; }

  // The sink's OnBatchEnd follows the chunk's last packet.
  void Feed(std::span<const uint8_t> chunk);

  const HdlcDeframer& deframer() const { return deframer_; }

 private:
  void FeedByMode(PacketMode mode, std::span<const uint8_t> chunk);
  void EnterMode(PacketMode mode);
  void DropPartialNow();
  void FeedAtReply(std::span<const uint8_t> chunk);
  void FeedLengthPrefixed(std::span<const uint8_t> chunk);
  void ReadPacketLimit();
  bool HoldsWholePacket() const;
  void HandOnReceived();
  void HandOnOverrun();
  void HandOn();

  PacketListener& sink_;
  DataLogFileHandler& log_;
  std::atomic<PacketMode> mode_{PacketMode::kFramed};
  std::atomic<bool> at_reply_mode_{false};
  std::atomic<bool> flush_pending_{false};

  // The receive thread's own.
  PacketMode entered_mode_ = PacketMode::kFramed;
  HdlcDeframer deframer_;
  Packet packet_;  // of the modes without framing
  size_t packet_limit_ = kMaximumPacket;
  bool header_limit_pending_ = false;
};

}  // namespace kral

#endif
