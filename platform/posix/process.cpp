// Processes, found through /proc.
#include "platform/process.h"

#include <signal.h>
#include <sys/types.h>

#include <charconv>
#include <filesystem>
#include <optional>
#include <string>
#include <system_error>

namespace kral {
namespace {

std::optional<pid_t> ProcessId(const std::string& folder_name) {
  pid_t id = 0;
  const char* end = folder_name.data() + folder_name.size();
  const auto [stop, error] = std::from_chars(folder_name.data(), end, id);
  if (error != std::errc() || stop != end || id <= 0) return std::nullopt;
  return id;
}

}  // namespace

void TerminateProcessByName(const char* executable) {
  std::error_code error;
  for (std::filesystem::directory_iterator entry("/proc", error), end; !error && entry != end; entry.increment(error)) {
    const auto id = ProcessId(entry->path().filename().string());
    if (!id) continue;
    std::error_code unreadable;  // another user's process, or one that has just ended
    const auto image = std::filesystem::read_symlink(entry->path() / "exe", unreadable);
    if (unreadable || image.filename() != executable) continue;
    ::kill(*id, SIGKILL);
    return;
  }
}

}  // namespace kral
