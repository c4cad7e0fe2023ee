// The version text of the library.
#include "frame/version.h"

#include "frame/resource_manager.h"

namespace kral {

std::string LibraryVersion() {
  return Kral_ResourceManager::server_mode() ? "KRAL V6.0.29,ORBT" : "KRAL V6.0.29,VENTRIMS";
}

}  // namespace kral
