// What became of each of several handsets, and the one end that a verb has for all of them.
#ifndef KRAL_TOOLS_VERDICTS_H
#define KRAL_TOOLS_VERDICTS_H

#include <string>
#include <vector>

#include "tools/kral/board.h"
#include "tools/kral/verbs.h"

namespace kral::tool {

// So that it is seen whose it is: "COM7: online".
std::string Labelled(const Verdict& verdict);

// Prints the table or the rows. ToolError, with the rows as what was found, unless all of them passed.
void ConcludeVerdicts(Context& context, const std::vector<const Verdict*>& verdicts);

}  // namespace kral::tool

#endif
