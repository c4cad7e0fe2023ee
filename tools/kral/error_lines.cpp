// Receives the text-log records of the connection and keeps those that explain failures.
#include "tools/kral/error_lines.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <deque>
#include <mutex>

namespace kral::tool {
namespace {

// A record of the callback: flag at 0, text at 8.
constexpr std::size_t kTextOffset = 8;
constexpr std::size_t kMostLines = 64;

std::mutex mutex;
struct Line {
  std::uint32_t flag;
  std::string text;
};
std::deque<Line> lines;
std::optional<std::string> log_file_trouble;

void KRAL_CALL OnLine(std::uint32_t size, const void* record, std::uint32_t) {
  if (record == nullptr || size <= kTextOffset) return;
  const auto* bytes = static_cast<const char*>(record);
  std::uint16_t flag = 0;
  std::memcpy(&flag, bytes, sizeof flag);
  if ((flag & kExplainingLines) == 0) return;
  const auto room = size - kTextOffset;
  const void* end = std::memchr(bytes + kTextOffset, 0, room);
  const auto length =
      end == nullptr ? room : static_cast<std::size_t>(static_cast<const char*>(end) - (bytes + kTextOffset));
  const std::lock_guard lock(mutex);
  if (std::string_view(bytes + kTextOffset, length).starts_with("Text log: ")) {
    log_file_trouble = std::string(bytes + kTextOffset, length);
    return;
  }
  if (lines.size() == kMostLines) lines.pop_front();
  lines.push_back({flag, std::string(bytes + kTextOffset, length)});
}

}  // namespace

void CollectErrorLines(KRAL_HANDLE handle) {
  KRAL_ConfigureLibraryTextLogCallBack(handle, OnLine);
}

void ForgetErrorLines() {
  const std::lock_guard lock(mutex);
  lines.clear();
}

std::vector<std::string> ErrorLines(std::uint32_t flags) {
  const std::lock_guard lock(mutex);
  std::vector<std::string> found;
  for (const Line& line : lines) {
    if ((line.flag & flags) != 0) found.push_back(line.text);
  }
  return found;
}

std::optional<std::string> LogFileTrouble() {
  const std::lock_guard lock(mutex);
  return log_file_trouble;
}

std::optional<std::string> FindErrorLine(std::string_view part) {
  const std::lock_guard lock(mutex);
  const auto holds = [part](const Line& line) { return line.text.find(part) != std::string::npos; };
  const auto found = std::find_if(lines.rbegin(), lines.rend(), holds);
  return found == lines.rend() ? std::nullopt : std::optional(found->text);
}

}  // namespace kral::tool
