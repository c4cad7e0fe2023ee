// The receiving side of async-HDLC framing: splits the byte stream into packets, keeping a partial one across chunks.
#ifndef KRAL_TRANSPORT_HDLC_DEFRAMER_H
#define KRAL_TRANSPORT_HDLC_DEFRAMER_H

#include <array>
#include <cstdint>
#include <span>

#include "transport/packet_listener.h"

namespace kral {

class DataLogFileHandler;

class HdlcDeframer {
 public:
  explicit HdlcDeframer(PacketListener& sink) : sink_(sink) {}

  void SetLogger(DataLogFileHandler* log) { log_ = log; }
  void Feed(std::span<const uint8_t> chunk);
  void DropPartial();  // forgets the unfinished packet

  // Lost traffic is known: frames dropped for a bad FCS, and for being oversized.
  uint64_t bad_fcs() const { return bad_fcs_; }
  uint64_t oversized() const { return oversized_; }

 private:
  static constexpr uint16_t kCapacity = 4096;
  PacketListener& sink_;
  DataLogFileHandler* log_ = nullptr;
  std::array<uint8_t, kCapacity> packet_{};
  uint16_t length_ = 0;
  bool escape_pending_ = false;
  uint64_t bad_fcs_ = 0;  // read by other threads through the transport's counters
  uint64_t oversized_ = 0;
};

}  // namespace kral

#endif
