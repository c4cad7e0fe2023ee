// What needs no system to know about paths.
#include "platform/folder.h"

namespace kral {

std::string JoinPath(const std::string& folder, const std::string& name) {
  const bool separated = folder.empty() || folder.back() == '/' || folder.back() == '\\';
  return folder + (separated ? "" : "/") + name;
}

}  // namespace kral
