// The core diagnostic commands on the wire: request rows, sorted by code, and the layouts of the replies.
#ifndef KRAL_COMMANDS_CORE_CORE_DIAG_FORMAT_H
#define KRAL_COMMANDS_CORE_CORE_DIAG_FORMAT_H

#include <cstddef>

#include "commands/request.h"

namespace kral::diag {

inline constexpr DiagRequest<> kVersion{0};
// Address and count, which the reply repeats; behind them its data, or the status of a poke.
inline constexpr u8 kMemoryHeader = 7;
inline constexpr DiagRequest<u32, u16> kPeekBytes{2, kMemoryHeader};
inline constexpr DiagRequest<u32, u16> kPeekWords{3, kMemoryHeader};
inline constexpr DiagRequest<u32, u16> kPeekDoubleWords{4, kMemoryHeader};
inline constexpr DiagRequest<u32, u16, Bytes> kPokeBytes{5, kMemoryHeader};
inline constexpr DiagRequest<u32, u16, Words> kPokeWords{6, kMemoryHeader};
inline constexpr DiagRequest<u32, u16, DoubleWords> kPokeDoubleWords{7, kMemoryHeader};
inline constexpr DiagRequest<u8, u8> kKeyPress{32};  // hold, key
inline constexpr DiagRequest<u16> kModeControl{41};
inline constexpr DiagRequest<> kErrorLogRead{42};
inline constexpr DiagRequest<u8> kErrorLogClear{43};
inline constexpr DiagRequest<> kGetSwitches{47};
inline constexpr DiagRequest<u16> kSetSwitches{48};
inline constexpr DiagRequest<> kEnterDownload{58};
inline constexpr DiagRequest<Block<6>> kServiceCode{65};
inline constexpr DiagRequest<> kIs2000Status{112};
inline constexpr DiagRequest<> kExtendedBuildId{124};
inline constexpr DiagRequest<u8, u16> kNvBackup{128};  // 55, 0: a subsystem dispatch with a code of its own
inline constexpr DiagRequest<> kSecurityFreeze{255};
static_assert(AreSorted(kVersion, kPeekBytes, kPeekWords, kPeekDoubleWords, kPokeBytes, kPokeWords, kPokeDoubleWords,
                        kKeyPress, kModeControl, kErrorLogRead, kErrorLogClear, kGetSwitches, kSetSwitches,
                        kEnterDownload, kServiceCode, kIs2000Status, kExtendedBuildId, kNvBackup, kSecurityFreeze));

inline constexpr SubsystemRequest<> kStatus{4, 14};
inline constexpr SubsystemRequest<> kOperatingMode{15, 0};
static_assert(AreSorted(kStatus, kOperatingMode));

// A run of characters in a reply; not terminated.
struct TextField {
  std::size_t offset;
  std::size_t size;
  constexpr std::size_t end() const { return offset + size; }
};

namespace version_reply {
inline constexpr TextField kCompileDate{1, 11};
inline constexpr TextField kCompileTime{12, 8};
inline constexpr TextField kReleaseDate{20, 11};
inline constexpr TextField kReleaseTime{31, 8};
inline constexpr TextField kVersionDirectory{39, 8};
inline constexpr std::size_t kStationClassMark = 47;
inline constexpr std::size_t kAirInterfaceRevision = 48;
inline constexpr std::size_t kMobileModel = 49;
inline constexpr std::size_t kFirmwareRevision = 50;
inline constexpr std::size_t kSlotCycleIndex = 52;
inline constexpr std::size_t kVocoderMajor = 53;
inline constexpr std::size_t kVocoderMinor = 54;
inline constexpr std::size_t kSize = 55;
// One below the full size, on purpose: some handsets leave the vocoder's minor version out.
inline constexpr std::size_t kLeastCopied = 54;
static_assert(kCompileDate.end() == kCompileTime.offset && kCompileTime.end() == kReleaseDate.offset &&
              kReleaseDate.end() == kReleaseTime.offset && kReleaseTime.end() == kVersionDirectory.offset &&
              kVersionDirectory.end() == kStationClassMark && kVocoderMinor + 1 == kSize);
}  // namespace version_reply

namespace build_id_reply {
inline constexpr std::size_t kHardwareVersion = 4;
inline constexpr std::size_t kMobileModel = 8;
inline constexpr std::size_t kTexts = 12;  // software revision, model: each NUL-terminated, one behind the other
}  // namespace build_id_reply

namespace operating_mode_reply {
inline constexpr std::size_t kState = 8;
}  // namespace operating_mode_reply

}  // namespace kral::diag

#endif
