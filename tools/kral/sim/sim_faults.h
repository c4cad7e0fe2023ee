// Faults of the simulated handset as they are written on the command line.
#ifndef KRAL_TOOLS_SIM_SIM_FAULTS_H
#define KRAL_TOOLS_SIM_SIM_FAULTS_H

#include <string>

#include "handset/line/faults.h"

namespace kral::tool {

// KIND[=VALUE][,nth=N|from=N|every=N|chance=P][,of=HEX]: refuse=19,of=7C or delay=200,every=10. ToolError kUsage.
void AddFault(handset::FaultPlan& faults, const std::string& words);

// The kinds, one per line with what they do, for the help text.
std::string DescribeFaults();

}  // namespace kral::tool

#endif
