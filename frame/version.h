// The version of the library, as numbers and as text.
#ifndef KRAL_FRAME_VERSION_H
#define KRAL_FRAME_VERSION_H

#include <string>

namespace kral {

inline constexpr unsigned kVersionMajor = 6;
inline constexpr unsigned kVersionMinor = 0;
inline constexpr unsigned kVersionPatch = 29;

std::string LibraryVersion();  // names the library mode that is set

}  // namespace kral

#endif
