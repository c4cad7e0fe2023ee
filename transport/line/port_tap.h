// Who sees the bytes of a port as they pass, both ways.
#ifndef KRAL_TRANSPORT_LINE_PORT_TAP_H
#define KRAL_TRANSPORT_LINE_PORT_TAP_H

#include <cstddef>
#include <cstdint>
#include <span>

namespace kral {

enum class PortDirection : uint8_t { kReceived, kSent };

// What the bytes of a port are to those who use it now.
enum class PortContent : uint8_t {
  kFrames,
  kBytes,  // AT commands, the boot loader, the packet modes without frames
};

// Called on the threads that read and write: no call may wait, or throw.
class PortTap {
 public:
  virtual ~PortTap() = default;
  virtual void OnOpened() noexcept = 0;
  virtual void OnGivenUp() noexcept = 0;  // a frame that has begun to come: its rest is not awaited any more
  // Sent bytes come in front of their write, so that no answer is seen before its request.
  virtual void OnBytes(PortDirection direction, PortContent content, std::span<const uint8_t> bytes) noexcept = 0;
  virtual void OnShortWrite(size_t written, size_t count) noexcept = 0;  // of the bytes sent last
};

}  // namespace kral

#endif
