// Capture files, packet by packet with the times at which they came, for the log and event verbs.
#ifndef KRAL_TOOLS_TRAFFIC_PLAYBACK_H
#define KRAL_TOOLS_TRAFFIC_PLAYBACK_H

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "kral/kral.h"

namespace kral::tool {

// A handle with nothing behind it, for the playback of files.
class OfflineHandle {
 public:
  OfflineHandle();
  ~OfflineHandle();
  OfflineHandle(const OfflineHandle&) = delete;
  OfflineHandle& operator=(const OfflineHandle&) = delete;
  KRAL_HANDLE get() const { return handle_; }

 private:
  KRAL_HANDLE handle_;
};

struct PlayedPacket {
  std::uint64_t microseconds = 0;  // since 1970 UTC
  std::vector<std::uint8_t> bytes;
};

enum class Pace { kAtOnce, kAsRecorded };

// Microseconds since 1970 UTC, both ends included.
struct Stretch {
  std::uint64_t from = 0;
  std::uint64_t to = UINT64_MAX;
};

// The whole file, or a part, packet by packet. ToolError kBadFile; one that is cut gives what it has, and false.
bool PlayFile(KRAL_HANDLE handle, const std::string& file, Pace pace,
              const std::function<void(const PlayedPacket&)>& sink, const Stretch& stretch = {});

// When its first packet came; nothing when it has none.
std::optional<std::uint64_t> BeginOf(KRAL_HANDLE handle, const std::string& file);

// "2026-03-01T09:30:00.250000Z"; a number that is no time of this era as it stands.
std::string TimeText(std::uint64_t microseconds);

}  // namespace kral::tool

#endif
