// Processes, found through /proc.
#include "platform/process.h"

#include <limits.h>
#include <signal.h>
#include <sys/types.h>
#include <unistd.h>

#include <array>
#include <string>
#include <string_view>
#include <vector>

#include "platform/posix/system_files.h"

namespace kral {

void TerminateProcessByName(const char* executable) {
  const std::filesystem::path processes = "/proc";
  for (const std::string& folder : NamesIn(processes).value_or(std::vector<std::string>())) {
    const auto id = NumberIn<pid_t>(folder);
    if (!id || *id <= 0) continue;
    // Nothing of another user's process, or of one that has just ended. Not RealPath: the file may have been replaced.
    std::array<char, PATH_MAX> image{};
    const ssize_t size = ::readlink((processes / folder / "exe").c_str(), image.data(), image.size());
    if (size <= 0) continue;
    if (std::filesystem::path(std::string_view(image.data(), static_cast<size_t>(size))).filename() != executable) {
      continue;
    }
    ::kill(*id, SIGKILL);
    return;
  }
}

}  // namespace kral
