// What is declared of the command line as text, and the manual pages made from it: kral(1), and one for each noun.
#ifndef KRAL_TOOLS_MAN_PAGES_H
#define KRAL_TOOLS_MAN_PAGES_H

#include <string>
#include <vector>

namespace kral::tool {

struct ParameterText {
  std::string names;   // "-p,--port", or "paths" of an argument
  std::string values;  // what may stand behind it: "TEXT"; empty for a flag
  std::string help;
  bool required;
  bool many;
  std::string usage;  // in place of its name in a synopsis, where its values mean different things: "LOCAL... :PATH"
};

struct CommandText {
  std::string name;  // "put"
  std::string help;
  bool needs_verb;
  std::vector<ParameterText> arguments;
  std::vector<ParameterText> options;
  std::string explanation;  // lines as they are
  std::vector<std::string> examples;
  std::vector<CommandText> verbs;
};

// Throws ToolError where a file cannot be written.
void WriteManPages(const CommandText& program, const std::string& folder);

}  // namespace kral::tool

#endif
