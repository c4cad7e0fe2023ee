// What the library tells in its text log only: the counts of a comparison, the status that a boot loader gives of a
// transfer, lines that the log's own file did not take. Why a call failed is told by KRAL_GetLastError
// (call_failure.h).
#ifndef KRAL_TOOLS_RESULT_LINES_H
#define KRAL_TOOLS_RESULT_LINES_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kral/kral.h"

namespace kral::tool {

inline constexpr std::uint32_t kResultLines = KRAL_LOG_ERR | KRAL_LOG_RET;  // what has to be in the log for it

// How the lines begin.
inline constexpr std::string_view kDiffCounts = "KRAL_NV_PKV_Diff: ";
inline constexpr std::string_view kTransferStatus = "Kivrat: image transfer status ";
inline constexpr std::string_view kLogFileTrouble = "Text log: ";  // the file does not hold all lines

void CollectResultLines(KRAL_HANDLE handle);  // from now on, through the text-log callback of the handle
// The rest of the last line with this beginning, of a handle or of all.
std::optional<std::string> ResultLine(std::string_view beginning, KRAL_HANDLE handle = 0);

// That of each handle.
std::vector<std::string> ResultLines(std::string_view beginning);

}  // namespace kral::tool

#endif
