// Reads times by hand: the compilers have no std::chrono::parse yet.
#include "tools/kral/traffic/time_of_packet.h"

#include <chrono>
#include <optional>
#include <string_view>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

using std::chrono::microseconds;

constexpr std::uint64_t kSecond = 1'000'000;
constexpr std::uint64_t kDay = 86'400 * kSecond;

// Exactly so many digits, taken from the front.
std::optional<unsigned> TakeDigits(std::string_view& text, std::size_t count) {
  if (text.size() < count) return std::nullopt;
  unsigned value = 0;
  for (std::size_t i = 0; i < count; ++i) {
    if (text[i] < '0' || text[i] > '9') return std::nullopt;
    value = value * 10 + static_cast<unsigned>(text[i] - '0');
  }
  text.remove_prefix(count);
  return value;
}

bool Take(std::string_view& text, char expected) {
  if (!text.starts_with(expected)) return false;
  text.remove_prefix(1);
  return true;
}

// "2026-03-01T"; nothing is taken where there is none.
std::optional<std::uint64_t> TakeDate(std::string_view& text) {
  std::string_view rest = text;
  const auto year = TakeDigits(rest, 4);
  if (!year || !Take(rest, '-')) return std::nullopt;
  const auto month = TakeDigits(rest, 2);
  if (!month || !Take(rest, '-')) return std::nullopt;
  const auto day = TakeDigits(rest, 2);
  if (!day || !(Take(rest, 'T') || Take(rest, ' '))) return std::nullopt;
  const std::chrono::year_month_day date{std::chrono::year(static_cast<int>(*year)), std::chrono::month(*month),
                                         std::chrono::day(*day)};
  if (!date.ok() || *year < 1970) return std::nullopt;
  text = rest;
  return static_cast<std::uint64_t>(microseconds(std::chrono::sys_days(date).time_since_epoch()).count());
}

// "14:02", "14:02:10", "14:02:10.25"
std::optional<std::uint64_t> TakeTime(std::string_view& text) {
  const auto hours = TakeDigits(text, 2);
  if (!hours || *hours > 23 || !Take(text, ':')) return std::nullopt;
  const auto minutes = TakeDigits(text, 2);
  if (!minutes || *minutes > 59) return std::nullopt;
  std::uint64_t time = (*hours * std::uint64_t{60} + *minutes) * 60 * kSecond;
  if (!Take(text, ':')) return time;
  const auto seconds = TakeDigits(text, 2);
  if (!seconds || *seconds > 59) return std::nullopt;
  time += *seconds * kSecond;
  if (!Take(text, '.')) return time;
  for (std::uint64_t unit = kSecond / 10; unit > 0; unit /= 10) {
    const auto digit = TakeDigits(text, 1);
    if (!digit) break;
    time += *digit * unit;
  }
  return time;
}

}  // namespace

std::uint64_t ParseTime(const std::string& text, std::uint64_t begin) {
  std::string_view rest = text;
  const auto date = TakeDate(rest);
  const auto time = TakeTime(rest);
  Take(rest, 'Z');
  if (!time || !rest.empty()) {
    throw ToolError(ExitCode::kUsage, Format("{} is not a time", text),
                    "give it in UTC as kral log play prints it: 14:02:10, 14:02:10.250 or 2026-03-01T14:02:10");
  }
  return (date ? *date : begin - begin % kDay) + *time;
}

}  // namespace kral::tool
