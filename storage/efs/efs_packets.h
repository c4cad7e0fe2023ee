// How large the packets of a transfer are: as the caller has set them, or as large as the handset turns out to take.
#ifndef KRAL_STORAGE_EFS_EFS_PACKETS_H
#define KRAL_STORAGE_EFS_EFS_PACKETS_H

#include "storage/efs/efs_settings.h"

namespace kral {
class Diag_FTM;
}

namespace kral::efs {

enum class Direction { kFromHandset, kToHandset };

// The protocol has no question for the largest packet, so packets that belong to the transfer anyway are tried: the
// largest of all, one of 2 KiB, then those of the caller. What the handset took stays in use until somebody connects
// again. One of a size that has not passed yet gets one try and a short time-out, and later ones two: on a line that
// loses packets the smaller ones are the faster.
class PacketSizes {
 public:
  // For a transfer of so many bytes. A short one is not worth a try.
  PacketSizes(Diag_FTM& phone, Direction direction, uint32_t total);

  uint16_t size() const;
  uint16_t callers_size() const { return callers_; }
  bool is_callers() const;  // which is never made smaller
  int tries() const;
  uint32_t TimeOut(uint32_t usual_ms) const;
  // What an answer to a packet of so many bytes may tell of: that to a larger one that was tried in its place may come
  // late, and does not count. Where none was, an answer of more bytes is the handset's mistake.
  uint32_t MostOf(uint32_t bytes) const { return fell_ ? bytes : UINT32_MAX; }

  void Passed(size_t bytes);  // the handset took, or sent, a packet of so many
  bool FallBack();            // to the next smaller ones; false where there are none

 private:
  bool has_passed() const;  // a packet of this size

  FoundPacketSize& found_;
  const Direction direction_;
  const uint16_t callers_;
  uint8_t step_;
  bool fell_ = false;
};

}  // namespace kral::efs

#endif
