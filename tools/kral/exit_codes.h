// How the tool ends: exit codes, their names in JSON, and the error that carries one.
#ifndef KRAL_TOOLS_EXIT_CODES_H
#define KRAL_TOOLS_EXIT_CODES_H

#include <array>
#include <cstddef>
#include <stdexcept>
#include <string>
#include <utility>

namespace kral::tool {

enum class ExitCode : int {
  kDone = 0,
  kInternal = 1,
  kUsage = 2,
  kNoPort = 3,       // no such port or handset
  kPortInUse = 4,    // port busy or not permitted
  kNoAnswer = 5,     // no answer in time
  kLink = 6,         // garbled or foreign answers, failed writes
  kRefused = 7,      // the handset refused
  kMismatch = 8,     // verification failed
  kLost = 9,         // the handset went away in the middle of the work
  kBadFile = 10,     // a file or an image cannot be used
  kSafetyStop = 11,  // stopped before doing harm
  kSomeFailed = 12,  // some of several handsets failed
  kInterrupted = 130,
};

inline constexpr std::array<std::pair<ExitCode, const char*>, 14> kExitNames{{
    {ExitCode::kDone, "done"},
    {ExitCode::kInternal, "internal"},
    {ExitCode::kUsage, "usage"},
    {ExitCode::kNoPort, "no-port"},
    {ExitCode::kPortInUse, "port-in-use"},
    {ExitCode::kNoAnswer, "no-answer"},
    {ExitCode::kLink, "link"},
    {ExitCode::kRefused, "refused"},
    {ExitCode::kMismatch, "mismatch"},
    {ExitCode::kLost, "lost"},
    {ExitCode::kBadFile, "bad-file"},
    {ExitCode::kSafetyStop, "safety-stop"},
    {ExitCode::kSomeFailed, "some-failed"},
    {ExitCode::kInterrupted, "interrupted"},
}};
static_assert([] {
  for (std::size_t i = 1; i < kExitNames.size(); ++i) {
    if (kExitNames[i - 1].first >= kExitNames[i].first) return false;
  }
  return true;
}());

constexpr const char* NameOf(ExitCode code) {
  for (const auto& [known, name] : kExitNames) {
    if (known == code) return name;
  }
  return "internal";
}

// What ends a verb early: what happened and where (text), and what to try next (hint).
class ToolError : public std::runtime_error {
 public:
  ToolError(ExitCode code, const std::string& text, std::string hint)
      : std::runtime_error(text), code_(code), hint_(std::move(hint)) {}

  ExitCode code() const { return code_; }
  const std::string& hint() const { return hint_; }

 private:
  ExitCode code_;
  std::string hint_;
};

}  // namespace kral::tool

#endif
