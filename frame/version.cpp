// The version text of the library, and the check that the public header has the same numbers.
#include "frame/version.h"

#include "frame/resource_manager.h"
#include "kral/kral.h"

namespace kral {

static_assert(kVersionMajor == KRAL_VERSION_MAJOR && kVersionMinor == KRAL_VERSION_MINOR &&
                  kVersionPatch == KRAL_VERSION_PATCH,
              "include/kral/kral.h has another version than CMakeLists.txt");

std::string LibraryVersion() {
  const std::string number =
      std::to_string(kVersionMajor) + "." + std::to_string(kVersionMinor) + "." + std::to_string(kVersionPatch);
  return "KRAL V" + number + (Kral_ResourceManager::server_mode() ? ",ORBT" : ",VENTRIMS");
}

}  // namespace kral
