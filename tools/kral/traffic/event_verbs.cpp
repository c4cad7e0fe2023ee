// kral event: which events a handset reports, and the events as they come.
#include <array>
#include <memory>
#include <string>
#include <vector>

#include "tools/kral/format.h"
#include "tools/kral/traffic/event_report.h"
#include "tools/kral/traffic/playback.h"
#include "tools/kral/traffic/traffic.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint16_t kLastEventId = 4095;  // reports have twelve bits for it

struct EventOptions {
  std::vector<std::string> ids;
  bool all = false;
  std::string names;
  std::string file;
  Limit limit;
};

void SwitchEvents(Session& session, const EventOptions& options, bool on) {
  const auto state = static_cast<std::uint8_t>(on ? 1 : 0);
  if (options.all) {
    session.Run("switching all events", [&] { return KRAL_DIAG_SetEntireEventMaskState(session.handle(), state); });
  }
  const auto ids = ParseIds(options.ids, kLastEventId);
  if (ids.empty()) return;
  session.Run("switching events", [&] {
    return KRAL_DIAG_SetEventMaskBits(session.handle(), ids.data(), static_cast<std::uint16_t>(ids.size()), state);
  });
}

void Switch(const Context& context, const EventOptions& options, bool on) {
  const auto ids = ParseIds(options.ids, kLastEventId);
  if (ids.empty() && !options.all) {
    throw ToolError(ExitCode::kUsage, "nothing to switch", "give event ids or --all");
  }
  Session session(context.session);
  SwitchEvents(session, options, on);
  const auto what = options.all ? std::string("all events") : Counted(ids.size(), "event");
  context.out.Result({{"port", session.port()}, {"state", on ? "on" : "off"}, {"all", options.all}, {"ids", ids}},
                     Format("{} {}\n", what, on ? "on" : "off"));
}

void Print(const Context& context, KRAL_HANDLE handle, const ReportedEvent& event) {
  std::array<char, 256> text{};
  const bool named = KRAL_GetEventText(handle, event.id, text.size(), text.data()) != 0;
  const auto name = named ? Printable(text.data()) : std::string();
  const auto payload = HexText(event.payload);
  const auto stamp = HexText(event.time_stamp);
  context.out.Stream(
      {{"event", "event"}, {"id", event.id}, {"name", name}, {"time_stamp", stamp}, {"payload", payload}},
      Format("{:>5}  {:<32}  {:<23}  {}\n", event.id, name, stamp, payload));
}

void TailFile(const Context& context, const EventOptions& options) {
  options.limit.Reject("a capture file");
  if (!options.ids.empty() || options.all) {
    throw ToolError(ExitCode::kUsage, "a capture file has no events to switch on", "leave out --on and --all");
  }
  const OfflineHandle handle;
  LoadTable(handle.get(), KRAL_TABLE_EVENT_TEXTS, options.names);
  std::uint64_t events = 0;
  const bool whole = PlayFile(handle.get(), options.file, Pace::kAtOnce, [&](const PlayedPacket& packet) {
    EventReport report(packet.bytes);
    for (; const auto event = report.Next(); ++events) Print(context, handle.get(), *event);
  });
  context.out.Result({{"file", options.file}, {"events", events}, {"cut", !whole}}, "");
}

void Tail(const Context& context, EventOptions& options) {
  if (!options.file.empty()) return TailFile(context, options);
  Session session(context.session);
  LoadTable(session.handle(), KRAL_TABLE_EVENT_TEXTS, options.names);
  SwitchEvents(session, options, true);
  KRAL_DIAG_SetPhoneLoggingState(session.handle(), 1);
  options.limit.Begin();
  std::uint64_t events = 0;
  const auto print_events = [&](std::span<const std::uint8_t> packet) {
    EventReport report(packet);
    while (!options.limit.Reached(events)) {
      const auto event = report.Next();
      if (!event) break;
      Print(context, session.handle(), *event);
      ++events;
    }
  };
  CollectPackets(session, options.limit, events, print_events, [] {});
  KRAL_TRAFFIC_COUNTERS counters{};
  KRAL_GetTrafficCounters(session.handle(), &counters);
  const double seconds = options.limit.seconds();
  const auto rate = seconds > 0 ? static_cast<double>(events) / seconds : 0;
  context.out.Result({{"port", session.port()},
                      {"events", events},
                      {"dropped", counters.dropped_logs},
                      {"seconds", seconds},
                      {"per_second", rate}},
                     "");
  if (!context.out.json()) {
    context.out.Note(
        Format("{}, {:.1f}/s, {} dropped", Counted(events, "event"), rate, Counted(counters.dropped_logs, "packet")));
  }
}

}  // namespace

void AddEventVerbs(const Command& root, Context& context) {
  const auto options = std::make_shared<EventOptions>();
  const auto event = root.Noun("event", "Events that a handset reports by itself");
  const auto run = [&context, options](const Command& verb, auto action) {
    verb.Run([&context, options, action] { action(context, *options); });
  };

  for (const bool on : {true, false}) {
    const auto verb = event.Verb(on ? "on" : "off", on ? "Switch events on" : "Switch events off");
    verb.Add("ids", options->ids, "Event ids, such as 291 or 290-299");
    verb.Flag("--all", options->all, "Every event that the handset has");
    run(verb, [on](const Context& c, const EventOptions& o) { Switch(c, o, on); });
  }

  const auto tail = event.Verb("tail", "Print events as they come, until Ctrl-C; or those of a capture file");
  tail.NeedsNoHandset([options] { return !options->file.empty(); });
  tail.Add("--on", options->ids, "Switch these events on first");
  tail.Flag("--all", options->all, "Switch all events on first");
  tail.Add("--names", options->names, "Table of event texts");
  tail.Add("--file", options->file, "A capture file instead of the handset");
  options->limit.AddTo(tail, "events");
  run(tail, Tail);
}

}  // namespace kral::tool
