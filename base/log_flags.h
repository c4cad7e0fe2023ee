// The categories of the text log: one bit each; a line's name is chosen by the lowest set bit of its flag.
#ifndef KRAL_BASE_LOG_FLAGS_H
#define KRAL_BASE_LOG_FLAGS_H

#include <cstdint>

namespace kral {

inline constexpr uint32_t kLogIo = 0x1;        // raw traffic
inline constexpr uint32_t kLogFn = 0x2;        // entry of internal functions
inline constexpr uint32_t kLogRet = 0x4;       // results and details
inline constexpr uint32_t kLogAsync = 0x8;     // asynchronous traffic
inline constexpr uint32_t kLogErr = 0x10;      // errors
inline constexpr uint32_t kLogIoAhdlc = 0x20;  // framing layer
inline constexpr uint32_t kLogFnAhdlc = 0x40;
inline constexpr uint32_t kLogRetAhdlc = 0x80;
inline constexpr uint32_t kLogInfAhdlc = 0x100;
inline constexpr uint32_t kLogHighLevelStart = 0x200;  // exported functions as they are called
inline constexpr uint32_t kLogIoDev = 0x400;           // serial port
inline constexpr uint32_t kLogFnDev = 0x800;
inline constexpr uint32_t kLogRetDev = 0x1000;
inline constexpr uint32_t kLogInfDev = 0x2000;
inline constexpr uint32_t kLogHighLevelStop = 0x4000;  // end of exported functions
inline constexpr uint32_t kLogNvManagerDebug = 0x8000;

inline constexpr uint32_t kDefaultLogMask =
    kLogIo | kLogFn | kLogRet | kLogAsync | kLogErr | kLogHighLevelStart | kLogHighLevelStop;
static_assert(kDefaultLogMask == 0x421F);

}  // namespace kral

#endif
