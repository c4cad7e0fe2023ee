// kral log: which logs a handset sends, and what becomes of them.
#include <algorithm>
#include <array>
#include <charconv>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/one_file.h"
#include "tools/kral/page.h"
#include "tools/kral/progress.h"
#include "tools/kral/session_trace.h"
#include "tools/kral/traffic/playback.h"
#include "tools/kral/traffic/time_of_packet.h"
#include "tools/kral/traffic/timeline.h"
#include "tools/kral/traffic/traffic.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kItemsPerEquipmentId = 4096;
constexpr std::size_t kMaskRoom = 4096;

struct LogOptions {
  std::vector<std::string> codes;
  std::vector<std::string> categories;
  bool all = false;
  std::string names;
  std::string file;
  std::string target;
  std::string page;
  std::string from;
  std::string to;
  bool as_recorded = false;
  std::vector<std::string> rotate;
  std::uint32_t keep = 0;
  bool compress = false;
  Limit limit;
};

using Ranges = std::array<std::uint32_t, KRAL_EQUIPMENT_IDS>;
using Codes = std::vector<std::uint16_t>;

Ranges ReadRanges(Session& session) {
  Ranges ranges{};
  session.Run("the request for the log ranges",
              [&] { return KRAL_DIAG_GetLogRanges(session.handle(), ranges.data()); });
  return ranges;
}

// Items from 4,096 on have no code of their own: theirs would be the next equipment id's.
struct ItemsOn {
  Codes codes;
  std::uint32_t beyond = 0;
};

ItemsOn FindItemsOn(Session& session, std::uint8_t equipment_id) {
  std::vector<std::uint8_t> mask(kMaskRoom);
  auto size = static_cast<std::uint16_t>(mask.size());
  std::uint32_t bits = 0;
  session.Run(Format("the request for the log mask of equipment id {}", equipment_id),
              [&] { return KRAL_DIAG_GetLogMask(session.handle(), equipment_id, &bits, &size, mask.data()); });
  ItemsOn on;
  for (std::uint32_t item = 0; item < std::min<std::uint32_t>(bits, size * 8U); ++item) {
    if ((mask[item / 8] >> item % 8 & 1) == 0) continue;
    if (item < kItemsPerEquipmentId) {
      on.codes.push_back(static_cast<std::uint16_t>(equipment_id * kItemsPerEquipmentId + item));
    } else {
      ++on.beyond;
    }
  }
  return on;
}

std::string NameOf(KRAL_HANDLE handle, std::uint16_t code) {
  std::array<char, 256> name{};
  return KRAL_GetLogCodeText(handle, code, name.size(), name.data()) != 0 ? Printable(name.data()) : std::string();
}

void List(const Context& context, const LogOptions& options) {
  Session session(context.session);
  LoadTable(session.handle(), KRAL_TABLE_LOG_NAMES, options.names);
  const auto ranges = ReadRanges(session);
  Json rows = Json::array();
  std::string text;
  for (std::uint32_t equipment = 0; equipment < ranges.size(); ++equipment) {
    const auto id = static_cast<std::uint8_t>(equipment);
    if (ranges[id] == 0) continue;
    Json codes = Json::array();
    std::string lines;
    const auto on = FindItemsOn(session, id);
    for (const auto code : on.codes) {
      const auto name = NameOf(session.handle(), code);
      codes.push_back({{"code", code}, {"name", name}});
      lines += Format("  0x{:04X}  {}\n", code, name);
    }
    if (on.beyond != 0) lines += Format("  and {} without a code\n", on.beyond);
    text += Format("equipment id {}: {} items, {} on\n{}", id, ranges[id], codes.size() + on.beyond, lines);
    rows.push_back(
        {{"equipment_id", id}, {"items", ranges[id]}, {"on", std::move(codes)}, {"on_without_code", on.beyond}});
  }
  context.out.Result({{"port", session.port()}, {"equipment_ids", std::move(rows)}}, text);
}

void SwitchCodes(Session& session, const Codes& codes, bool on) {
  for (auto first = codes.begin(); first != codes.end();) {
    const auto equipment_id = static_cast<std::uint8_t>(*first / kItemsPerEquipmentId);
    const auto last = std::find_if(first, codes.end(),
                                   [=](std::uint16_t code) { return code / kItemsPerEquipmentId != equipment_id; });
    const auto count = static_cast<std::uint16_t>(last - first);
    const auto change = on ? KRAL_DIAG_AddExtendedLogCodes : KRAL_DIAG_ClearExtendedLogCodes;
    session.Run(Format("switching {} log codes of equipment id {}", on ? "on" : "off", equipment_id),
                [&] { return change(session.handle(), equipment_id, &*first, count); });
    first = last;
  }
}

