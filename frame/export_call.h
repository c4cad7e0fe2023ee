// What every exported function is made of: the log line, handle resolution, the per-handset lock, the no-exception
// rule.
#ifndef KRAL_FRAME_EXPORT_CALL_H
#define KRAL_FRAME_EXPORT_CALL_H

#include <cstdint>
#include <mutex>
#include <utility>

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/types.h"

namespace kral {

// The bare name of an exported function, written whenever the active mask has flag 512.
void LogName(KRAL_HANDLE handle, const char* name) noexcept;

// A formatted line with flag 512; only while logging is started.
[[gnu::format(gnu_printf, 2, 3)]] void LogFormatted(KRAL_HANDLE handle, const char* format, ...) noexcept;

// Runs operation(phone, arguments...) under the request lock of the handset. 0 for an unknown handle and after an
// exception; outputs are then untouched.
template <class Operation, class... Arguments>
uint8_t OnPhone(KRAL_HANDLE handle, Operation&& operation, Arguments&&... arguments) noexcept {
  try {
    const auto phone = Kral_ResourceManager::GetPhone(handle);
    if (!phone) return 0;
    const std::lock_guard lock(phone->request_lock());
    return operation(*phone, std::forward<Arguments>(arguments)...) ? 1 : 0;
  } catch (...) {
    return 0;
  }
}

// The same without the request lock: abort, text-log, queue and time-out calls must not wait for a running request.
template <class Operation, class... Arguments>
uint8_t OnPhoneAtOnce(KRAL_HANDLE handle, Operation&& operation, Arguments&&... arguments) noexcept {
  try {
    const auto phone = Kral_ResourceManager::GetPhone(handle);
    if (!phone) return 0;
    return operation(*phone, std::forward<Arguments>(arguments)...) ? 1 : 0;
  } catch (...) {
    return 0;
  }
}

}  // namespace kral

#endif
