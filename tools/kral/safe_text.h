// Texts that a user, a file or a handset has named, fit for a terminal.
#ifndef KRAL_TOOLS_SAFE_TEXT_H
#define KRAL_TOOLS_SAFE_TEXT_H

#include <cstddef>
#include <string>
#include <string_view>

namespace kral::tool {

// A name as it is shown: UTF-8 as it is, controls and bytes that are none as "\x1B".
std::string NameText(std::string_view name);
// The same for what may have several lines.
std::string SafeText(std::string_view text);

// As many characters, from the first.
std::string FirstCharacters(std::string_view text, std::size_t count);

bool IsUtf8(std::string_view text);

}  // namespace kral::tool

#endif
