// Of which handset a PKV file is.
#ifndef KRAL_TOOLS_NV_PKV_ORIGIN_H
#define KRAL_TOOLS_NV_PKV_ORIGIN_H

#include <string>

namespace kral::tool {

struct PkvOrigin {
  std::string model;   // each empty where the file does not tell
  std::string serial;  // "80C0FFEE"
};

// What cannot be read tells nothing; whoever uses the file says why.
PkvOrigin OriginOf(const std::string& file);

}  // namespace kral::tool

#endif
