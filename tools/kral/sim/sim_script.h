// What is done to the simulated handsets while they run: commands of a file, or of the standard input as they come.
#ifndef KRAL_TOOLS_SIM_SIM_SCRIPT_H
#define KRAL_TOOLS_SIM_SIM_SCRIPT_H

#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <string>

#include "tools/kral/output.h"
#include "tools/kral/sim/sim_fixture.h"

namespace kral::tool {

class SimScript {
 public:
  // `file`: "-" for the standard input, empty for no commands at all. ToolError for a file that cannot be read or
  // holds anything but commands.
  SimScript(const Output& out, SimFixture& fixture, const std::string& file);

  // Carries out what is due, and tells it on stdout; to be called now and then. False behind "quit".
  bool Run();

  static std::string Describe();  // the commands, for the help text

 private:
  struct Inbox;  // of the thread that reads the standard input, which may outlive this

  bool Do(const std::string& line);

  const Output& out_;
  SimFixture& fixture_;
  std::deque<std::string> lines_;
  std::shared_ptr<Inbox> inbox_;
  std::optional<std::uint32_t> wait_since_;
  std::uint32_t wait_ms_ = 0;
};

}  // namespace kral::tool

#endif
