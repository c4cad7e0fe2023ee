// A wire mode that speaks in frames: it de-frames, keeps what it heard, and hands each packet on.
#ifndef KRAL_HANDSET_LINE_FRAMED_MODE_H
#define KRAL_HANDSET_LINE_FRAMED_MODE_H

#include <mutex>
#include <vector>

#include "handset/line/frame_codec.h"
#include "handset/line/wire.h"

namespace kral::handset {

class FramedMode : public WireMode {
 public:
  void OnEnter(Wire&) override { decoder_.Reset(); }
  size_t OnBytes(ByteView bytes, Wire& wire) final;

  // What it has heard, in order; of long packets the first bytes.
  std::vector<Bytes> packets() const;
  void KeepPackets(bool keep);  // on at first; off for long runs

 protected:
  static constexpr size_t kKeptBytes = 1024;

  // One intact packet of at least one byte. False when the line belongs to another mode from here on.
  virtual bool OnPacket(ByteView packet, Wire& wire) = 0;

 private:
  FrameDecoder decoder_;
  mutable std::mutex packets_mutex_;
  std::vector<Bytes> packets_;
  bool keep_ = true;
};

}  // namespace kral::handset

#endif