void SwitchAll(Session& session, bool on) {
  const auto ranges = ReadRanges(session);
  for (std::uint32_t equipment = 0; equipment < ranges.size(); ++equipment) {
    const auto id = static_cast<std::uint8_t>(equipment);
    if (ranges[id] == 0) continue;
    if (!on) {
      session.Run(Format("switching off equipment id {}", id),
                  [&] { return KRAL_DIAG_ClearAllLogCodes(session.handle(), id); });
      continue;
    }
    Codes codes;
    for (std::uint32_t item = 0; item < std::min(ranges[id], kItemsPerEquipmentId); ++item) {
      codes.push_back(static_cast<std::uint16_t>(id * kItemsPerEquipmentId + item));
    }
    SwitchCodes(session, codes, true);
  }
}

void CheckSwitch(const LogOptions& options) {
  const bool nothing = ParseIds(options.codes).empty() && ParseIds(options.categories).empty() && !options.all;
  if (nothing) throw ToolError(ExitCode::kUsage, "nothing to switch", "give log codes, --category or --all");
}

void Switch(const Context& context, const LogOptions& options, bool on) {
  CheckSwitch(options);
  const auto codes = ParseIds(options.codes);
  const auto categories = ParseIds(options.categories);
  Session session(context.session);
  if (options.all) SwitchAll(session, on);
  SwitchCodes(session, codes, on);
  for (const auto category : categories) {
    session.Run(Format("switching message category {}", category),
                [&] { return KRAL_ExtendedTextMessage_SetCategoryEnable(session.handle(), category, on ? 1 : 0); });
  }
  const auto state = on ? "on" : "off";
  const auto what = options.all ? std::string("all logs")
                                : Format("{} log codes, {} message categories", codes.size(), categories.size());
  context.out.Result(
      {{"port", session.port()}, {"state", state}, {"all", options.all}, {"codes", codes}, {"categories", categories}},
      Format("{} {}\n", what, state));
}

KRAL_TRAFFIC_COUNTERS CountersOf(KRAL_HANDLE handle) {
  KRAL_TRAFFIC_COUNTERS counters{};
  KRAL_GetTrafficCounters(handle, &counters);
  return counters;
}

// When the next file begins.
struct Rotation {
  std::uint64_t bytes = 0;
  std::uint32_t seconds = 0;
};

Rotation ParseRotation(const std::vector<std::string>& words) {
  struct Unit {
    std::string_view name;
    bool is_time;
    std::uint64_t factor;
  };
  constexpr std::array<Unit, 6> kUnits = {{{"K", false, 1ULL << 10},
                                           {"M", false, 1ULL << 20},
                                           {"G", false, 1ULL << 30},
                                           {"s", true, 1},
                                           {"min", true, 60},
                                           {"h", true, 3600}}};
  constexpr std::uint64_t kMost = 1'000'000;
  Rotation rotation;
  for (const auto& word : words) {
    const std::size_t digits = std::min(word.find_first_not_of("0123456789"), word.size());
    const auto unit = std::ranges::find(kUnits, std::string_view(word).substr(digits), &Unit::name);
    std::uint64_t number = 0;
    std::from_chars(word.data(), word.data() + digits, number);
    const bool twice = unit != kUnits.end() && (unit->is_time ? rotation.seconds != 0 : rotation.bytes != 0);
    if (unit == kUnits.end() || number == 0 || number > kMost || twice) {
      throw ToolError(ExitCode::kUsage, Format("--rotate {} is no size and no time", word),
                      "write 100M for files of that size (K, M, G), 30min for files of that time (s, min, h), or both: "
                      "100M,1h");
    }
    if (unit->is_time)
      rotation.seconds = static_cast<std::uint32_t>(std::min<std::uint64_t>(number * unit->factor, UINT32_MAX));
    if (!unit->is_time) rotation.bytes = number * unit->factor;
  }
  return rotation;
}

