// The verbs of the tool: each file adds its subcommands to the command line and says what they run.
#ifndef KRAL_TOOLS_VERBS_H
#define KRAL_TOOLS_VERBS_H

#include <functional>

#include "tools/kral/output.h"
#include "tools/kral/session.h"

namespace CLI {
class App;
}

namespace kral::tool {

struct Context {
  SessionOptions session;
  Output out;
  std::function<void()> run;    // set by the subcommand that was chosen
  Json found = Json::object();  // what a verb found out before it failed, for the JSON object of the failure
};

void AddBootVerbs(CLI::App& app, Context& context);  // behind AddFlashVerbs
void AddBandVerbs(CLI::App& app, Context& context);
void AddFsVerbs(CLI::App& app, Context& context);
void AddEventVerbs(CLI::App& app, Context& context);
void AddFlashVerbs(CLI::App& app, Context& context);
void AddFtmVerbs(CLI::App& app, Context& context);
void AddLogVerbs(CLI::App& app, Context& context);
void AddPortVerbs(CLI::App& app, Context& context);
void AddInfoVerbs(CLI::App& app, Context& context);
void AddModeVerbs(CLI::App& app, Context& context);
void AddNvVerbs(CLI::App& app, Context& context);
void AddNvBackupVerbs(CLI::App& app, Context& context);
void AddRawVerbs(CLI::App& app, Context& context);
void AddSimVerbs(CLI::App& app, Context& context);

}  // namespace kral::tool

#endif
