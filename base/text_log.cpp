// Writes the lines of the text log. Which categories exist and how a record looks is in text_log_format.h; the
// exported functions around it are in frame/text_log_exports.cpp.
#include "base/text_log.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <new>
#include <system_error>
#include <utility>

#include "base/at_exit.h"
#include "base/guarded_call.h"
#include "base/hex_dump.h"
#include "base/little_endian.h"
#include "base/text_log_format.h"
#include "platform/file_util.h"
#include "platform/forced_unwind.h"
#include "platform/local_time.h"
#include "platform/signals.h"

namespace kral {
namespace {

using Line = std::array<char, kLineCapacity>;

// The callback's own thread is in it: without a bound, a callback that calls what logs would be called for that line.
thread_local bool in_callback = false;

// Bytes of the control character that begins here, 0 for none. C2 80 to C2 9F are those of UTF-8. A tab is none: lines
// of the library hold some, and it does no harm.
size_t ControlLength(std::string_view text) {
  const auto first = static_cast<uint8_t>(text[0]);
  if ((first < 0x20 && first != '\t') || first == 0x7F) return 1;
  const auto second = static_cast<uint8_t>(text.size() > 1 ? text[1] : 0);
  return first == 0xC2 && second >= 0x80 && second < 0xA0 ? 2 : 0;
}

// The ends that lines of the library have. Behind one nothing follows that could look like another line.
std::string_view WithoutEnd(std::string_view text) {
  for (const std::string_view end : {"\r \n", "\r\n", "\n"}) {
    if (text.ends_with(end)) return text.substr(0, text.size() - end.size());
  }
  return text;
}

bool HoldsControl(std::string_view text) {
  for (size_t i = 0; i < text.size(); ++i) {
    if (ControlLength(text.substr(i)) != 0) return true;
  }
  return false;
}

// Control characters become \x and two digits: what a handset calls itself must not look like a line of the library,
// nor be a command to the terminal that shows the log. Gives the new length; what has no room is cut.
size_t Escape(Line& line, size_t length) {
  constexpr char kDigits[] = "0123456789ABCDEF";
  constexpr size_t kEscaped = 4;
  const Line plain = line;
  const std::string_view text = WithoutEnd({plain.data(), length});
  const std::string_view end(text.end(), plain.data() + length);
  size_t written = 0;
  for (size_t i = 0; i < text.size();) {
    const size_t control = ControlLength(text.substr(i));
    if (written + std::max<size_t>(control * kEscaped, 1) >= line.size()) break;
    if (control == 0) line[written++] = text[i++];
    for (const size_t next = i + control; control != 0 && i < next; ++i) {
      const auto byte = static_cast<uint8_t>(text[i]);
      for (const char c : {'\\', 'x', kDigits[byte >> 4], kDigits[byte & 0xF]}) line[written++] = c;
    }
  }
  if (written + end.size() < line.size()) {
    std::ranges::copy(end, line.begin() + static_cast<std::ptrdiff_t>(written));
    written += end.size();
  }
  line[written] = 0;
  return written;
}

}  // namespace

DataLogFileHandler::DataLogFileHandler(Clock& clock) : clock_(clock), start_tick_(clock.TickMs()) {}

DataLogFileHandler::~DataLogFileHandler() = default;

void DataLogFileHandler::WriteLine(uint32_t flag, const char* format, ...) {
  if (!Wants(flag)) return;

  Line line;
  const size_t indentation = Indentation(flag);
  std::fill_n(line.begin(), indentation, ' ');
  const size_t room = line.size() - indentation;
  va_list arguments;
  va_start(arguments, format);
  const int formatted = std::vsnprintf(line.data() + indentation, room, format, arguments);
  va_end(arguments);
  if (formatted < 0) return;  // an argument that cannot be printed at all
  size_t length = indentation + std::min(static_cast<size_t>(formatted), room - 1);
  if (HoldsControl(WithoutEnd({line.data(), length}))) length = Escape(line, length);
  Deliver(flag, line.data(), length);
}

void DataLogFileHandler::WriteBytes(uint32_t flag, const char* format, std::span<const uint8_t> bytes) {
  if (!Wants(flag)) return;
  std::string dump;
  try {
    dump = HexDump(bytes);
  } catch (const std::bad_alloc&) {
    // The line goes without them: no packet may be lost for the text log.
  }
  WriteLine(flag, format, static_cast<int>(bytes.size()), dump.c_str());
}

void DataLogFileHandler::WriteText(uint32_t flag, const char* text) {
  if (!Wants(flag)) return;
  Line line;
  const size_t indentation = Indentation(flag);
  std::fill_n(line.begin(), indentation, ' ');
  const std::string_view taken = std::string_view(text).substr(0, line.size() - 1 - indentation);
  std::ranges::copy(taken, line.begin() + static_cast<std::ptrdiff_t>(indentation));
  const size_t length = indentation + taken.size();
  line[length] = 0;
  Deliver(flag, line.data(), length);
}

void DataLogFileHandler::Deliver(uint32_t flag, const char* text, size_t length) {
  TextLogCallback callback = nullptr;
  uint32_t handle = 0;
  std::string fault;
  {
    const MutexLock lock(mutex_);
    try {
      fault = WriteToFile(flag, text);
    } catch (...) {
      PassForcedUnwind();  // no memory for the file's name: as when it cannot be opened
    }
    callback = callback_;
    handle = callback_handle_;
  }
  if (callback == nullptr || in_callback) return;
  if (!fault.empty()) CallBack(callback, handle, kLogErr, fault);
  CallBack(callback, handle, flag, {text, length});
}

// Gives what whoever sees the lines should know of the file: nothing, or once that it does not take them all.
std::string DataLogFileHandler::WriteToFile(uint32_t flag, const char* text) {
  if (!logging_started_) return {};
  if (!file_ && !file_name_.empty()) file_.reset(OpenToWriteText(file_name_));
  if (!file_) return {};  // a file that cannot be opened is not reported: its lines are dropped
  std::string fault;
  CallWithoutPipeSignal([&]() KRAL_REQUIRES(mutex_) { fault = WriteStamped(flag, text); });
  return fault;
}

std::string DataLogFileHandler::WriteStamped(uint32_t flag, const char* text) {
  if (relative_time_stamps_) {
    std::fprintf(file_.get(), "%d\t", static_cast<int>(clock_.TickMs() - start_tick_));
  } else {
    // The hour is deliberately not part of the stamp.
    const LocalTime now = CurrentLocalTime();
    std::fprintf(file_.get(), "%02d:%02d:%03d\t", now.minute, now.second, now.millisecond);
  }
  std::fprintf(file_.get(), ",%s,%s\n", CategoryName(flag).data(), text);
  // A station that dies leaves its log whole.
  if (std::fflush(file_.get()) == 0 && std::ferror(file_.get()) == 0) return {};
  const std::error_code error(errno, std::generic_category());
  std::clearerr(file_.get());  // the next line is tried again
  if (std::exchange(loss_told_, true)) return {};
  return "Text log: lines are lost, " + file_name_ + " cannot be written: " + error.message();
}

void DataLogFileHandler::CallBack(TextLogCallback callback, uint32_t handle, uint32_t flag, std::string_view text) {
  std::array<uint8_t, text_log_record::kSize> record{};
  StoreLe(std::span(record), text_log_record::kFlag, static_cast<uint16_t>(flag));
  StoreLe(std::span(record), text_log_record::kMilliseconds, clock_.TickMs() - start_tick_);
  text = text.substr(0, text_log_record::kTextCapacity);
  std::ranges::copy(text, record.begin() + text_log_record::kText);
  in_callback = true;
  const AtExit returned([] { in_callback = false; });
  CallGuarded([&] { callback(text_log_record::kSize, record.data(), handle); });
}

void DataLogFileHandler::Start(const char* file_name) {
  WriteLine(kLogFn, "KRAL_StartLogging( sLogFile = %s)", file_name);
  bool attached = false;
  {
    const MutexLock lock(mutex_);
    file_name_ = file_name;
    active_mask_ = stored_mask_;
    logging_started_ = true;
    loss_told_ = false;
    attached = file_ != nullptr;
  }
  if (attached) {
    // Started twice: the old file takes its last two lines, then the next line opens the new one, truncated.
    const LocalTime now = CurrentLocalTime();
    WriteLine(kLogFn, "%s, %s", DateText(now).c_str(), TimeText(now).c_str());
    const MutexLock lock(mutex_);
    file_.reset();
  }
  started_result_ = true;
}

void DataLogFileHandler::Stop() {
  WriteLine(kLogFn, "KRAL_StopLogging()");
  const MutexLock lock(mutex_);
  file_name_.clear();
  // The closing line "Stop Log" belongs to the detached log's viewer, which this library does not have.
  file_.reset();
  start_tick_ = clock_.TickMs();
  // logging_started_ stays set: the formatting logger and the callback keep receiving lines after a stop.
  started_result_ = false;
}

void DataLogFileHandler::SetFlags(uint32_t mask) {
  WriteLine(kLogFn, "KRAL_SetLogFlags(uiLogFlags=0x%04X)", mask);
  const MutexLock lock(mutex_);
  stored_mask_ = mask;
  active_mask_ = mask;
}

void DataLogFileHandler::SetCallback(TextLogCallback callback, uint32_t handle) {
  const MutexLock lock(mutex_);
  callback_ = callback;
  callback_handle_ = handle;
}

void DataLogFileHandler::RegisterCategory(std::string_view name, bool on) {
  const MutexLock lock(mutex_);
  categories_.push_back({std::string(name), on});
}

bool DataLogFileHandler::IsCategoryOn(std::string_view name) const {
  const MutexLock lock(mutex_);
  const auto found =
      std::ranges::find_if(categories_, [name](const Category& category) { return category.name == name; });
  return found != categories_.end() && found->on;
}

// Never destroyed, as the system's clock.
DataLogFileHandler& NullLog() {
  static DataLogFileHandler& log = *new DataLogFileHandler;
  return log;
}

}  // namespace kral
