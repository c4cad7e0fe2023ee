// How the tool ends: exit codes, their names in JSON, and the error that carries one.
#ifndef KRAL_TOOLS_EXIT_CODES_H
#define KRAL_TOOLS_EXIT_CODES_H

#include <array>
#include <cstddef>
#include <optional>
#include <stdexcept>
#include <string>
#include <utility>

#include "kral/error.h"

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

// The library's codes are the tool's.
static_assert(static_cast<int>(ExitCode::kInternal) == KRAL_ERROR_INTERNAL);
static_assert(static_cast<int>(ExitCode::kUsage) == KRAL_ERROR_ARGUMENT);
static_assert(static_cast<int>(ExitCode::kNoPort) == KRAL_ERROR_NO_PORT);
static_assert(static_cast<int>(ExitCode::kPortInUse) == KRAL_ERROR_PORT_IN_USE);
static_assert(static_cast<int>(ExitCode::kNoAnswer) == KRAL_ERROR_NO_ANSWER);
static_assert(static_cast<int>(ExitCode::kLink) == KRAL_ERROR_LINK);
static_assert(static_cast<int>(ExitCode::kRefused) == KRAL_ERROR_REFUSED);
static_assert(static_cast<int>(ExitCode::kMismatch) == KRAL_ERROR_MISMATCH);
static_assert(static_cast<int>(ExitCode::kLost) == KRAL_ERROR_LOST);
static_assert(static_cast<int>(ExitCode::kBadFile) == KRAL_ERROR_BAD_FILE);
static_assert(static_cast<int>(ExitCode::kSafetyStop) == KRAL_ERROR_SAFETY_STOP);
static_assert(static_cast<int>(ExitCode::kInterrupted) == KRAL_ERROR_ABORTED);

// What ends a verb early: what happened and where (text), and what to try next (hint). With it goes the record that the
// library left, where a call of the library failed.
class ToolError : public std::runtime_error {
 public:
  ToolError(ExitCode code, const std::string& text, std::string hint, std::optional<KRAL_ERROR> record = {})
      : std::runtime_error(text), code_(code), hint_(std::move(hint)), record_(record) {}

  ExitCode code() const { return code_; }
  const std::string& hint() const { return hint_; }
  const std::optional<KRAL_ERROR>& record() const { return record_; }

 private:
  ExitCode code_;
  std::string hint_;
  std::optional<KRAL_ERROR> record_;
};

}  // namespace kral::tool

#endif