// However slow the disk is, until Ctrl-C; one that has ended the capture does not end this.
KRAL_TRAFFIC_COUNTERS FinishCapture(KRAL_HANDLE handle) {
  const bool interrupted_before = Interrupted();
  for (;;) {
    KRAL_StopCapture(handle);
    const auto counters = CountersOf(handle);
    if (counters.capture_pending == 0 || (Interrupted() && !interrupted_before)) return counters;
  }
}

void CheckCapture(const LogOptions& options) {
  ParseIds(options.codes);
  ParseRotation(options.rotate);
  if (options.keep == 0 || !options.rotate.empty()) return;
  throw ToolError(ExitCode::kUsage, "--keep without --rotate: there is one file", "say when the next file begins");
}

void Capture(Context& context, LogOptions& options) {
  CheckCapture(options);
  const auto codes = ParseIds(options.codes);
  const auto rotation = ParseRotation(options.rotate);
  RefuseLogFile(context.session.log_file, options.file, "the capture");
  Session session(context.session);
  // First: the old recording stays as it is where a code is refused.
  SwitchCodes(session, codes, true);
  if (KRAL_StartCaptureWith(session.handle(), options.file.c_str(), rotation.bytes, rotation.seconds, options.keep,
                            options.compress ? 1 : 0) == 0) {
    throw ExplainRecord(LastError(session.handle()), "the capture", session.port(),
                        "check folder, permissions and room on the disk");
  }
  KRAL_DIAG_SetPhoneLoggingState(session.handle(), 1);
  options.limit.Begin();
  std::uint64_t packets = 0;
  {
    Progress progress(context.out, "capture", options.limit.count(), Progress::Unit::kItems);
    CollectPackets(
        session, options.limit, packets, [&](std::span<const std::uint8_t>) { ++packets; },
        [&] { progress.Update(packets); });
  }
  const auto counters = FinishCapture(session.handle());
  const Json members{{"port", session.port()},
                     {"file", options.file},
                     {"packets", counters.captured},
                     {"lost", counters.capture_lost},
                     {"pending", counters.capture_pending},
                     {"seconds", options.limit.seconds()}};
  if (const auto missing = counters.capture_lost + counters.capture_pending; missing != 0) {
    if (context.out.json()) context.found = members;
    throw ToolError(ExitCode::kBadFile, Format("{} of the packets are not in {}", missing, options.file),
                    "check the room on the disk and its speed; what is in the file can be played");
  }
  const auto where = options.rotate.empty() ? options.file : Format("files named after {}", options.file);
  context.out.Result(members, Format("{} in {}\n", Counted(counters.captured, "packet"), where));
}

void NoteCut(const Context& context, const std::string& file) {
  context.out.Note(Format("{} is cut or damaged behind its last whole packet", file));
}

Stretch StretchOf(std::uint64_t begin, const LogOptions& options) {
  Stretch stretch;
  if (!options.from.empty()) stretch.from = ParseTime(options.from, begin);
  if (!options.to.empty()) stretch.to = ParseTime(options.to, begin);
  if (stretch.from > stretch.to) {
    constexpr std::uint64_t kDay = 86'400'000'000;
    throw ToolError(ExitCode::kUsage,
                    Format("--from {} is behind --to {}", TimeText(stretch.from), TimeText(stretch.to)),
                    Format("a time of another day than the first packet's has its date in front: --to {}",
                           TimeText(stretch.to + kDay)));
  }
  return stretch;
}

void Play(const Context& context, const LogOptions& options) {
  const OfflineHandle handle;
  std::uint64_t packets = 0;
  const bool is_part = !options.from.empty() || !options.to.empty();
  const auto begin = is_part ? BeginOf(handle.get(), options.file) : std::nullopt;
  const std::uint64_t first_time = begin.value_or(0);
  const auto stretch = begin ? StretchOf(first_time, options) : Stretch();
  const bool whole = PlayFile(
      handle.get(), options.file, options.as_recorded ? Pace::kAsRecorded : Pace::kAtOnce,
      [&](const PlayedPacket& packet) {
        ++packets;
        const auto what = DescribePacket(packet.bytes);
        context.out.Stream({{"event", "packet"},
                            {"microseconds", packet.microseconds},
                            {"what", what},
                            {"bytes", HexText(packet.bytes)}},
                           Format("{}  {}  {} bytes\n{}", TimeText(packet.microseconds), what, packet.bytes.size(),
                                  HexDump(packet.bytes)));
      },
      stretch);
  if (!whole) NoteCut(context, options.file);
  if (packets == 0 && begin && whole) {
    context.out.Note(
        Format("no packet is of that time; the first of {} came at {}", options.file, TimeText(first_time)));
  }
  context.out.Result({{"file", options.file}, {"packets", packets}, {"cut", !whole}}, "");
}

