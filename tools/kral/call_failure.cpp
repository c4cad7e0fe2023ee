// Words for the records of the library. What a verb knows better, it says itself.
#include "tools/kral/call_failure.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <utility>

#include "tools/kral/format.h"
#include "tools/kral/output.h"
#include "tools/kral/session.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kAnyStatus = UINT32_MAX;  // or kind of one
constexpr std::uint32_t kNoSuchFile = 2;
constexpr std::uint32_t kNoRoom = 28;
constexpr const char* kOtherMode = "the command may need another mode (kral mode), an unlock, or other firmware";

struct Hint {
  std::uint32_t code;
  std::uint32_t status_kind;
  std::uint32_t status;
  const char* text;
};

// The first that fits.
constexpr std::array kHints{
    Hint{KRAL_ERROR_INTERNAL, kAnyStatus, kAnyStatus, "--log FILE tells more"},
    Hint{KRAL_ERROR_ARGUMENT, kAnyStatus, kAnyStatus, "--help behind the verb tells what it takes"},
    Hint{KRAL_ERROR_NO_PORT, kAnyStatus, kAnyStatus,
         "kral ports lists the ports there are; --log FILE tells what the system said"},
    Hint{KRAL_ERROR_PORT_IN_USE, kAnyStatus, kAnyStatus,
         "close the program that holds the port, then run the command again"},
    Hint{KRAL_ERROR_NO_ANSWER, kAnyStatus, kAnyStatus, "--time-out MS waits longer"},
    Hint{KRAL_ERROR_LINK, KRAL_ERROR_STATUS_REPLY, kAnyStatus,
         "check that no other program talks to the handset; --log FILE shows the traffic"},
    Hint{KRAL_ERROR_LINK, kAnyStatus, kAnyStatus, "check the cable and try again; --log FILE shows the traffic"},
    Hint{KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_REFUSAL, 24,
         "the command belongs to another operating mode: kral mode ftm switches to factory test mode, kral mode online "
         "back"},
    Hint{KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_EFS, kNoRoom, "kral fs df shows the room; kral fs rm makes some"},
    Hint{KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_EFS, kAnyStatus, "kral fs stat and kral fs ls show what is there"},
    Hint{KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_NV, kAnyStatus,
         "the item may be read-only or the handset may need an unlock"},
    Hint{KRAL_ERROR_REFUSED, KRAL_ERROR_STATUS_LOADER, kAnyStatus, "check that the file is meant for this handset"},
    Hint{KRAL_ERROR_REFUSED, kAnyStatus, kAnyStatus, kOtherMode},
    Hint{KRAL_ERROR_MISMATCH, kAnyStatus, kAnyStatus, "--log FILE shows the traffic"},
    Hint{KRAL_ERROR_LOST, kAnyStatus, kAnyStatus,
         "check the cable; a handset that restarts comes back on its port after a while"},
    Hint{KRAL_ERROR_BAD_FILE, kAnyStatus, kAnyStatus, "check the file, its permissions and the room on its disk"},
    Hint{KRAL_ERROR_SAFETY_STOP, kAnyStatus, kAnyStatus, "nothing was changed; --log FILE tells more"},
    Hint{KRAL_ERROR_ABORTED, kAnyStatus, kAnyStatus, "run the command again"},
};

std::string HintOf(const KRAL_ERROR& record) {
  for (const Hint& hint : kHints) {
    if (hint.code == record.code && (hint.status_kind == kAnyStatus || hint.status_kind == record.status_kind) &&
        (hint.status == kAnyStatus || hint.status == record.status)) {
      return hint.text;
    }
  }
  return "--log FILE tells more";
}

// A code of a later library is a failure all the same.
ExitCode CodeOf(const KRAL_ERROR& record) {
  const auto code = static_cast<ExitCode>(record.code);
  const bool known = std::ranges::any_of(kExitNames, [code](auto& row) { return row.first == code; });
  return known && code != ExitCode::kDone ? code : ExitCode::kInternal;
}

// No handset and no port has a part in it.
bool IsLocal(const KRAL_ERROR& record) {
  return record.code == KRAL_ERROR_ARGUMENT || record.code == KRAL_ERROR_BAD_FILE;
}

// The record is about one request as such; who knew more has named what was wrong.
bool IsOfRequest(const KRAL_ERROR& record) {
  return record.code == KRAL_ERROR_NO_ANSWER || record.code == KRAL_ERROR_LINK || record.code == KRAL_ERROR_INTERNAL ||
         record.status_kind == KRAL_ERROR_STATUS_REFUSAL;
}

bool Mentions(std::string_view text, std::uint16_t port) {
  const std::string name = Format("COM{}", port);
  const auto at = text.find(name);
  const auto end = at + name.size();
  return at != std::string_view::npos && (end == text.size() || std::isdigit(text[end]) == 0);
}

std::string SentenceOf(const KRAL_ERROR& record, std::string_view what, std::uint16_t port) {
  constexpr std::string_view kHandset = "the handset ";
  std::string text = record.text;
  if (IsLocal(record)) return text;
  const std::string where = port == 0 || Mentions(text, port) ? "" : " on " + DescribePort(port);
  if (IsOfRequest(record)) return Format("{}{}: {}", what, where, text);
  if (where.empty() || !text.starts_with(kHandset)) return text + where;
  return Format("the handset{} {}", where, text.substr(kHandset.size()));
}

}  // namespace

std::optional<KRAL_ERROR> LastError(KRAL_HANDLE handle) {
  KRAL_ERROR record{};
  return KRAL_GetLastError(handle, &record) != 0 ? std::optional(record) : std::nullopt;
}

bool IsNoSuchFile(const std::optional<KRAL_ERROR>& record) {
  return record && record->code == KRAL_ERROR_REFUSED && record->status_kind == KRAL_ERROR_STATUS_EFS &&
         record->status == kNoSuchFile;
}

ToolError ExplainRecord(const KRAL_ERROR& record, std::string_view what, std::uint16_t port, std::string hint) {
  if (hint.empty()) hint = HintOf(record);
  return {CodeOf(record), SentenceOf(record, what, port), std::move(hint), record};
}

ToolError ExplainRecord(const std::optional<KRAL_ERROR>& record, std::string_view what, std::uint16_t port,
                        std::string hint) {
  if (record) return ExplainRecord(*record, what, port, std::move(hint));
  return {ExitCode::kInternal,
          port == 0 ? Format("{} failed", what) : Format("{} failed on {}", what, DescribePort(port)),
          "--log FILE tells more"};
}

}  // namespace kral::tool
