// A C header of typed inline functions over a definition file.
#ifndef KRAL_TOOLS_CMD_CMD_HEADER_H
#define KRAL_TOOLS_CMD_CMD_HEADER_H

#include <string>
#include <vector>

#include "tools/kral/cmd/cmd_definitions.h"

namespace kral::tool {

// A command for which there is no function.
struct LeftOut {
  std::string command;
  std::string why;
};

struct CmdHeader {
  std::string text;
  std::vector<LeftOut> left_out;
};

// For all commands of the connection. `name` is the header's, without folders.
CmdHeader MakeCmdHeader(const Session& session, const std::string& name);

}  // namespace kral::tool

#endif
