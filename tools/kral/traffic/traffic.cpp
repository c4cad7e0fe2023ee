// Counts and collects unsolicited packets for the log and event verbs.
#include "tools/kral/traffic/traffic.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <set>

#include "tools/kral/call_failure.h"
#include "tools/kral/command_line.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/session.h"
#include "tools/kral/traffic/event_report.h"

namespace kral::tool {
namespace {

constexpr std::uint8_t kLog = 16;
constexpr std::uint8_t kMessage = 121;
constexpr std::size_t kLogCodeOffset = 6;
constexpr std::size_t kCategoryOffset = 14;

constexpr std::uint32_t kWaitMs = 50;
constexpr std::uint32_t kLookMs = 200;

std::optional<std::uint16_t> WordAt(std::span<const std::uint8_t> packet, std::size_t offset) {
  if (packet.size() < offset + 2) return std::nullopt;
  return static_cast<std::uint16_t>(packet[offset] | packet[offset + 1] << 8);
}

[[noreturn]] void RejectId(const std::string& word, std::uint16_t most) {
  throw ToolError(ExitCode::kUsage, Format("{} is not an id", word),
                  Format("give ids from 0 to {}, such as 291, 0x123 or 0x100-0x10F", most));
}

std::uint16_t ParseId(std::string_view text, const std::string& word, std::uint16_t most) {
  const bool hex = text.starts_with("0x") || text.starts_with("0X");
  if (hex) text.remove_prefix(2);
  std::uint16_t id = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), id, hex ? 16 : 10);
  if (error != std::errc() || end != text.data() + text.size() || id > most) RejectId(word, most);
  return id;
}

// The next packet of the queue, or an empty one.
std::span<const std::uint8_t> NextPacket(KRAL_HANDLE handle, std::span<std::uint8_t> buffer, std::uint32_t wait_ms) {
  std::uint16_t size = 0;
  if (KRAL_DIAG_WaitNextPhoneLog(handle, &size, buffer.data(), wait_ms) == 0) return {};
  return buffer.first(size);
}

}  // namespace

std::vector<std::uint16_t> ParseIds(const std::vector<std::string>& words, std::uint16_t most) {
  std::set<std::uint16_t> ids;
  for (const auto& word : words) {
    const auto dash = word.find('-');
    const auto first = ParseId(std::string_view(word).substr(0, dash), word, most);
    const auto last = dash == std::string::npos ? first : ParseId(std::string_view(word).substr(dash + 1), word, most);
    if (last < first) RejectId(word, most);
    for (std::uint32_t id = first; id <= last; ++id) ids.insert(static_cast<std::uint16_t>(id));
  }
  return {ids.begin(), ids.end()};
}

std::string DescribePacket(std::span<const std::uint8_t> packet) {
  if (packet.empty()) return "nothing";
  switch (packet.front()) {
    case kLog:
      if (const auto code = WordAt(packet, kLogCodeOffset)) return Format("log 0x{:04X}", *code);
      return "log";
    case kEventReport:
      return "events";
    case kMessage:
      if (const auto category = WordAt(packet, kCategoryOffset)) return Format("message {}", *category);
      return "message";
    default:
      return Format("packet {}", packet.front());
  }
}

void TrafficTable::Add(std::span<const std::uint8_t> packet) {
  Row& row = rows_[DescribePacket(packet)];
  if (row.packets == 0 && !packet.empty() && packet.front() == kLog) row.log_code = WordAt(packet, kLogCodeOffset);
  ++row.packets;
  row.bytes += packet.size();
}

std::vector<std::pair<std::string, TrafficTable::Row>> TrafficTable::Sorted() const {
  std::vector<std::pair<std::string, Row>> sorted(rows_.begin(), rows_.end());
  std::ranges::stable_sort(
      sorted, [](const auto& left, const auto& right) { return left.second.packets > right.second.packets; });
  return sorted;
}

namespace {

std::string NameOf(KRAL_HANDLE handle, std::optional<std::uint16_t> log_code) {
  std::array<char, 256> name{};
  if (!log_code || KRAL_GetLogCodeText(handle, *log_code, name.size(), name.data()) == 0) return {};
  return Printable(name.data());
}

}  // namespace

std::string NameOfPacket(KRAL_HANDLE handle, std::span<const std::uint8_t> packet) {
  if (packet.empty() || packet.front() != kLog) return {};
  return NameOf(handle, WordAt(packet, kLogCodeOffset));
}

Json TrafficTable::Rows(KRAL_HANDLE handle, double seconds) const {
  Json rows = Json::array();
  for (const auto& [what, row] : Sorted()) {
    Json members{{"what", what}, {"packets", row.packets}, {"bytes", row.bytes}};
    if (const auto name = NameOf(handle, row.log_code); !name.empty()) members["name"] = name;
    if (seconds > 0) members["per_second"] = static_cast<double>(row.packets) / seconds;
    rows.push_back(std::move(members));
  }
  return rows;
}

std::string TrafficTable::Text(KRAL_HANDLE handle, double seconds) const {
  std::string text;
  for (const auto& [what, row] : Sorted()) {
    const auto rate = seconds > 0 ? Format("{:10.1f}/s", static_cast<double>(row.packets) / seconds) : "";
    text += Format("{:>10} packets {:>12} bytes {}  {:<12}  {}\n", row.packets, row.bytes, rate, what,
                   NameOf(handle, row.log_code));
  }
  return text;
}

void Limit::AddTo(const Command& verb, const char* things) {
  verb.Add("--seconds", most_seconds_, "Stop after so long; default: with Ctrl-C").Between(0.01, 1e6, "s");
  verb.Add("--count", count_, Format("Stop after so many {}", things));
}

void Limit::Reject(const char* what) const {
  if (count_ == 0 && most_seconds_ <= 0) return;
  throw ToolError(ExitCode::kUsage, Format("{} has an end of its own", what), "leave out --seconds and --count");
}

void Limit::Begin() {
  begin_ = SystemClock().TickMs();
}

bool Limit::Reached(std::uint64_t count) const {
  return Interrupted() || (count_ != 0 && count >= count_) || (most_seconds_ > 0 && seconds() >= most_seconds_);
}

double Limit::seconds() const {
  return (SystemClock().TickMs() - begin_) / 1000.0;
}

void CheckPort(const Session& session) {
  std::int32_t state = KRAL_PORT_OPEN;
  if (KRAL_GetPortState(session.handle(), &state) == 0 || state == KRAL_PORT_OPEN) return;
  if (const auto error = session.Silence()) throw *error;
}

void CollectPackets(Session& session, const Limit& limit, const std::uint64_t& count, const PacketSink& sink,
                    const std::function<void()>& look) {
  std::array<std::uint8_t, KRAL_LONGEST_PACKET> buffer{};
  std::uint32_t looked = SystemClock().TickMs();
  while (!limit.Reached(count)) {
    const auto packet = NextPacket(session.handle(), buffer, kWaitMs);
    if (!packet.empty()) sink(packet);
    if (SystemClock().TickMs() - looked < kLookMs) continue;
    looked = SystemClock().TickMs();
    CheckPort(session);
    look();
  }
}

void LoadTable(KRAL_HANDLE handle, std::uint32_t table, const std::string& file) {
  if (file.empty() || KRAL_LoadNameTable(handle, table, file.c_str()) != 0) return;
  throw ExplainRecord(LastError(handle), Format("the table {}", file), 0, "one id and its name a line, each id once");
}

}  // namespace kral::tool
