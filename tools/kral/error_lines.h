// The error lines of a handset's text log, kept for the request that is running: the library says there why a call
// gave 0.
#ifndef KRAL_TOOLS_ERROR_LINES_H
#define KRAL_TOOLS_ERROR_LINES_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kral/kral.h"

namespace kral::tool {

inline constexpr std::uint32_t kExplainingLines = KRAL_LOG_ERR | KRAL_LOG_RET;

void CollectErrorLines(KRAL_HANDLE handle);  // from now on, through the text-log callback of the handle
void ForgetErrorLines();                     // before a request
// Those since then, errors and results.
std::vector<std::string> ErrorLines(std::uint32_t flags = kExplainingLines);
// Why the file of the text log does not hold all lines; nothing when it does.
std::optional<std::string> LogFileTrouble();
// The last of them that holds a text.
std::optional<std::string> FindErrorLine(std::string_view part);

}  // namespace kral::tool

#endif
