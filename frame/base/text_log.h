// The text log of one handset: one line per message, to a file and to the caller's callback.
#ifndef KRAL_FRAME_BASE_TEXT_LOG_H
#define KRAL_FRAME_BASE_TEXT_LOG_H

#include <atomic>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "frame/base/log_flags.h"

namespace kral {

// Called with (record size, record address, callback handle); see <kral/text_log.h> for the record.
using TextLogCallback = void (*)(uint32_t size, const void* record, uint32_t handle);

class DataLogFileHandler {
 public:
  DataLogFileHandler();
  ~DataLogFileHandler();
  DataLogFileHandler(const DataLogFileHandler&) = delete;
  DataLogFileHandler& operator=(const DataLogFileHandler&) = delete;

  // True when a line with this flag would go anywhere: callers test it before building costly texts.
  bool Wants(uint32_t flag) const { return (active_mask_.load(std::memory_order_relaxed) & flag) != 0; }

  // The only path into the log. Callable from any thread; the callback runs outside the internal lock.
  [[gnu::format(gnu_printf, 3, 4)]] void WriteLine(uint32_t flag, const char* format, ...);

  void Start(const char* file_name);  // adopts the stored mask; the file opens with the next line, truncated
  void Stop();                        // closes the file; the callback keeps receiving lines
  void SetFlags(uint32_t mask);       // stores and activates the mask
  void SetCallback(TextLogCallback callback, uint32_t handle);

  bool started_result() const;   // what KRAL_IsLoggingStarted reports
  bool logging_started() const;  // set by the first Start, never cleared (the formatting logger looks at it)

 private:
  std::atomic<uint32_t> active_mask_{0};
};

}  // namespace kral

#endif
