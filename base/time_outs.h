// Identifiers and defaults of the time-outs that every phone object keeps.
#ifndef KRAL_BASE_TIME_OUTS_H
#define KRAL_BASE_TIME_OUTS_H

#include <array>
#include <cstdint>

namespace kral {

inline constexpr uint32_t kTimeOutDefaultCommand = 0;  // synchronous commands
inline constexpr uint32_t kTimeOutLiveness = 1;        // loopback and version of the liveness check
inline constexpr uint32_t kTimeOutServerConnect = 2;   // server mode: the server connects the port
inline constexpr uint32_t kTimeOutPortWrite = 7;       // direct mode: the serial port's write time-out
inline constexpr uint32_t kTimeOutThreadRead = 8;      // direct mode: the receive thread's read time-out
inline constexpr uint32_t kTimeOutAfterFtmSwitch = 11;
inline constexpr uint32_t kTimeOutAfterOnlineSwitch = 12;
inline constexpr uint32_t kTimeOutAfterOfflineSwitch = 13;
inline constexpr uint32_t kTimeOutGsmRfModeDelay = 14;
inline constexpr uint32_t kTimeOutModeReadBack = 18;
inline constexpr uint32_t kTimeOutCount = 20;
inline constexpr uint32_t kTimeOutSoftwareDownload = 20;  // kept by the software download object (server mode)

// Milliseconds, by identifier.
inline constexpr std::array<uint32_t, kTimeOutCount> kDefaultTimeOuts = {
    4000, 80, 200, 3000, 6000, 10000, 10000, 900, 900, 3000, 10000, 150, 140, 3000, 100, 100, 5000, 2000, 500, 10000};

}  // namespace kral

#endif
