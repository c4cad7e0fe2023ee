// Keeps the records of failed calls and exports them. What a record says is decided where the failure happens
// (base/failure.h); when one is noted, in frame/export_call.cpp.
#include "frame/last_error.h"

#include <algorithm>
#include <atomic>
#include <string_view>

#include "base/failure.h"
#include "frame/library_state.h"

namespace kral {
namespace {

// Bounds the table where threads come and go: some 90 KiB.
constexpr size_t kMostEntries = 256;

// No padding: callers of other languages declare it field by field.
static_assert(offsetof(KRAL_ERROR, offset) == 32 && offsetof(KRAL_ERROR, text) == 104);

// The system hands thread ids out again; these numbers are each thread's alone.
uint32_t ThisThread() {
  static std::atomic<uint32_t> last{0};
  thread_local uint32_t number = 0;
  if (number == 0) number = ++last;
  return number;
}

}  // namespace

LastErrors::Entry& LastErrors::Place(KRAL_HANDLE handle, uint32_t thread) {
  const auto own =
      std::ranges::find_if(entries_, [=](const Entry& e) { return e.handle == handle && e.thread == thread; });
  if (own != entries_.end()) return *own;
  if (entries_.size() < kMostEntries) {
    try {
      return entries_.emplace_back();
    } catch (...) {
      if (entries_.empty()) throw;
    }
  }
  return *std::ranges::min_element(entries_, {}, &Entry::order);
}

void LastErrors::Note(KRAL_HANDLE handle, const KRAL_ERROR& error) noexcept try {
  const uint32_t thread = ThisThread();
  const MutexLock lock(mutex_);
  Entry& entry = Place(handle, thread);
  entry = {handle, thread, ++noted_, error};
  entry.error.number = static_cast<uint32_t>(entry.order);
} catch (...) {
  // No memory, and no older record to write over.
}

bool LastErrors::Find(KRAL_HANDLE handle, KRAL_ERROR& error) const noexcept {
  const uint32_t thread = ThisThread();
  const MutexLock lock(mutex_);
  const Entry* found = nullptr;
  for (const Entry& entry : entries_) {
    if (entry.handle != handle) continue;
    if (entry.thread == thread) {
      found = &entry;
      break;
    }
    if (handle != 0 && (found == nullptr || entry.order > found->order)) found = &entry;
  }
  if (found == nullptr) return false;
  error = found->error;
  if (found->thread != thread) error.present |= KRAL_ERROR_OF_OTHER_THREAD;
  return true;
}

void LastErrors::Forget(KRAL_HANDLE handle) noexcept {
  const MutexLock lock(mutex_);
  std::erase_if(entries_, [handle](const Entry& entry) { return entry.handle == handle; });
}

}  // namespace kral

extern "C" {

uint8_t KRAL_CALL KRAL_GetLastError(KRAL_HANDLE handle, KRAL_ERROR* error) {
  return error != nullptr && kral::Library().last_errors.Find(handle, *error) ? 1 : 0;
}

uint8_t KRAL_CALL KRAL_GetErrorText(uint32_t code, char* text, uint32_t size) {
  const std::string_view phrase = kral::ErrorPhrase(code);
  if (phrase.empty() || text == nullptr || phrase.size() >= size) return 0;
  *std::ranges::copy(phrase, text).out = '\0';
  return 1;
}

}  // extern "C"
