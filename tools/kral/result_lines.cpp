// Receives the text-log records of the connection and keeps the few that are results.
#include "tools/kral/result_lines.h"

#include <array>
#include <cstddef>
#include <cstring>
#include <map>
#include <mutex>

namespace kral::tool {
namespace {

constexpr std::size_t kTextOffset = 8;  // of a record of the callback
constexpr std::array kBeginnings{kDiffCounts, kTransferStatus, kLogFileTrouble};

std::mutex mutex;
std::map<std::pair<KRAL_HANDLE, std::string_view>, std::string> results;  // by beginning; 0: of any handle

void KRAL_CALL OnLine(std::uint32_t size, const void* record, std::uint32_t handle) {
  if (record == nullptr || size <= kTextOffset) return;
  const char* const begin = static_cast<const char*>(record) + kTextOffset;
  const void* const end = std::memchr(begin, 0, size - kTextOffset);
  const std::string_view text(
      begin, end == nullptr ? size - kTextOffset : static_cast<std::size_t>(static_cast<const char*>(end) - begin));
  for (const auto beginning : kBeginnings) {
    if (!text.starts_with(beginning)) continue;
    const std::lock_guard lock(mutex);
    for (const KRAL_HANDLE whose : {handle, KRAL_HANDLE{0}})
      results[{whose, beginning}] = text.substr(beginning.size());
  }
}

}  // namespace

void CollectResultLines(KRAL_HANDLE handle) {
  KRAL_ConfigureLibraryTextLogCallBack(handle, OnLine);
}

std::optional<std::string> ResultLine(std::string_view beginning, KRAL_HANDLE handle) {
  const std::lock_guard lock(mutex);
  const auto found = results.find({handle, beginning});
  return found == results.end() ? std::nullopt : std::optional(found->second);
}

std::vector<std::string> ResultLines(std::string_view beginning) {
  const std::lock_guard lock(mutex);
  std::vector<std::string> lines;
  for (const auto& [key, line] : results) {
    if (key.first != 0 && key.second == beginning) lines.push_back(line);
  }
  return lines;
}

}  // namespace kral::tool
