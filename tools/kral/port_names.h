// Ports by other names than their numbers: a device, the serial number of the handset, a socket of a USB hub, a slot of
// the fixture.
#ifndef KRAL_TOOLS_PORT_NAMES_H
#define KRAL_TOOLS_PORT_NAMES_H

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "tools/kral/command_line.h"
#include "tools/kral/session.h"

namespace kral::tool {

// Puts numbers into the list of ports where it has names, and notes the slots among them. ToolError for a name that
// leads to no port, to several, or to the same one as another name.
void ResolvePortNames(SessionOptions& options);

// Which name each slot of the fixture has: `kral ports assign`. ToolError for a file that is there and is none of
// these.
std::map<std::uint16_t, std::string> ReadSlots();
// All of it, or nothing when `change` throws; one at a time, whoever else does so.
void ChangeSlots(const std::function<void(std::map<std::uint16_t, std::string>& slots)>& change);
std::string SlotFile();
// A name in the one way in which it is kept; ToolError for what cannot be the name of a port.
std::string PortName(const std::string& name);

// The ports of this machine and the slots of the fixture, as -p takes them; `words` end in what is being typed.
std::vector<Completion> SuggestPorts(const std::vector<std::string>& words);

// Waits until all ports are there and handsets answer on them, or for so long: what is then still missing the verb
// tells. A boot loader is not asked.
void AwaitHandsets(SessionOptions& options, bool all, bool is_for_boot_loader);

}  // namespace kral::tool

#endif
