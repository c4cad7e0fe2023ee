// What keeps a user from a port, or slows it down, and can be mended: for whoever advises users.
#ifndef KRAL_PLATFORM_PORT_ACCESS_H
#define KRAL_PLATFORM_PORT_ACCESS_H

#include <cstdint>
#include <optional>
#include <string>

namespace kral {

struct PortAccess {
  // The group that may open the device; empty where groups have no part in it.
  std::string group;
  bool is_member = false;  // by the rights of this process
  bool is_listed = false;  // in the system's list: a member from the next login on
  // How long an adapter keeps few bytes back, and the file that sets it. Nothing where there is no such setting.
  std::optional<uint32_t> latency_ms;
  std::string latency_file;
};

PortAccess DescribePortAccess(const std::string& device);

// Of the first running process of that name; 0 when there is none.
uint32_t FindProcess(const std::string& name);

std::string SystemName();  // "Linux 6.1.0-18-amd64"

}  // namespace kral

#endif
