// The core diagnostic commands over one phone object. Each logs its name, sends its request with time-out 0 and gives
// false, outputs untouched, when the request fails. <kral/diag.h> tells what each is for.
#ifndef KRAL_COMMANDS_CORE_CORE_DIAG_H
#define KRAL_COMMANDS_CORE_CORE_DIAG_H

#include <cstdint>

#include "transport/engine/reply.h"

namespace kral {

class Diag_FTM;

namespace diag {

// --- Identity (core_identity.cpp) ---------------------------------------------------------------------------------

struct VersionOutputs {
  char* compile_date;
  char* compile_time;
  char* release_date;
  char* release_time;
  char* version_directory;
  uint8_t* station_class_mark;
  uint8_t* air_interface_revision;
  uint8_t* mobile_model;
  uint16_t* firmware_revision;
  uint8_t* slot_cycle_index;
  uint8_t* vocoder_major;
  uint8_t* vocoder_minor;
};

bool ReadVersion(Diag_FTM& phone, const VersionOutputs& outputs);
bool ReadExtendedBuildId(Diag_FTM& phone, uint32_t* hardware_version, uint32_t* mobile_model, char* software_revision,
                         char* model);
bool ReadSerialNumber(Diag_FTM& phone, uint32_t* serial);

// --- Operating mode (core_mode.cpp) -------------------------------------------------------------------------------

// What a handset answers when it is asked for its operating mode.
inline constexpr uint32_t kStateFactoryTest = 1;
inline constexpr uint32_t kStateOfflineFirst = 2;
inline constexpr uint32_t kStateOfflineLast = 4;
inline constexpr uint32_t kStateOnline = 5;
inline constexpr uint32_t kStateLowPower = 6;

// What mode control takes.
inline constexpr uint16_t kModeOfflineAnalog = 0;
inline constexpr uint16_t kModeOfflineDigital = 1;
inline constexpr uint16_t kModeReset = 2;
inline constexpr uint16_t kModeFactoryTest = 3;
inline constexpr uint16_t kModeOnline = 4;
inline constexpr uint16_t kModeLowPower = 5;

bool ControlMode(Diag_FTM& phone, uint16_t mode);
// False on application-processor targets, which do not have the query.
bool GetPhoneOperatingMode(Diag_FTM& phone, uint32_t& state);

// --- Memory (core_memory.cpp) -------------------------------------------------------------------------------------

bool PeekBytes(Diag_FTM& phone, uint32_t address, uint16_t count, uint8_t* data);
bool PeekWords(Diag_FTM& phone, uint32_t address, uint16_t count, uint16_t* data);
bool PeekDoubleWords(Diag_FTM& phone, uint32_t address, uint16_t count, uint32_t* data);
bool PokeBytes(Diag_FTM& phone, uint32_t address, uint16_t count, const uint8_t* data, uint8_t* status);
bool PokeWords(Diag_FTM& phone, uint32_t address, uint16_t count, const uint16_t* data, uint8_t* status);
bool PokeDoubleWords(Diag_FTM& phone, uint32_t address, uint16_t count, const uint32_t* data, uint8_t* status);

// --- Service (core_service.cpp) -----------------------------------------------------------------------------------

Reply PressKey(Diag_FTM& phone, uint8_t hold, uint8_t key);
bool GetSwitches(Diag_FTM& phone, uint16_t* switches);
Reply SetSwitches(Diag_FTM& phone, uint16_t switches);
Reply EnterDownload(Diag_FTM& phone);
bool SendServiceCode(Diag_FTM& phone, const char* code, uint8_t* result);
Reply FreezeSecurity(Diag_FTM& phone);
Reply BackUpNv(Diag_FTM& phone);
Reply ClearErrorRecord(Diag_FTM& phone, uint8_t record);

// The reply as it came, its command code included. `size`: in, the room; out, what was written.
bool ReadErrorLog(Diag_FTM& phone, uint16_t* size, uint8_t* reply);
bool ReadStatus(Diag_FTM& phone, uint16_t* size, uint8_t* reply);
bool ReadIs2000Status(Diag_FTM& phone, uint16_t* size, uint8_t* reply);

// GSM call control: no request is defined, so these say so in the log and give false.
bool RefuseGsmCallControl(Diag_FTM& phone, const char* name);

}  // namespace diag
}  // namespace kral

#endif
