// The line settings of a tty. All functions give 0 or an errno value.
#ifndef KRAL_PLATFORM_POSIX_LINE_SETTINGS_H
#define KRAL_PLATFORM_POSIX_LINE_SETTINGS_H

#include <cstdint>

namespace kral {

// Raw bytes, 8 data bits, no parity, one stop bit, no flow control.
int ApplyLineSettings(int fd, uint32_t baud_rate);

// EINVAL for a rate that the kernel has no constant for.
int ChangeBaudRate(int fd, uint32_t baud_rate);

}  // namespace kral

#endif
