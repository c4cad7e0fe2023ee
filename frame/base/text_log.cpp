// Writes the lines of the text log. Which categories exist and how a record looks is in text_log_format.h; the
// exported functions around it are in frame/text_log_exports.cpp.
#include "frame/base/text_log.h"

#include <algorithm>
#include <array>
#include <cstdarg>

#include "frame/base/little_endian.h"
#include "frame/base/text_log_format.h"
#include "platform/file_util.h"
#include "platform/local_time.h"

namespace kral {

DataLogFileHandler::DataLogFileHandler(Clock& clock) : clock_(clock), start_tick_(clock.TickMs()) {}

DataLogFileHandler::~DataLogFileHandler() = default;

void DataLogFileHandler::WriteLine(uint32_t flag, const char* format, ...) {
  if (!Wants(flag)) return;

  std::array<char, kLineCapacity> line;
  const size_t indentation = Indentation(flag);
  std::fill_n(line.begin(), indentation, ' ');
  const size_t room = line.size() - indentation;
  va_list arguments;
  va_start(arguments, format);
  const int formatted = std::vsnprintf(line.data() + indentation, room, format, arguments);
  va_end(arguments);
  if (formatted < 0) return;  // an argument that cannot be printed at all
  const size_t length = indentation + std::min(static_cast<size_t>(formatted), room - 1);

  TextLogCallback callback = nullptr;
  uint32_t handle = 0;
  {
    const std::lock_guard lock(mutex_);
    WriteToFile(flag, line.data());
    callback = callback_;
    handle = callback_handle_;
  }
  if (callback != nullptr) CallBack(callback, handle, flag, {line.data(), length});
}

void DataLogFileHandler::WriteToFile(uint32_t flag, const char* text) {
  if (!logging_started_) return;
  if (!file_ && !file_name_.empty()) file_.reset(OpenToWriteText(file_name_));
  if (!file_) return;  // a file that cannot be opened is not reported: its lines are dropped
  if (relative_time_stamps_) {
    std::fprintf(file_.get(), "%d\t", static_cast<int>(clock_.TickMs() - start_tick_));
  } else {
    // The hour is deliberately not part of the stamp.
    const LocalTime now = CurrentLocalTime();
    std::fprintf(file_.get(), "%02d:%02d:%03d\t", now.minute, now.second, now.millisecond);
  }
  std::fprintf(file_.get(), ",%s,%s\n", CategoryName(flag).data(), text);
  std::fflush(file_.get());  // a station that dies leaves its log whole
}

void DataLogFileHandler::CallBack(TextLogCallback callback, uint32_t handle, uint32_t flag, std::string_view text) {
  std::array<uint8_t, text_log_record::kSize> record{};
  StoreLe(std::span(record), text_log_record::kFlag, static_cast<uint16_t>(flag));
  StoreLe(std::span(record), text_log_record::kMilliseconds, clock_.TickMs() - start_tick_);
  text = text.substr(0, text_log_record::kTextCapacity);
  std::copy(text.begin(), text.end(), record.begin() + text_log_record::kText);
  callback(text_log_record::kSize, record.data(), handle);
}

void DataLogFileHandler::Start(const char* file_name) {
  WriteLine(kLogFn, "KRAL_StartLogging( sLogFile = %s)", file_name);
  bool attached = false;
  {
    const std::lock_guard lock(mutex_);
    file_name_ = file_name;
    active_mask_ = stored_mask_;
    logging_started_ = true;
    attached = file_ != nullptr;
  }
  if (attached) {
    // Started twice: the old file takes its last two lines, then the next line opens the new one, truncated.
    const LocalTime now = CurrentLocalTime();
    WriteLine(kLogFn, "%s, %s", DateText(now).c_str(), TimeText(now).c_str());
    const std::lock_guard lock(mutex_);
    file_.reset();
  }
  started_result_ = true;
}

void DataLogFileHandler::Stop() {
  WriteLine(kLogFn, "KRAL_StopLogging()");
  const std::lock_guard lock(mutex_);
  file_name_.clear();
  // The closing line "Stop Log" belongs to the detached log's viewer, which this library does not have.
  file_.reset();
  start_tick_ = clock_.TickMs();
  // logging_started_ stays set: the formatting logger and the callback keep receiving lines after a stop.
  started_result_ = false;
}

void DataLogFileHandler::SetFlags(uint32_t mask) {
  WriteLine(kLogFn, "KRAL_SetLogFlags(uiLogFlags=0x%04X)", mask);
  const std::lock_guard lock(mutex_);
  stored_mask_ = mask;
  active_mask_ = mask;
}

void DataLogFileHandler::SetCallback(TextLogCallback callback, uint32_t handle) {
  const std::lock_guard lock(mutex_);
  callback_ = callback;
  callback_handle_ = handle;
}

void DataLogFileHandler::RegisterCategory(std::string_view name, bool on) {
  const std::lock_guard lock(mutex_);
  categories_.push_back({std::string(name), on});
}

bool DataLogFileHandler::IsCategoryOn(std::string_view name) const {
  const std::lock_guard lock(mutex_);
  const auto found = std::find_if(categories_.begin(), categories_.end(),
                                  [name](const Category& category) { return category.name == name; });
  return found != categories_.end() && found->on;
}

}  // namespace kral
