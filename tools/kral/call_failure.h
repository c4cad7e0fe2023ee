// Why a call of the library failed, from the record that it leaves: exit code, sentence and what to try next.
#ifndef KRAL_TOOLS_CALL_FAILURE_H
#define KRAL_TOOLS_CALL_FAILURE_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "kral/kral.h"
#include "tools/kral/exit_codes.h"

namespace kral::tool {

// To be asked right behind the failed call, before another one fails. Nothing for a call that leaves no record.
std::optional<KRAL_ERROR> LastError(KRAL_HANDLE handle);

// Whether the handset's file system has no such file.
bool IsNoSuchFile(const std::optional<KRAL_ERROR>& record);

// "no such file /nope on COM7"; what was asked for stands in front where the record tells of one request only. Without
// a hint, one by code and status.
ToolError ExplainRecord(const KRAL_ERROR& record, std::string_view what, std::uint16_t port, std::string hint = {});
// The same of a call without a record.
ToolError ExplainRecord(const std::optional<KRAL_ERROR>& record, std::string_view what, std::uint16_t port,
                        std::string hint = {});

}  // namespace kral::tool

#endif
