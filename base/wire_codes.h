// First bytes of packets that more than one layer knows.
#ifndef KRAL_BASE_WIRE_CODES_H
#define KRAL_BASE_WIRE_CODES_H

#include <cstddef>
#include <cstdint>

namespace kral {

// At the end of every frame and of every received packet.
inline constexpr size_t kFcsSize = 2;

inline constexpr uint8_t kSubsystemDispatch = 75;
// Comes back as it was sent.
inline constexpr uint8_t kLoopback = 123;

// What a handset sends unasked: logs, event reports, messages, and two kinds that only their numbers name.
inline constexpr uint8_t kLogCode = 16;
inline constexpr uint8_t kUnasked31 = 31;
inline constexpr uint8_t kEventReportCode = 96;
inline constexpr uint8_t kExtendedMessageCode = 121;
inline constexpr uint8_t kUnasked146 = 146;
constexpr bool IsAsynchronousCode(uint8_t code) {
  return code == kLogCode || code == kUnasked31 || code == kEventReportCode || code == kExtendedMessageCode ||
         code == kUnasked146;
}

// The error responses of the diagnostic protocol.
namespace refusal {
inline constexpr uint8_t kCommand = 19;
inline constexpr uint8_t kParameter = 20;
inline constexpr uint8_t kLength = 21;
inline constexpr uint8_t kMode = 24;
}  // namespace refusal
constexpr bool IsRefusal(uint8_t code) {
  return code == refusal::kCommand || code == refusal::kParameter || code == refusal::kLength || code == refusal::kMode;
}

}  // namespace kral

#endif