Json JsonOf(const KRAL_TRAFFIC_COUNTERS& c) {
  return {{"bytes_received", c.bytes_received},
          {"packets_received", c.packets_received},
          {"collected", c.collected},
          {"events", c.events},
          {"dropped_logs", c.dropped_logs},
          {"dropped_events", c.dropped_events},
          {"dropped_answers", c.dropped_answers},
          {"dropped_off", c.dropped_off},
          {"bad_fcs", c.bad_fcs},
          {"oversized", c.oversized},
          {"waiting", c.waiting},
          {"most_waiting", c.most_waiting}};
}

void WriteTimeline(const Timeline& timeline, const std::string& title, const std::string& file) {
  if (!file.empty()) WritePage(file, timeline.Page(title), "--html");
}

void FileStatistics(const Context& context, const LogOptions& options) {
  options.limit.Reject("a capture file");
  RefuseSource(options.file, options.page, "--html");
  const OfflineHandle handle;
  LoadTable(handle.get(), KRAL_TABLE_LOG_NAMES, options.names);
  TrafficTable table;
  Timeline timeline(handle.get());
  const bool whole = PlayFile(handle.get(), options.file, Pace::kAtOnce, [&](const PlayedPacket& packet) {
    table.Add(packet.bytes);
    if (!options.page.empty()) timeline.Add(packet.microseconds, packet.bytes);
  });
  if (!whole) NoteCut(context, options.file);
  WriteTimeline(timeline, options.file, options.page);
  context.out.Result({{"file", options.file}, {"cut", !whole}, {"rows", table.Rows(handle.get(), 0)}},
                     table.Text(handle.get(), 0));
}

void Statistics(const Context& context, LogOptions& options) {
  if (!options.file.empty()) return FileStatistics(context, options);
  Session session(context.session);
  LoadTable(session.handle(), KRAL_TABLE_LOG_NAMES, options.names);
  TrafficTable table;
  Timeline timeline(session.handle());
  KRAL_DIAG_SetPhoneLoggingState(session.handle(), 1);
  options.limit.Begin();
  std::uint64_t packets = 0;
  const auto tell_dropped = [&] { timeline.SetDropped(MicrosecondsNow(), CountersOf(session.handle()).dropped_logs); };
  {
    Progress progress(context.out, "stats", options.limit.count(), Progress::Unit::kItems);
    CollectPackets(
        session, options.limit, packets,
        [&](std::span<const std::uint8_t> packet) {
          table.Add(packet);
          if (!options.page.empty()) timeline.Add(MicrosecondsNow(), packet);
          ++packets;
        },
        [&] {
          progress.Update(packets);
          tell_dropped();
        });
  }
  const double seconds = options.limit.seconds();
  const auto counters = CountersOf(session.handle());
  tell_dropped();
  WriteTimeline(timeline, DescribePort(session.port()), options.page);
  context.out.Result({{"port", session.port()},
                      {"seconds", seconds},
                      {"counters", JsonOf(counters)},
                      {"rows", table.Rows(session.handle(), seconds)}},
                     table.Text(session.handle(), seconds) +
                         Format("{} received, {} collected, {} dropped, {} oversized\n", counters.packets_received,
                                counters.collected, counters.dropped_logs, counters.oversized));
}

// Gives what the conversion has found.
void Convert(const Context& context, const LogOptions& options, bool is_export) {
  std::uint64_t packets = 0;
  std::uint64_t skipped = 0;
  std::uint32_t cut = 0;
  if (options.target == "-") {
    throw ToolError(ExitCode::kUsage, "the file is written as a whole, and never to the standard output",
                    "name a file; ./- for one of this name");
  }
  const char* const from = options.file.c_str();
  const char* const to = options.target.c_str();
  const bool done = is_export ? KRAL_ExportCapture(from, to, &packets, &cut) != 0
                              : KRAL_ImportCapture(from, to, &packets, &skipped, &cut) != 0;
  if (!done) {
    const auto record = LastError(0);
    throw ToolError(
        ExitCode::kBadFile, record ? record->text : "the files cannot be converted",
        is_export ? "give a capture file, and a place to write to" : "give a pcapng file, and a place to write to",
        record);
  }
  if (cut != 0) NoteCut(context, options.file);
  Json members{{"file", options.file}, {"target", options.target}, {"packets", packets}, {"cut", cut != 0}};
  auto text = Format("{} in {}\n", Counted(packets, "packet"), options.target);
  if (!is_export) {
    members["skipped"] = skipped;
    if (skipped != 0) text += Format("{} left out: no handset sends them by itself\n", Counted(skipped, "packet"));
  }
  context.out.Result(members, text);
}

