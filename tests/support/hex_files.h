// Texts of HEX files that more than one test needs.
#ifndef KRAL_TESTS_SUPPORT_HEX_FILES_H
#define KRAL_TESTS_SUPPORT_HEX_FILES_H

namespace kral::test {

// One byte at 0x00010000 and one at 0x08000000: the second is a region of its own.
inline constexpr char kTwoRegionsHex[] =
    ":020000040001F9\n:0100000055AA\n:020000040800F2\n:0100000055AA\n:00000001FF\n";

// A data record whose checksum is wrong.
inline constexpr char kBrokenHex[] = ":020000040002F8\n:0100000055AB\n:00000001FF\n";

}  // namespace kral::test

#endif
