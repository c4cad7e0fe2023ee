// Times of packets as a person writes them.
#ifndef KRAL_TOOLS_TRAFFIC_TIME_OF_PACKET_H
#define KRAL_TOOLS_TRAFFIC_TIME_OF_PACKET_H

#include <cstdint>
#include <string>

namespace kral::tool {

// Microseconds since 1970 UTC of "2026-03-01T09:30:00.25" or "09:30", in UTC. One without a date is on the day of
// `begin`. ToolError kUsage for anything else.
std::uint64_t ParseTime(const std::string& text, std::uint64_t begin);

}  // namespace kral::tool

#endif
