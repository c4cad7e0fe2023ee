// What the parts of the handset see of the line to the host, and what takes the raw bytes of it over.
#ifndef KRAL_HANDSET_LINE_WIRE_H
#define KRAL_HANDSET_LINE_WIRE_H

#include <memory>

#include "handset/line/bytes.h"
#include "platform/clock.h"

namespace kral::handset {

class WireMode;

// The way out. Everything that goes this way is subject to the faults asked for.
class Wire {
 public:
  virtual ~Wire() = default;

  virtual void Send(ByteView payload, uint32_t delay_ms = 0) = 0;  // as one frame
  virtual void Write(ByteView bytes, uint32_t delay_ms = 0) = 0;   // as they stand

  // From the byte behind the one being looked at, `mode` has the line; null is the diagnostic mode.
  virtual void Enter(std::shared_ptr<WireMode> mode) = 0;
  // The handset starts again: silent for so long, then in diagnostic mode.
  virtual void Restart(uint32_t silent_ms) = 0;
  // The device leaves the host's port, until the handset is plugged in again.
  virtual void HangUp() = 0;
  // The device stays for `linger_ms`, leaves the port, and comes back after `away_ms` as another device would, with
  // `mode` on the line; null is the diagnostic mode.
  virtual void Reappear(std::shared_ptr<WireMode> mode, uint32_t linger_ms, uint32_t away_ms) = 0;

  virtual Clock& clock() = 0;
};

// A protocol that has the byte stream for itself: a boot or download loader, an AT modem, silence.
class WireMode {
 public:
  virtual ~WireMode() = default;
  virtual void OnEnter(Wire&) {}
  // Gives the number of bytes it took. After calling Enter it returns at once; the rest is the next mode's.
  virtual size_t OnBytes(ByteView bytes, Wire& wire) = 0;
};

}  // namespace kral::handset

#endif
