// What the help of each verb shows at its end.
#ifndef KRAL_TOOLS_EXAMPLES_H
#define KRAL_TOOLS_EXAMPLES_H

namespace kral::tool {

class CommandLine;

void AddExamples(CommandLine& command_line);  // behind all verbs

}  // namespace kral::tool

#endif
