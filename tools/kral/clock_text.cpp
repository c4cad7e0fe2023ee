// Not by time_t, which has 32 bits on 32-bit Windows.
#include "tools/kral/clock_text.h"

#include "tools/kral/format.h"

namespace kral::tool {

std::string ClockText(std::chrono::sys_seconds time) {
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const std::chrono::year_month_day date(day);
  const std::chrono::hh_mm_ss clock(time - day);
  return Format("{:04}-{:02}-{:02} {:02}:{:02}:{:02}", static_cast<int>(date.year()),
                static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()), clock.hours().count(),
                clock.minutes().count(), clock.seconds().count());
}

}  // namespace kral::tool
