// Line settings by termios.
#include "platform/posix/line_settings.h"

#include <termios.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <optional>

namespace kral {
namespace {

struct Speed {
  uint32_t rate;
  speed_t constant;
};

constexpr std::array<Speed, 30> kSpeeds = {{
    {50, B50},           {75, B75},           {110, B110},         {134, B134},         {150, B150},
    {200, B200},         {300, B300},         {600, B600},         {1200, B1200},       {1800, B1800},
    {2400, B2400},       {4800, B4800},       {9600, B9600},       {19200, B19200},     {38400, B38400},
    {57600, B57600},     {115200, B115200},   {230400, B230400},   {460800, B460800},   {500000, B500000},
    {576000, B576000},   {921600, B921600},   {1000000, B1000000}, {1152000, B1152000}, {1500000, B1500000},
    {2000000, B2000000}, {2500000, B2500000}, {3000000, B3000000}, {3500000, B3500000}, {4000000, B4000000},
}};

std::optional<speed_t> SpeedConstant(uint32_t rate) {
  const auto found = std::ranges::find_if(kSpeeds, [rate](const Speed& s) { return s.rate == rate; });
  if (found == kSpeeds.end()) return std::nullopt;
  return found->constant;
}

// tcsetattr succeeds when any part was done, so the result is read back.
int Apply(int fd, const termios& wanted) {
  constexpr tcflag_t kChecked = CSIZE | CSTOPB | PARENB | CRTSCTS;
  termios applied{};
  if (::tcsetattr(fd, TCSANOW, &wanted) != 0 || ::tcgetattr(fd, &applied) != 0) return errno;
  const bool as_wanted =
      ((applied.c_cflag ^ wanted.c_cflag) & kChecked) == 0 && ::cfgetospeed(&applied) == ::cfgetospeed(&wanted);
  return as_wanted ? 0 : EINVAL;
}

}  // namespace

int ApplyLineSettings(int fd, uint32_t baud_rate) {
  const auto speed = SpeedConstant(baud_rate);
  if (!speed) return EINVAL;
  termios settings{};
  if (::tcgetattr(fd, &settings) != 0) return errno;
  ::cfmakeraw(&settings);
  // cfmakeraw has set 8 data bits without parity; what is left are one stop bit, no flow control and no modem status.
  settings.c_cflag &= ~static_cast<tcflag_t>(CSTOPB | CRTSCTS);
  settings.c_cflag |= CREAD | CLOCAL;
  settings.c_iflag &= ~static_cast<tcflag_t>(IXOFF | IXANY | INPCK);
  // Reads return at once because the descriptor does not block; with VMIN 1 an end of file means a hang-up only.
  settings.c_cc[VMIN] = 1;
  settings.c_cc[VTIME] = 0;
  ::cfsetispeed(&settings, *speed);
  ::cfsetospeed(&settings, *speed);
  return Apply(fd, settings);
}

int ChangeBaudRate(int fd, uint32_t baud_rate) {
  const auto speed = SpeedConstant(baud_rate);
  if (!speed) return EINVAL;
  termios settings{};
  if (::tcgetattr(fd, &settings) != 0) return errno;
  ::cfsetispeed(&settings, *speed);
  ::cfsetospeed(&settings, *speed);
  return Apply(fd, settings);
}

}  // namespace kral
