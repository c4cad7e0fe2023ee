// A text log whose lines a test can read. One at a time.
#ifndef KRAL_TESTS_SUPPORT_LOG_LINES_H
#define KRAL_TESTS_SUPPORT_LOG_LINES_H

#include <cstdint>
#include <cstring>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "base/text_log.h"
#include "base/text_log_format.h"

namespace kral::test {

class LogLines {
 public:
  using Lines = std::vector<std::string>;  // the flag, a blank and the text without its indentation

  explicit LogLines(uint32_t flags = 0xFFFFFFFF) {
    current_ = this;
    log_.SetFlags(flags);
    log_.SetCallback(&LogLines::OnLine, 0);
  }
  ~LogLines() { current_ = nullptr; }
  LogLines(const LogLines&) = delete;
  LogLines& operator=(const LogLines&) = delete;

  DataLogFileHandler* log() { return &log_; }

  // The lines since the last call.
  Lines Take() {
    const std::lock_guard lock(mutex_);
    return std::exchange(lines_, {});
  }

 private:
  static void OnLine(uint32_t, const void* record, uint32_t) {
    const char* const bytes = static_cast<const char*>(record);
    uint16_t flag = 0;
    std::memcpy(&flag, bytes + text_log_record::kFlag, sizeof(flag));
    const std::string text = bytes + text_log_record::kText;
    const std::lock_guard lock(current_->mutex_);
    current_->lines_.push_back(std::to_string(flag) + " " + text.substr(Indentation(flag)));
  }

  static inline LogLines* current_ = nullptr;  // the callback's own value is too narrow for an address
  std::mutex mutex_;
  Lines lines_;
  DataLogFileHandler log_;
};

}  // namespace kral::test

namespace kral {

using test::LogLines;

}  // namespace kral

#endif
