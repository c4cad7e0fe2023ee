// Bytes written as hex by a person.
#ifndef KRAL_TOOLS_HEX_BYTES_H
#define KRAL_TOOLS_HEX_BYTES_H

#include <cstdint>
#include <string>
#include <vector>

namespace kral::tool {

// "4B0F0000", "4b 0f 00 00", "0x4B,0x0F,0,0": digits in pairs, or single ones standing alone. ToolError kUsage.
std::vector<std::uint8_t> ParseHex(const std::vector<std::string>& words);

}  // namespace kral::tool

#endif
