// A C header of typed inline functions over a definition file.
#ifndef KRAL_TOOLS_CMD_CMD_HEADER_H
#define KRAL_TOOLS_CMD_CMD_HEADER_H

#include <set>
#include <string>
#include <vector>

#include "tools/kral/cmd/cmd_definitions.h"

namespace kral::tool {

struct CmdHeader {
  std::string text;
  std::vector<std::string> left_out;  // commands whose fields no parameters can stand for
};

// For all commands of the connection. `name` is the header's, without folders.
CmdHeader MakeCmdHeader(const Session& session, const std::string& name);

}  // namespace kral::tool

#endif
