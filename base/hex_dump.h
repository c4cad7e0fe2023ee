// Hex dumps for the text log: two upper-case digits and a blank per byte.
#ifndef KRAL_BASE_HEX_DUMP_H
#define KRAL_BASE_HEX_DUMP_H

#include <cstdint>
#include <span>
#include <string>

namespace kral {

std::string HexDump(std::span<const uint8_t> bytes);

}  // namespace kral

#endif
