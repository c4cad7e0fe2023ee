// The text log of one handset: one line per message, to a file and to the caller's callback.
#ifndef KRAL_BASE_TEXT_LOG_H
#define KRAL_BASE_TEXT_LOG_H

#include <atomic>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "base/log_flags.h"
#include "base/mutex.h"
#include "platform/clock.h"

namespace kral {

// Called with (record size, record address, callback handle); see <kral/text_log.h> for the record.
using TextLogCallback = void (*)(uint32_t size, const void* record, uint32_t handle);

class DataLogFileHandler {
 public:
  explicit DataLogFileHandler(Clock& clock = SystemClock());
  ~DataLogFileHandler();
  DataLogFileHandler(const DataLogFileHandler&) = delete;
  DataLogFileHandler& operator=(const DataLogFileHandler&) = delete;

  // True when a line with this flag would go anywhere: callers test it before building costly texts.
  bool Wants(uint32_t flag) const { return (active_mask_.load(std::memory_order_relaxed) & flag) != 0; }

  // The library's path into the log. Callable from any thread; the callback runs outside the internal lock, and what it
  // causes to be written on its thread goes to the file only. Control characters of the arguments are escaped.
  [[gnu::format(gnu_printf, 3, 4)]] void WriteLine(uint32_t flag, const char* format, ...);
  // The same with a format of one %d and one %s: for the number of bytes and their hex dump.
  void WriteBytes(uint32_t flag, const char* format, std::span<const uint8_t> bytes);
  // A line of the caller's, as it is.
  void WriteText(uint32_t flag, const char* text);

  void Start(const char* file_name);  // adopts the stored mask; the file opens with the next line, truncated
  void Stop();                        // closes the file; the callback keeps receiving lines
  void SetFlags(uint32_t mask);       // stores and activates the mask
  void SetCallback(TextLogCallback callback, uint32_t handle);

  bool started_result() const { return started_result_; }    // what KRAL_IsLoggingStarted reports
  bool logging_started() const { return logging_started_; }  // set by the first Start, never cleared

  // Stamps lines with the milliseconds since the last stop instead of the clock. For: logs that are compared with one
  // another. Kept; nothing switches it on.
  void SetRelativeTimeStamps(bool on) { relative_time_stamps_ = on; }

  // Named debug switches beside the mask; an unknown one is off. For: the parts that they name. Kept; all are
  // registered as off, and no part asks.
  void RegisterCategory(std::string_view name, bool on);
  bool IsCategoryOn(std::string_view name) const;

 private:
  struct FileCloser {
    void operator()(std::FILE* file) const { std::fclose(file); }
  };
  struct Category {
    std::string name;
    bool on;
  };

  void Deliver(uint32_t flag, const char* text, size_t length);
  std::string WriteToFile(uint32_t flag, const char* text) KRAL_REQUIRES(mutex_);
  std::string WriteStamped(uint32_t flag, const char* text) KRAL_REQUIRES(mutex_);
  void CallBack(TextLogCallback callback, uint32_t handle, uint32_t flag, std::string_view text);

  Clock& clock_;
  std::atomic<uint32_t> active_mask_{0};  // nothing goes anywhere until SetFlags or Start
  std::atomic<bool> logging_started_{false};
  std::atomic<bool> started_result_{false};
  std::atomic<bool> relative_time_stamps_{false};
  std::atomic<uint32_t> start_tick_;

  mutable Mutex mutex_;
  std::string file_name_ KRAL_GUARDED_BY(mutex_);   // empty when stopped
  bool loss_told_ KRAL_GUARDED_BY(mutex_) = false;  // of this file
  std::unique_ptr<std::FILE, FileCloser> file_ KRAL_GUARDED_BY(mutex_);
  uint32_t stored_mask_ KRAL_GUARDED_BY(mutex_) = kDefaultLogMask;
  TextLogCallback callback_ KRAL_GUARDED_BY(mutex_) = nullptr;
  uint32_t callback_handle_ KRAL_GUARDED_BY(mutex_) = 0;
  std::vector<Category> categories_ KRAL_GUARDED_BY(mutex_);
};

// Takes nothing: for whoever has no log.
DataLogFileHandler& NullLog();

}  // namespace kral

#endif
