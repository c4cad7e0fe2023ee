// What the log and event verbs share: ids as a person writes them, the packets of a connection counted by what they
// are, and how long a verb goes on.
#ifndef KRAL_TOOLS_TRAFFIC_TRAFFIC_H
#define KRAL_TOOLS_TRAFFIC_TRAFFIC_H

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "kral/kral.h"
#include "platform/clock.h"
#include "tools/kral/output.h"

namespace kral::tool {

class Command;
class Session;

// "291", "0x1001", "0x1000-0x100F", none above `most`, in rising order and each once. ToolError kUsage.
std::vector<std::uint16_t> ParseIds(const std::vector<std::string>& words, std::uint16_t most = 0xFFFF);

// "log 0x1001", "message 5", "events", "packet 31".
std::string DescribePacket(std::span<const std::uint8_t> packet);

// Of a log packet, from the table of log names of the handle; empty for none.
std::string NameOfPacket(KRAL_HANDLE handle, std::span<const std::uint8_t> packet);

// Packets and bytes by DescribePacket.
class TrafficTable {
 public:
  void Add(std::span<const std::uint8_t> packet);

  // Rows of the busiest first. Names come from the table of log names of the handle.
  Json Rows(KRAL_HANDLE handle, double seconds) const;
  std::string Text(KRAL_HANDLE handle, double seconds) const;

 private:
  struct Row {
    std::uint64_t packets = 0;
    std::uint64_t bytes = 0;
    std::optional<std::uint16_t> log_code;
  };
  std::vector<std::pair<std::string, Row>> Sorted() const;

  std::map<std::string, Row> rows_;
};

// Ends a verb that goes on by itself: after a time, a number of packets or events, or with Ctrl-C, which is its
// ordinary end.
class Limit {
 public:
  void AddTo(const Command& verb, const char* things);
  // For what ends by itself: ToolError kUsage when one was given.
  void Reject(const char* what) const;
  void Begin();
  bool Reached(std::uint64_t count) const;
  std::uint64_t count() const { return count_; }  // 0: none
  double seconds() const;                         // since Begin

 private:
  double most_seconds_ = 0;
  std::uint64_t count_ = 0;
  std::uint32_t begin_ = 0;
};

// Hands over every packet of the log queue, and `look` a few times a second, until `count`, which the sink advances,
// has reached the limit. A handset that goes away meanwhile is an error.
using PacketSink = std::function<void(std::span<const std::uint8_t> packet)>;
void CollectPackets(Session& session, const Limit& limit, const std::uint64_t& count, const PacketSink& sink,
                    const std::function<void()>& look);
void CheckPort(const Session& session);  // ToolError when the handset went away

void LoadTable(KRAL_HANDLE handle, std::uint32_t table, const std::string& file);

}  // namespace kral::tool

#endif
