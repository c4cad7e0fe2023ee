// What the pages of the tool have in common: they need nothing beside them, and follow the light or dark of the reader.
#ifndef KRAL_TOOLS_PAGE_H
#define KRAL_TOOLS_PAGE_H

#include <string>
#include <string_view>

namespace kral::tool {

// Everything up to and with the heading. `style` is what the page has beside the common rules and colours: --text,
// --dim, --line, --head, --page, --good and --bad.
std::string PageHead(std::string_view title, std::string_view style);
inline constexpr std::string_view kPageEnd = "</body></html>\n";

// Text of files and handsets, which may hold anything.
std::string PageText(std::string_view text);

// ToolError kBadFile for a page that could not be written. `option` has named it.
void CheckPage(const std::string& file, std::string_view option);
// In one step; a page that is there stays until then.
void WritePage(const std::string& file, std::string_view page, std::string_view option);

}  // namespace kral::tool

#endif
