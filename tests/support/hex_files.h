// Texts of HEX files that more than one test needs.
#ifndef KRAL_TESTS_SUPPORT_HEX_FILES_H
#define KRAL_TESTS_SUPPORT_HEX_FILES_H

#include <cstdio>
#include <string>

namespace kral::test {

// One byte at 0x00010000 and one at 0x08000000: the second is a region of its own.
inline constexpr char kTwoRegionsHex[] =
    ":020000040001F9\n:0100000055AA\n:020000040800F2\n:0100000055AA\n:00000001FF\n";

// A data record whose checksum is wrong.
inline constexpr char kBrokenHex[] = ":020000040002F8\n:0100000055AB\n:00000001FF\n";

// Five bytes in front of any extended address: the reader drops them.
inline constexpr char kDroppedHex[] = ":0500200068656C6C6FC7\n:00000001FF\n";

// A line of the digits and their checksum.
inline std::string HexRecord(const std::string& digits) {
  unsigned long sum = 0;
  for (size_t i = 0; i + 1 < digits.size(); i += 2) sum += std::stoul(digits.substr(i, 2), nullptr, 16);
  char checksum[3];
  std::snprintf(checksum, sizeof checksum, "%02lX", -sum & 0xFF);
  return ":" + digits + checksum + "\n";
}

}  // namespace kral::test

#endif
