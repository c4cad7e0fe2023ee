// The log lines with which exported functions begin.
#include "frame/export_call.h"

#include <array>
#include <cstdarg>
#include <cstdio>

namespace kral {
namespace {

constexpr size_t kFormattedCapacity = 8016;

}  // namespace

void LogName(KRAL_HANDLE handle, const char* name) noexcept {
  OnPhoneAtOnce(handle, [name](Diag_FTM& phone) {
    phone.log().WriteLine(kLogHighLevelStart, "%s", name);
    return true;
  });
}

void LogFormatted(KRAL_HANDLE handle, const char* format, ...) noexcept {
  const auto phone = Kral_ResourceManager::GetPhone(handle);
  if (!phone || !phone->log().logging_started() || !phone->log().Wants(kLogHighLevelStart)) return;
  std::array<char, kFormattedCapacity> text;
  va_list arguments;
  va_start(arguments, format);
  const int formatted = std::vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  if (formatted >= 0) LogName(handle, text.data());
}

}  // namespace kral
