// Finds out who the handsets are, has the verb run on each, and makes one verdict of all.
#include "tools/kral/many_handsets.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cctype>
#include <chrono>
#include <condition_variable>
#include <filesystem>
#include <map>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>

#include "platform/folder.h"
#include "platform/port_list.h"
#include "tools/kral/board.h"
#include "tools/kral/format.h"
#include "tools/kral/handset_identity.h"
#include "tools/kral/interrupt.h"
#include "tools/kral/port_report.h"
#include "tools/kral/verdicts.h"

namespace kral::tool {
namespace {

constexpr std::size_t kMostAtOnce = 48;  // the library keeps 50 connections
constexpr std::chrono::milliseconds kDrawEvery{100};

// --- Who they are ---------------------------------------------------------------------------------------------------

// As a part of a file's name: what a handset tells must not lead into another folder, ".." included.
std::string AsFileName(std::string text) {
  if (text.starts_with('.')) text.front() = '_';
  std::replace_if(
      text.begin(), text.end(),
      [](unsigned char character) {
        return std::isalnum(character) == 0 && character != '-' && character != '_' && character != '.';
      },
      '_');
  return text;
}

// What a handset refuses to tell stays empty, unless it is `needed`.
std::string Ask(Session& session, bool needed, std::string (*question)(Session&)) {
  return needed ? question(session) : IfTold(session, question);
}

bool Asks(const CommandLine& line, const char* name) {
  return line.asked().count(name) != 0;
}

// Without its log and trace: the verb begins them anew.
SessionOptions ForIdentity(SessionOptions options) {
  options.log_file.clear();
  options.trace = {};
  return options;
}

// With them where port and place alone make them the handset's: one that fails here is what they are for.
SessionOptions ForIdentity(SessionOptions options, std::uint16_t port, std::size_t place) {
  options.port = std::to_string(port);
  for (auto* const file : {&options.log_file, &options.trace.file, &options.trace.file_on_failure}) {
    auto own = FileOfPort(*file, options, port, place);
    if (own == *file || own.find('{') != std::string::npos) own.clear();
    *file = std::move(own);
  }
  // That these are one file is told when the work is prepared.
  const auto& log = options.log_file;
  if (!log.empty() && (log == options.trace.file || log == options.trace.file_on_failure)) options.trace = {};
  return options;
}

// --- The work -------------------------------------------------------------------------------------------------------

struct OneHandset {
  std::unique_ptr<ParsedCommand> command;
  Verdict verdict;
  bool answers = false;  // whatever it may be
  std::atomic<bool> ended{false};
};

class ManyHandsets {
 public:
  ManyHandsets(ParsedCommand& command, const ParseFor& parse) : command_(command), parse_(parse) {}

  void Run();

 private:
  const Context& context() const { return command_.context; }
  const Output& out() const { return context().out; }

  // `work` on all handsets without a failure, so many at once. A failure of it is that of the handset.
  void OnEach(const std::function<void(std::size_t number)>& work);
  void Identify(const std::vector<std::uint16_t>& ports);
  void AskIdentity(std::size_t number) const;
  void TakePorts(const std::vector<std::uint16_t>& ports);
  void RefuseNone() const;
  void RefuseTrouble() const;
  void Prepare();
  void RefuseMissingFiles() const;
  void RefuseSameFiles() const;
  void Work();
  void WorkOn(std::size_t number, Board& board);
  void Conclude();

  ParsedCommand& command_;
  const ParseFor& parse_;
  std::vector<std::unique_ptr<OneHandset>> handsets_;

