// Which word somebody may have meant.
#ifndef KRAL_TOOLS_NEAREST_WORD_H
#define KRAL_TOOLS_NEAREST_WORD_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kral::tool {

// The known word most like this one; nothing when half of the word would have to change.
std::optional<std::string> NearestWord(std::string_view word, const std::vector<std::string>& known);

}  // namespace kral::tool

#endif
