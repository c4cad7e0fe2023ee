// Appends the blocks of a pcapng file to bytes in memory.
#ifndef KRAL_TRANSPORT_TRACE_PCAPNG_BLOCKS_H
#define KRAL_TRANSPORT_TRACE_PCAPNG_BLOCKS_H

#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

namespace kral::pcapng {

struct InterfaceText {
  std::string_view name;
  std::string_view description;
};

struct PacketBlock {
  uint32_t interface = 0;
  uint64_t microseconds = 0;  // since 1970 UTC
  uint32_t flags = 0;
  std::string_view comment;  // empty: none
  std::span<const uint8_t> data;
};

void AppendSection(std::vector<uint8_t>& file, std::string_view application);
// Interfaces are numbered from 0 in the order of their blocks.
void AppendInterface(std::vector<uint8_t>& file, uint16_t link_type, const InterfaceText& text);
void AppendPacket(std::vector<uint8_t>& file, const PacketBlock& packet);
// What an interface received and what of it is not in the file, at the end of the file.
void AppendStatistics(std::vector<uint8_t>& file, uint32_t interface, uint64_t microseconds, uint64_t received,
                      uint64_t dropped);

}  // namespace kral::pcapng

#endif
