// The version text of the library.
#ifndef KRAL_FRAME_VERSION_H
#define KRAL_FRAME_VERSION_H

#include <string>

namespace kral {

std::string LibraryVersion();  // names the library mode that is set

}  // namespace kral

#endif
