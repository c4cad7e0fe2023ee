// Moments, in words.
#ifndef KRAL_TOOLS_CLOCK_TEXT_H
#define KRAL_TOOLS_CLOCK_TEXT_H

#include <chrono>
#include <string>

namespace kral::tool {

// "2023-11-14 22:13:20", in UTC
std::string ClockText(std::chrono::sys_seconds time);

}  // namespace kral::tool

#endif
