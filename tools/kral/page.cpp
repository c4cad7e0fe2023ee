// The frame of a page, and its way into a file.
#include "tools/kral/page.h"

#include <cstdint>
#include <system_error>

#include "platform/file_util.h"
#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr std::string_view kCommonHead = R"(<!DOCTYPE html>
<html lang="en"><head><meta charset="utf-8"><meta name="viewport" content="width=device-width">
<style>
:root { color-scheme: light dark; --text: #1f2328; --dim: #667; --line: #d0d7de; --head: #f3f4f6; --page: #fff;
  --good: #18794e; --bad: #d1242f; }
@media (prefers-color-scheme: dark) {
  :root { --text: #e6edf3; --dim: #9aa4b2; --line: #30363d; --head: #161b22; --page: #0d1117;
    --good: #7ee2a8; --bad: #ff6b66; }
}
body { font: 14px/1.45 system-ui, sans-serif; margin: 2em; color: var(--text); background: var(--page); }
h1 { font-size: 1.3em; overflow-wrap: anywhere; } p { color: var(--dim); }
table { border-collapse: collapse; width: 100%; }
th { position: sticky; top: 0; background: var(--head); text-align: left; white-space: nowrap; }
th, td { border-bottom: 1px solid var(--line); padding: 2px 10px 2px 0; } td { white-space: nowrap; }
.count { text-align: right; font-variant-numeric: tabular-nums; }
.span { display: flex; justify-content: space-between; font-weight: normal; color: var(--dim); }
svg { display: block; width: 100%; }
)";

void Check(std::error_code error, const std::string& file, std::string_view option) {
  if (!error) return;
  throw ToolError(ExitCode::kBadFile, Format("the page {} cannot be written: {}", file, error.message()),
                  Format("check folder and permissions of the file named by {}", option));
}

}  // namespace

std::string PageHead(std::string_view title, std::string_view style) {
  const auto text = PageText(title);
  return Format("{}{}</style>\n<title>{}</title></head><body>\n<h1>{}</h1>\n", kCommonHead, style, text, text);
}

std::string PageText(std::string_view text) {
  std::string safe;
  for (const char character : text) {
    switch (character) {
      case '&':
        safe += "&amp;";
        break;
      case '<':
        safe += "&lt;";
        break;
      case '"':
        safe += "&quot;";
        break;
      default:
        safe += character;
    }
  }
  return safe;
}

void CheckPage(const std::string& file, std::string_view option) {
  AtomicFile trial;
  Check(trial.Open(file), file, option);
}

void WritePage(const std::string& file, std::string_view page, std::string_view option) {
  Check(ReplaceWholeFile(file, {reinterpret_cast<const std::uint8_t*>(page.data()), page.size()}), file, option);
}

}  // namespace kral::tool