  std::mutex mutex_;
  std::condition_variable changed_;
  bool has_changed_ = false;  // one of them has ended
};

void ManyHandsets::OnEach(const std::function<void(std::size_t number)>& work) {
  const auto count = handsets_.size();
  std::size_t at_once = std::min(count, kMostAtOnce);
  if (context().jobs != 0) at_once = std::min<std::size_t>(at_once, context().jobs);
  std::atomic<std::size_t> next{0};
  std::vector<std::jthread> threads;
  for (std::size_t i = 0; i < at_once; ++i) {
    threads.emplace_back([&] {
      for (auto number = next++; number < count; number = next++) {
        auto& verdict = handsets_[number]->verdict;
        try {
          ThrowIfInterrupted();
          if (verdict.passed()) work(number);
        } catch (const ToolError& error) {
          verdict.failure = error;
        } catch (const std::exception& error) {
          verdict.failure = ToolError(ExitCode::kInternal, Format("internal error: {}", error.what()),
                                      "run again with --log FILE and report what it shows");
        }
        handsets_[number]->ended = true;
        const std::lock_guard lock(mutex_);
        has_changed_ = true;
        changed_.notify_one();
      }
    });
  }
}

void ManyHandsets::Identify(const std::vector<std::uint16_t>& ports) {
  for (const auto port : ports) {
    handsets_.push_back(std::make_unique<OneHandset>());
    handsets_.back()->verdict.port = port;
  }
  if (!command_.line->asks_identity()) return TakePorts(ports);
  OnEach([this](std::size_t number) {
    const auto begin = std::chrono::steady_clock::now();
    try {
      AskIdentity(number);
    } catch (...) {
      handsets_[number]->verdict.seconds =
          std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
      throw;
    }
  });
  ThrowIfInterrupted();
  if (!context().all) return RefuseTrouble();
  // Those that nobody named and that do not answer are none of the handsets. That one cannot be asked is told.
  std::vector<std::string> closed;
  for (const auto& handset : handsets_) {
    const auto& failure = handset->verdict.failure;
    if (!handset->answers && failure && failure->code() == ExitCode::kPortInUse) closed.emplace_back(failure->what());
  }
  std::erase_if(handsets_, [](const auto& handset) { return !handset->answers; });
  if (handsets_.empty() && !closed.empty()) {
    throw ToolError(ExitCode::kNoPort, "no handset answers on any port: " + Joined(closed, ", "),
                    "kral doctor tells what mends it");
  }
  RefuseNone();
  for (const auto& text : closed) out().Note("left out: " + text);
}

void ManyHandsets::AskIdentity(std::size_t number) const {
  auto& handset = *handsets_[number];
  auto& verdict = handset.verdict;
  try {
    Session session(ForIdentity(context().session, verdict.port, number + 1));
    handset.answers = true;
    verdict.serial = Ask(session, Asks(*command_.line, "serial"), SerialOf);
    if (Asks(*command_.line, "model") || out().json()) {
      verdict.model = Ask(session, Asks(*command_.line, "model"), ModelOf);
    }
  } catch (const NoDiagnosticsError&) {
    handset.answers = true;
    throw;
  } catch (const ToolError& error) {  // a log that cannot be written tells nothing of the handset
    handset.answers = handset.answers || error.code() == ExitCode::kBadFile;
    throw;
  }
}

// Whoever has the line: only diagnostics would tell more.
void ManyHandsets::TakePorts(const std::vector<std::uint16_t>& ports) {
  for (const char* name : {"serial", "model"}) {
    if (!Asks(*command_.line, name)) continue;
    throw ToolError(ExitCode::kUsage, Format("kral {} does not ask for {}", command_.line->verb(), name),
                    "put {port} or {slot} into the name");
  }
  if (!context().all) return;
  const auto reports = ReportPorts(ports, true);
  std::erase_if(handsets_, [&](const auto& handset) {
    return std::ranges::none_of(reports, [&](const PortReport& report) {
      return report.port == handset->verdict.port && report.has_handset();
    });
  });
  RefuseNone();
}

void ManyHandsets::RefuseNone() const {
  if (!handsets_.empty()) return;
  throw ToolError(ExitCode::kNoPort, "no handset answers on any port",
                  "check cables and power of the handsets and that no other program uses their ports");
}

// A port that was named and cannot be had is told before anything is done to the others.
void ManyHandsets::RefuseTrouble() const {
  for (const auto& handset : handsets_) {
    const auto& failure = handset->verdict.failure;
    if (!failure || (failure->code() != ExitCode::kNoPort && failure->code() != ExitCode::kPortInUse)) continue;
    throw ToolError(failure->code(), Format("{}; nothing was done on the other ports", failure->what()),
                    failure->hint(), failure->record());
  }
}

void ManyHandsets::Prepare() {
  for (std::size_t number = 0; number < handsets_.size(); ++number) {
    auto& handset = *handsets_[number];
    if (!handset.verdict.passed()) continue;
    const auto& slots = context().session.slots;
    const auto slot = slots.find(handset.verdict.port);
    handset.command =
        parse_(handset.verdict.port, {{"port", std::to_string(handset.verdict.port)},
                                      {"slot", std::to_string(slot == slots.end() ? number + 1 : slot->second)},
                                      {"serial", AsFileName(handset.verdict.serial)},
                                      {"model", AsFileName(handset.verdict.model)}});
    handset.command->context.session.serial = handset.verdict.serial;
  }
  RefuseMissingFiles();
  // Where names of files are those of a handset, its words are only known now.
  for (const auto& handset : handsets_) {
    if (handset->command && !command_.line->asked().empty()) handset->command->line->Check();
  }
  RefuseSameFiles();
}

void ManyHandsets::RefuseMissingFiles() const {
  for (const auto& handset : handsets_) {
    if (!handset->command) continue;
    for (const auto& file : handset->command->line->Read()) {
      if (LookAt(file).kind != LocalKind::kMissing) continue;
      throw ToolError(ExitCode::kBadFile,
                      Format("there is no {} for COM{}; nothing was done on any port", file, handset->verdict.port),
                      "check the name");
    }
  }
}

void ManyHandsets::RefuseSameFiles() const {
  std::map<std::string, std::uint16_t> writers;
  const auto& report = context().report;
  for (const auto& handset : handsets_) {
    if (!handset->command) continue;
    auto files = handset->command->line->Written();
    const auto& session = handset->command->context.session;
    for (const auto& file : {session.log_file, session.trace.file, session.trace.file_on_failure}) {
      if (!file.empty()) files.push_back(file);
    }
    for (const auto& file : files) {
      if (file == report) {
        throw ToolError(ExitCode::kUsage,
                        Format("kral {} would write {} beside the report", command_.line->verb(), file),
                        "give the report a file of its own");
      }
      const auto [first, is_new] = writers.emplace(file, handset->verdict.port);
      if (is_new) continue;
      if (file == "-") {
        throw ToolError(ExitCode::kUsage, Format("kral {} writes to the standard output", command_.line->verb()),
                        "name a file with {port}, {serial}, {model} or {slot}");
      }
      if (first->second == handset->verdict.port) {
        throw ToolError(
            ExitCode::kUsage,
            Format("kral {} would write {} twice for COM{}", command_.line->verb(), file, first->second),
            "give the files of one handset names that differ, such as log-{port}.txt and trace-{port}.pcapng");
      }
      throw ToolError(ExitCode::kUsage,
                      Format("kral {} would write {} for both COM{} and COM{}", command_.line->verb(), file,
                             first->second, handset->verdict.port),
                      "put {port}, {serial}, {model} or {slot} into the name, for example backup-{serial}.pkv");
    }
  }
}

void ManyHandsets::WorkOn(std::size_t number, Board& board) {
  const auto& command = handsets_[number]->command;
  auto& verdict = handsets_[number]->verdict;
  const auto begin = board.seconds();
  board.Begin(number, verdict);
  command->context.out.UseLane(board.LaneOf(number, verdict));
  verdict.steps.Enter("connect", begin);
  const auto stop_clock = [&] {
    const auto end = board.seconds();
    verdict.seconds = end - begin;
    verdict.steps.End(end);
    verdict.steps.NameTheOnly(command_.line->verb());
  };
  try {
    command->act();
    stop_clock();
  } catch (...) {
    stop_clock();
    verdict.members.update(command->context.found);
    throw;
  }
}

// The data of each as soon as those in front of it have theirs.
void ManyHandsets::Work() {
  std::vector<std::uint16_t> ports;
  for (const auto& handset : handsets_) {
    ports.push_back(handset->verdict.port);
    handset->ended = false;
  }
  Board board(out(), ports);
  std::jthread workers([&] { OnEach([&](std::size_t number) { WorkOn(number, board); }); });
  std::vector<bool> told(handsets_.size());
  for (std::size_t printed = 0; printed < handsets_.size();) {
    {
      std::unique_lock lock(mutex_);
      changed_.wait_for(lock, kDrawEvery, [this] { return std::exchange(has_changed_, false); });
    }
    for (std::size_t number = 0; number < handsets_.size(); ++number) {
      if (told[number] || !handsets_[number]->ended) continue;
      told[number] = true;
      board.End(number, handsets_[number]->verdict);
    }
    for (; printed < handsets_.size() && told[printed]; ++printed) {
      if (!out().json()) board.Print(Labelled(handsets_[printed]->verdict));
    }
    board.Draw();
  }
}

void ManyHandsets::Conclude() {
  std::vector<const Verdict*> verdicts;
  for (const auto& handset : handsets_) verdicts.push_back(&handset->verdict);
  ConcludeVerdicts(command_.context, verdicts);
}

void ManyHandsets::Run() {
  const bool all = command_.context.all;
  if (all && !command_.line->may_ask_all()) throw MustNameBootLoaders();
  Identify(WithoutTwins(all ? ListPorts() : ParsePorts(command_.context.session.port), !all));
  Prepare();
  Work();
  Conclude();
}

ToolError NoList(std::string_view text) {
  return {ExitCode::kUsage, Format("{} is no list of ports", text), "give numbers and ranges: -p 7,8,20-27"};
}

std::uint16_t PortAt(std::string_view text, std::string_view whole) {
  if (text.empty()) throw NoList(whole);
  const auto port = ParsePort(text);
  if (port != 0 && port <= kLastPort) return port;
  throw ToolError(ExitCode::kUsage,
                  Format("{} is not a port number{}", text, text == whole ? "" : Format(" in {}", whole)),
                  Format("ports have the numbers 1 to {}", kLastPort));
}

}  // namespace

std::vector<std::uint16_t> ParsePorts(std::string_view text) {
  std::vector<std::uint16_t> ports;
  for (std::size_t at = 0; at <= text.size();) {
    const auto part = text.substr(at, text.find(',', at) - at);
    at += part.size() + 1;
    const auto dash = part.find('-');
    const auto first = PortAt(part.substr(0, dash), text);
    const auto last = dash == std::string_view::npos ? first : PortAt(part.substr(dash + 1), text);
    if (last < first) {
      throw NoList(text);
    }
    for (unsigned port = first; port <= last; ++port) {
      if (std::ranges::find(ports, port) != ports.end()) {
        throw ToolError(ExitCode::kUsage, Format("COM{} is named twice in {}", port, text), "name each port once");
      }
      ports.push_back(static_cast<std::uint16_t>(port));
    }
  }
  return ports;
}

std::vector<std::uint16_t> WithoutTwins(const std::vector<std::uint16_t>& ports, bool are_named) {
  std::vector<std::uint16_t> different;
  std::map<std::filesystem::path, std::uint16_t> devices;
  for (const auto port : ports) {
    std::error_code ignored;
    const auto device = std::filesystem::canonical(ComPortDevice(port), ignored);
    const auto [first, is_new] = devices.emplace(device, port);
    if (is_new || device.empty()) {
      different.push_back(port);
    } else if (are_named) {
      throw ToolError(ExitCode::kUsage, Format("{} and COM{} are the same device", DescribePort(port), first->second),
                      "name one of them");
    }
  }
  return different;
}

Names NamesOf(const CommandLine& line, const SessionOptions& options) {
  const bool asks = Asks(line, "serial") || Asks(line, "model");
  const auto slot = std::to_string(options.slots.empty() ? 1 : options.slots.begin()->second);
  // Not for a mere number: a boot loader says hello once.
  if (!asks && !options.port.empty()) return {{"port", std::to_string(ParsePort(options.port))}, {"slot", slot}};
  Session session(ForIdentity(options));
  Names names{{"port", std::to_string(session.port())}, {"slot", slot}};
  if (Asks(line, "serial")) names["serial"] = AsFileName(SerialOf(session));
  if (Asks(line, "model")) names["model"] = AsFileName(ModelOf(session));
  return names;
}

std::string FileOfPort(std::string name, const SessionOptions& session, std::uint16_t port, std::size_t place) {
  const auto slot = session.slots.find(port);
  const std::pair<std::string_view, std::string> values[] = {
      {"{port}", std::to_string(port)}, {"{slot}", std::to_string(slot == session.slots.end() ? place : slot->second)}};
  for (const auto& [braced, value] : values) {
    for (auto at = name.find(braced); at != std::string::npos; at = name.find(braced, at + value.size())) {
      name.replace(at, braced.size(), value);
    }
  }
  return name;
}

ToolError MustNameBootLoaders() {
  return {ExitCode::kUsage, "to ask all ports would cost boot loaders their hello", "name the ports: -p 7-14"};
}

bool IsForMany(const ParsedCommand& command) {
  const auto& context = command.context;
  if (context.all && !context.session.port.empty()) {
    throw ToolError(ExitCode::kUsage, "--all and --port say different things", "give one of them");
  }
  if (command.line->takes_ports() || command.line->needs_no_handset()) return false;
  const bool many = context.for_several();
  if (!many || command.line->for_many()) return many;
  throw ToolError(ExitCode::kUsage, Format("kral {} is for one handset at a time", command.line->verb()),
                  "name one port: -p 7");
}

void RunOnMany(ParsedCommand& command, const ParseFor& parse) {
  ManyHandsets(command, parse).Run();
}

}  // namespace kral::tool
