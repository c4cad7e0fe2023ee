// Identifiers and defaults of the time-outs that every phone object keeps.
#ifndef KRAL_BASE_TIME_OUTS_H
#define KRAL_BASE_TIME_OUTS_H

#include <array>
#include <cstdint>

#include "kral/connection.h"

namespace kral {

inline constexpr uint32_t kTimeOutDefaultCommand = KRAL_TIME_OUT_COMMAND;  // synchronous commands
inline constexpr uint32_t kTimeOutLiveness = KRAL_TIME_OUT_LIVENESS;       // loopback and version of the liveness check
inline constexpr uint32_t kTimeOutServerConnect =
    KRAL_TIME_OUT_SERVER_CONNECT;  // server mode: the server connects the port
inline constexpr uint32_t kTimeOutPortWrite =
    KRAL_TIME_OUT_PORT_WRITE;  // direct mode: the serial port's write time-out
inline constexpr uint32_t kTimeOutThreadRead =
    KRAL_TIME_OUT_PORT_READ;  // direct mode: the receive thread's read time-out
inline constexpr uint32_t kTimeOutAfterFtmSwitch = KRAL_TIME_OUT_AFTER_FTM;
inline constexpr uint32_t kTimeOutAfterOnlineSwitch = KRAL_TIME_OUT_AFTER_ONLINE;
inline constexpr uint32_t kTimeOutAfterOfflineSwitch = KRAL_TIME_OUT_AFTER_OFFLINE;
inline constexpr uint32_t kTimeOutGsmRfModeDelay = KRAL_TIME_OUT_GSM_RF_MODE;
inline constexpr uint32_t kTimeOutModeReadBack = KRAL_TIME_OUT_MODE_READ_BACK;
inline constexpr uint32_t kTimeOutCount = 20;
inline constexpr uint32_t kTimeOutSoftwareDownload =
    KRAL_TIME_OUT_DOWNLOAD;  // kept by the software download object (server mode)

// Milliseconds, by identifier.
inline constexpr std::array<uint32_t, kTimeOutCount> kDefaultTimeOuts = {
    4000, 80, 200, 3000, 6000, 10000, 10000, 900, 900, 3000, 10000, 150, 140, 3000, 100, 100, 5000, 2000, 500, 10000};

}  // namespace kral

#endif
