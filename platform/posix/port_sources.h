// Where COM numbers come from on Linux; tests give their own folders and names.
#ifndef KRAL_PLATFORM_POSIX_PORT_SOURCES_H
#define KRAL_PLATFORM_POSIX_PORT_SOURCES_H

#include <cstdint>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include "platform/port_info.h"

namespace kral {

struct PortSources {
  std::map<int, std::string> variables;             // KRAL_COM<n>
  std::vector<std::filesystem::path> link_folders;  // with links com<n>, in the order they are searched
  std::filesystem::path tty_class;                  // one entry per tty of the system
  std::filesystem::path processes;                  // one folder per process, and the tables of locks and terminals
};

// What the environment of this process and the system say.
PortSources CurrentPortSources();

bool ListComPorts(const PortSources& sources, std::vector<uint16_t>& ports);
std::string ComPortDevice(const PortSources& sources, int number);
// The same, but of the names of a number only the first ones count: `place` is that of the last, and becomes that of
// the name that was found. Empty when none of them is there.
std::string ComPortDevice(const PortSources& sources, int number, uint32_t& place);
PortInfo DescribeComPort(const PortSources& sources, int number);

}  // namespace kral

#endif
