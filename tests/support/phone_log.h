// The text log of a connected handset, as its callback sees it.
#ifndef KRAL_TESTS_SUPPORT_PHONE_LOG_H
#define KRAL_TESTS_SUPPORT_PHONE_LOG_H

#include "kral/text_log.h"
#include "tests/support/test.h"

namespace kral::test {

class PhoneLog {
 public:
  using Lines = std::vector<std::string>;  // the flag, a blank and the text with its indentation

  explicit PhoneLog(KRAL_HANDLE handle, uint32_t flags = 0xFFFFFFFF) : handle_(handle) {
    {
      const std::lock_guard lock(Registry().mutex);
      Registry().lines[handle_].clear();
    }
    KRAL_ConfigureLibraryTextLogCallBack(handle_, &PhoneLog::OnLine);
    KRAL_SetLogFlags(handle_, flags);
  }
  ~PhoneLog() {
    KRAL_ConfigureLibraryTextLogCallBack(handle_, nullptr);
    const std::lock_guard lock(Registry().mutex);
    Registry().lines.erase(handle_);
  }
  PhoneLog(const PhoneLog&) = delete;
  PhoneLog& operator=(const PhoneLog&) = delete;

  // The lines since the last call.
  Lines Take() {
    const std::lock_guard lock(Registry().mutex);
    return std::exchange(Registry().lines[handle_], {});
  }

  Lines lines() const {
    const std::lock_guard lock(Registry().mutex);
    return Registry().lines[handle_];
  }

  // Whether the line has been written since the last Take.
  bool Has(std::string_view line) const { return Count(line) > 0; }
  size_t Count(std::string_view line) const {
    const std::lock_guard lock(Registry().mutex);
    const Lines& lines = Registry().lines[handle_];
    return static_cast<size_t>(std::ranges::count(lines, line));
  }

 private:
  struct State {
    std::mutex mutex;
    std::map<KRAL_HANDLE, Lines> lines;
  };
  static State& Registry() {
    static State state;
    return state;
  }

  static void KRAL_CALL OnLine(uint32_t, const void* record, uint32_t handle) {
    const char* const bytes = static_cast<const char*>(record);
    uint16_t flag = 0;
    std::memcpy(&flag, bytes, sizeof(flag));
    const std::lock_guard lock(Registry().mutex);
    const auto found = Registry().lines.find(handle);
    if (found != Registry().lines.end()) found->second.push_back(std::to_string(flag) + " " + (bytes + 8));
  }

  const KRAL_HANDLE handle_;
};

}  // namespace kral::test

#endif
