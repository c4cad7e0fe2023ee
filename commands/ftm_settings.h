// The FTM settings of a phone object. Core commands read them, too: which command code a handset takes tells what else
// it can be asked.
#ifndef KRAL_COMMANDS_FTM_SETTINGS_H
#define KRAL_COMMANDS_FTM_SETTINGS_H

#include <cstdint>

namespace kral {

class FtmSequencer;

namespace ftm {

struct Settings {
  uint32_t command_code = 75;  // 75 or 59
  uint8_t subsystem = 11;
  uint32_t mode_id = 1;
  int32_t last_rf_mode = 9;
  uint32_t queue_mode = 0;            // 1: requests are collected by the sequencer instead of being sent
  uint16_t sequence_id = 0;           // given to the request collected last
  FtmSequencer* sequencer = nullptr;  // not owned; none: every request goes out at once
};

}  // namespace ftm
}  // namespace kral

#endif
