// The numbers of the version, as texts of the library show them.
#ifndef KRAL_TESTS_SUPPORT_VERSION_NUMBERS_H
#define KRAL_TESTS_SUPPORT_VERSION_NUMBERS_H

#include <string>

#include "kral/kral.h"

namespace kral::test {

inline std::string VersionNumbers() {
  return std::to_string(KRAL_VERSION_MAJOR) + "." + std::to_string(KRAL_VERSION_MINOR) + "." +
         std::to_string(KRAL_VERSION_PATCH);
}

}  // namespace kral::test

#endif
