// The verbs of the tool: each file adds its own to the command line and says what they run.
#ifndef KRAL_TOOLS_VERBS_H
#define KRAL_TOOLS_VERBS_H

#include <cstdint>
#include <optional>
#include <string>

#include "tools/kral/command_line.h"
#include "tools/kral/output.h"
#include "tools/kral/session.h"

namespace kral::tool {

struct Context {
  SessionOptions session;
  bool all = false;  // every port on which a handset answers
  std::optional<double> wait_s;
  std::uint16_t jobs = 0;  // handsets that are worked on at once; 0: as many as there are
  std::string report;      // file of the page on all handsets
  std::string title;       // "kral flash all"
  Output out;
  Json found = Json::object();  // what a verb found out before it failed, for the JSON object of the failure

  // Each handset has a row and a verdict of its own, also when it is the only one.
  bool for_several() const { return all || session.port.find_first_of(",-") != std::string::npos || !report.empty(); }
};

void AddBootVerbs(const Command& root, Context& context);  // behind AddFlashVerbs
void AddBandVerbs(const Command& root, Context& context);
void AddCmdVerbs(const Command& root, Context& context);
void AddCompletionVerbs(const Command& root, Context& context);
void AddConfigVerbs(const Command& root, Context& context);
void AddDoctorVerbs(const Command& root, Context& context);
void AddFsVerbs(const Command& root, Context& context);
void AddEventVerbs(const Command& root, Context& context);
void AddFlashVerbs(const Command& root, Context& context);
void AddFtmVerbs(const Command& root, Context& context);
void AddLogVerbs(const Command& root, Context& context);
void AddPortVerbs(const Command& root, Context& context);
void AddInfoVerbs(const Command& root, Context& context);
void AddModeVerbs(const Command& root, Context& context);
void AddNvVerbs(const Command& root, Context& context);
void AddNvBackupVerbs(const Command& root, Context& context);
void AddRawVerbs(const Command& root, Context& context);
void AddSimVerbs(const Command& root, Context& context);

// What may stand in the place of the last of these words: a line each, with a tab and what it means. ":files": names of
// files, which the shell knows better.
void PrintCompletions(CommandLine& line, const std::vector<std::string>& words);

}  // namespace kral::tool

#endif
