// kral event: which events a handset reports, and the events as they come.
#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <memory>
#include <string>
#include <vector>

#include "tools/kral/traffic.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kWaitMs = 50;
constexpr std::uint32_t kLookMs = 500;

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
  const auto ids = ParseIds(options.ids);
  if (ids.empty()) return;
  session.Run("switching events", [&] {
    return KRAL_DIAG_SetEventMaskBits(session.handle(), ids.data(), static_cast<std::uint16_t>(ids.size()), state);
  });
}

void Switch(const Context& context, const EventOptions& options, bool on) {
  const auto ids = ParseIds(options.ids);
  if (ids.empty() && !options.all) {
    throw ToolError(ExitCode::kUsage, "nothing to switch", "give event ids or --all");
  }
  Session session(context.session);
  SwitchEvents(session, options, on);
  const auto what = options.all ? std::string("all events") : fmt::format("{} events", ids.size());
  context.out.Result({{"port", session.port()}, {"state", on ? "on" : "off"}, {"all", options.all}, {"ids", ids}},
                     fmt::format("{} {}\n", what, on ? "on" : "off"));
}

// The one- and two-byte forms carry no length: of them, what is not zero is shown.
std::span<const std::uint8_t> PayloadOf(const KRAL_EVENT& event) {
  const std::span<const std::uint8_t> payload(event.payload);
  if (event.payload_length != 0) return payload.first(event.payload_length);
  if (payload[1] != 0) return payload.first(2);
  return payload.first(payload[0] != 0 ? 1 : 0);
}

void Print(const Context& context, KRAL_HANDLE handle, const KRAL_EVENT& event) {
  const auto id = static_cast<std::uint16_t>(event.event_id[0] | event.event_id[1] << 8);
  std::array<char, 256> text{};
  const bool named = KRAL_GetEventText(handle, id, text.size(), text.data()) != 0;
  const auto name = named ? Printable(text.data()) : std::string();
  const auto payload = HexText(PayloadOf(event));
  const auto stamp = HexText(std::span(event.time_stamp).first(std::min<std::size_t>(event.time_stamp_length, 8)));
  context.out.Stream({{"event", "event"}, {"id", id}, {"name", name}, {"time_stamp", stamp}, {"payload", payload}},
                     fmt::format("{:>5}  {:<32}  {}\n", id, name, payload));
}

void TailFile(const Context& context, const EventOptions& options) {
  const OfflineHandle handle;
  LoadTable(handle.get(), KRAL_TABLE_EVENT_TEXTS, options.names);
  std::uint64_t events = 0;
  const auto print_waiting = [&] {
    KRAL_EVENT event{};
    for (; KRAL_DIAG_GetNextEvent(handle.get(), &event) != 0; ++events) Print(context, handle.get(), event);
  };
  const bool whole = PlayFile(handle.get(), options.file, KRAL_PLAY_FOR_EVENT_READER,
                              [&](std::span<const std::uint8_t>) { print_waiting(); });
  print_waiting();
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
  std::uint32_t looked = SystemClock().TickMs();
  while (!options.limit.Reached(events)) {
    KRAL_EVENT event{};
    if (KRAL_DIAG_WaitNextEvent(session.handle(), &event, kWaitMs) != 0) {
      Print(context, session.handle(), event);
      ++events;
    }
    if (SystemClock().TickMs() - looked < kLookMs) continue;
    looked = SystemClock().TickMs();
    KRAL_DIAG_ClearPhoneLogQueue(session.handle());  // the reports themselves are nobody's here
    CheckPort(session, "waiting for events");
  }
  KRAL_TRAFFIC_COUNTERS counters{};
  KRAL_GetTrafficCounters(session.handle(), &counters);
  const double seconds = options.limit.seconds();
  const auto rate = seconds > 0 ? static_cast<double>(events) / seconds : 0;
  context.out.Result({{"port", session.port()},
                      {"events", events},
                      {"dropped", counters.dropped_events},
                      {"seconds", seconds},
                      {"per_second", rate}},
                     "");
  if (!context.out.json()) {
    context.out.Note(fmt::format("{} events, {:.1f}/s, {} dropped", events, rate, counters.dropped_events));
  }
}

}  // namespace

void AddEventVerbs(CLI::App& app, Context& context) {
  const auto options = std::make_shared<EventOptions>();
  auto* event = app.add_subcommand("event", "Events that a handset reports by itself");
  event->require_subcommand(1);
  const auto run = [&context, options](CLI::App* verb, auto action) {
    verb->callback(
        [&context, options, action] { context.run = [&context, options, action] { action(context, *options); }; });
  };

  for (const bool on : {true, false}) {
    auto* verb = event->add_subcommand(on ? "on" : "off", on ? "Switch events on" : "Switch events off");
    verb->add_option("ids", options->ids, "Event ids, such as 291 or 290-299");
    verb->add_flag("--all", options->all, "Every event that the handset has");
    run(verb, [on](const Context& c, const EventOptions& o) { Switch(c, o, on); });
  }

  auto* tail = event->add_subcommand("tail", "Print events as they come, until Ctrl-C; or those of a capture file");
  tail->add_option("--on", options->ids, "Switch these events on first");
  tail->add_flag("--all", options->all, "Switch all events on first");
  tail->add_option("--names", options->names, "Table of event texts");
  tail->add_option("--file", options->file, "A capture file instead of the handset");
  options->limit.AddTo(*tail, "events");
  run(tail, Tail);
}

}  // namespace kral::tool
