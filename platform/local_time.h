// The local wall clock, for the stamps of the text log.
#ifndef KRAL_PLATFORM_LOCAL_TIME_H
#define KRAL_PLATFORM_LOCAL_TIME_H

#include <string>

namespace kral {

struct LocalTime {
  int year = 0;   // such as 2024
  int month = 0;  // 1 to 12
  int day = 0;    // 1 to 31
  int hour = 0;
  int minute = 0;
  int second = 0;
  int millisecond = 0;
};

LocalTime CurrentLocalTime();

std::string DateText(const LocalTime& time);  // 2024-05-31
std::string TimeText(const LocalTime& time);  // 23:59:01

}  // namespace kral

#endif
