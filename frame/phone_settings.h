// Settings that live as long as a phone object and are kept across its connects.
#ifndef KRAL_FRAME_PHONE_SETTINGS_H
#define KRAL_FRAME_PHONE_SETTINGS_H

#include <cstdint>

namespace kral {

inline constexpr uint8_t kTargetModem = 0;        // the diagnostic service runs on the modem chip
inline constexpr uint8_t kTargetApplication = 1;  // ... on an application processor

class FtmSequencer;

struct FtmSettings {
  uint32_t command_code = 75;  // 75 or 59
  uint8_t subsystem = 11;
  uint32_t mode_id = 1;
  int32_t last_rf_mode = 9;
  uint32_t queue_mode = 0;            // 1: requests are collected by the sequencer instead of being sent
  uint16_t sequence_id = 0;           // given to the request collected last
  FtmSequencer* sequencer = nullptr;  // not owned; none: every request goes out at once
};

}  // namespace kral

#endif