void AddCodes(const Command& verb, const std::shared_ptr<LogOptions>& options, const char* name) {
  verb.Add(name, options->codes, "Log codes, such as 0x1001 or 0x1000-0x100F");
}

}  // namespace

void AddLogVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<LogOptions>();
  const auto log = root.Noun("log", "Logs and messages that a handset sends by itself");
  const auto run = [&context, options](const Command& verb, auto action) {
    verb.Run([&context, options, action] { action(context, *options); });
  };

  const auto list = log.Verb("list", "Print which log codes are on");
  list.Add("--names", options->names, "Table of log names");
  list.ForMany();
  run(list, List);

  for (const bool on : {true, false}) {
    const auto verb = log.Verb(on ? "on" : "off", on ? "Switch logs on" : "Switch logs off");
    AddCodes(verb, options, "codes");
    verb.Add("--category", options->categories, "Message categories, as well");
    verb.Flag("--all", options->all, "Every log code that the handset has");
    verb.ForMany();
    verb.Checks([options] { CheckSwitch(*options); });
    run(verb, [on](const Context& c, LogOptions& o) { Switch(c, o, on); });
  }

  const auto capture = log.Verb("capture", "Write what comes to a file, until Ctrl-C");
  capture.Add("file", options->file, "The capture file; it is emptied when the codes are on").Required().File();
  AddCodes(capture, options, "--on");
  capture.Add("--rotate", options->rotate, "A new file each 100M (K, M, G), 1h (s, min, h), or both: 100M,1h")
      .Separated(',');
  capture.Add("--keep", options->keep, "With --rotate: how many files are left, the latest; default: all");
  capture.Flag("--compress", options->compress, "With zlib; everything reads it that reads captures");
  options->limit.AddTo(capture, "packets");
  capture.ForMany();
  capture.Checks([options] { CheckCapture(*options); });
  capture.Writes([options] { return std::vector<std::string>{options->file}; });
  run(capture, Capture);

  const auto play = log.Verb("play", "Print the packets of a capture file; needs no handset");
  play.NeedsNoHandset();
  play.Add("file", options->file, "The capture file").Required();
  play.Flag("--as-recorded", options->as_recorded, "With the time between packets as it was");
  const auto fault = [](const std::string& text) { return text.empty() ? "it is not a time" : ""; };
  play.Add("--from", options->from,
           "Only what came then or later: 14:02:10 of the first packet's day, or 2026-03-01T14:02:10; UTC")
      .Check(fault);
  play.Add("--to", options->to, "Only what came then or earlier").Check(fault);
  run(play, Play);

  for (const bool is_export : {true, false}) {
    const auto verb = is_export ? log.Verb("export", "Make a pcapng file of a capture file; needs no handset")
                                : log.Verb("import", "Make a capture file of a pcapng file; needs no handset");
    verb.NeedsNoHandset();
    verb.Add("file", options->file, is_export ? "The capture file" : "The pcapng file").Required();
    verb.Add("target", options->target, "The file to write").Required();
    run(verb, [is_export](const Context& c, const LogOptions& o) { Convert(c, o, is_export); });
  }

  const auto stats = log.Verb("stats", "Count what comes, by code, until Ctrl-C; or what a capture file holds");
  stats.NeedsNoHandset([options] { return !options->file.empty(); });
  stats.Add("file", options->file, "A capture file; default: the handset");
  stats.Add("--html", options->page, "Write a page with a timeline of packets by code to this file").File();
  stats.Writes([options] { return std::vector<std::string>{options->page}; });
  stats.Add("--names", options->names, "Table of log names");
  options->limit.AddTo(stats, "packets");
  run(stats, Statistics);
}

}  // namespace kral::tool
