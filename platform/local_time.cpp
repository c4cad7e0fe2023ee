// The texts of the wall clock; the reading of it is the platform's.
#include "platform/local_time.h"

#include <array>
#include <cstdio>

namespace kral {

std::string DateText(const LocalTime& time) {
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), "%04d-%02d-%02d", time.year, time.month, time.day);
  return text.data();
}

std::string TimeText(const LocalTime& time) {
  std::array<char, 48> text{};
  std::snprintf(text.data(), text.size(), "%02d:%02d:%02d", time.hour, time.minute, time.second);
  return text.data();
}

}  // namespace kral
