// The version text of the library.
#include "frame/version.h"

#include "frame/resource_manager.h"

namespace kral {

std::string LibraryVersion() {
  const std::string number =
      std::to_string(kVersionMajor) + "." + std::to_string(kVersionMinor) + "." + std::to_string(kVersionPatch);
  return "KRAL V" + number + (Kral_ResourceManager::server_mode() ? ",ORBT" : ",VENTRIMS");
}

}  // namespace kral
