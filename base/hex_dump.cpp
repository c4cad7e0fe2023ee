// The one hex format of the text log.
#include "base/hex_dump.h"

namespace kral {

std::string HexDump(std::span<const uint8_t> bytes) {
  static constexpr char kDigits[] = "0123456789ABCDEF";
  std::string text(bytes.size() * 3, ' ');
  for (size_t i = 0; i < bytes.size(); ++i) {
    text[3 * i] = kDigits[bytes[i] >> 4];
    text[3 * i + 1] = kDigits[bytes[i] & 0x0F];
  }
  return text;
}

}  // namespace kral
